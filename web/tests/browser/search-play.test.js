// The search's results played and opened, by the mouse and by the keyboard: a track plays, an
// album or an artist opens in the pane; the arrows go into the results, Enter plays or opens,
// Escape clears.
import { test, before, after } from "node:test";
import assert from "node:assert/strict";
import { launch, close, openTree } from "./harness.js";
import { search, apiSearch } from "./search-helpers.js";

let browser;
before(async () => { browser = await launch(["--autoplay-policy=no-user-gesture-required"]); });
after(async () => { await close(browser); });

test("a track found plays, an album or an artist found opens in the pane", async () => {
  const page = await openTree(browser, "demo");
  await search(page, "copper");
  const reply = await apiSearch(page, "copper");
  await page.locator("#search-results [data-group=tracks] [role=option]").nth(1).click();
  await page.waitForSelector("#player[data-state=playing]", { timeout: 15000 });
  assert.equal(await page.locator("#player").getAttribute("data-stream"), reply.tracks[1].stream);
  assert.equal(await page.locator("#search-results").isVisible(), false);

  await search(page, "copper");
  await page.locator("#search-results [data-group=albums] [role=option]").first().click();
  await page.waitForFunction((node) => document.getElementById("listing").dataset.node === node, reply.albums[0].node, { timeout: 15000 });
  assert.equal(await page.locator("#list-title").textContent(), reply.albums[0].title);
  assert.equal(await page.locator("#tracks .track").count() > 0, true);
  assert.equal(await page.locator("#list-count").textContent(), `${reply.albums[0].tracks} ${reply.albums[0].tracks === 1 ? "track" : "tracks"}`);

  await search(page, "copper");
  await page.locator("#search-results [data-group=artists] [role=option]").first().click();
  await page.waitForFunction((node) => document.getElementById("listing").dataset.node === node, reply.artists[0].node, { timeout: 15000 });
  assert.equal(await page.locator("#containers button").count(), reply.artists[0].albums);
  assert.deepEqual(page.problems, []);
});

test("the keyboard: arrows go into the results and over them, Enter plays or opens, Escape clears", async () => {
  const page = await openTree(browser, "demo");
  await page.locator("#search").focus();
  await page.keyboard.type("copper");
  await page.waitForFunction(() => document.getElementById("search-results").dataset.query === "copper", null, { timeout: 15000 });
  const reply = await apiSearch(page, "copper");
  const active = () => page.evaluate(() => {
    const id = document.getElementById("search").getAttribute("aria-activedescendant");
    const option = id ? document.getElementById(id) : null;
    return option ? option.querySelector(".search-main").textContent : null;
  });
  await page.keyboard.press("ArrowDown");
  assert.equal(await active(), reply.tracks[0].title);
  await page.keyboard.press("ArrowDown");
  assert.equal(await active(), reply.tracks[1].title);
  assert.equal(await page.locator("#search-results [role=option].active").count(), 1);
  assert.equal(await page.locator("#search-results [role=option][aria-selected=true]").count(), 1);
  await page.keyboard.press("Enter");
  await page.waitForSelector("#player[data-state=playing]", { timeout: 15000 });
  assert.equal(await page.locator("#player").getAttribute("data-stream"), reply.tracks[1].stream);

  // End reaches the last result (the artist), Enter opens it.
  await page.locator("#search").focus();
  await page.keyboard.press("ArrowDown");
  await page.keyboard.press("End");
  assert.equal(await active(), reply.artists.at(-1).title);
  await page.keyboard.press("Enter");
  await page.waitForFunction((node) => document.getElementById("listing").dataset.node === node, reply.artists.at(-1).node, { timeout: 15000 });

  // Up from the first result goes back to the box; Escape clears the search.
  await page.locator("#search").focus();
  await page.keyboard.press("ArrowDown");
  await page.keyboard.press("ArrowUp");
  assert.equal(await active(), null);
  await page.keyboard.press("Escape");
  assert.equal(await page.locator("#search").inputValue(), "");
  assert.equal(await page.locator("#search-results").isVisible(), false);
  assert.equal(await page.locator("#search-results [role=option]").count(), 0);
  assert.equal(await page.locator("#search").getAttribute("aria-expanded"), "false");
  assert.deepEqual(page.problems, []);
});
