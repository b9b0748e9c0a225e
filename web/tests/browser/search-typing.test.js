// The search box as the user types: a late reply of an older query never drawn, letters typed
// after the first within the pause sent as one query, query syntax typed as text.
import { test, before, after } from "node:test";
import assert from "node:assert/strict";
import { launch, close, openTree } from "./harness.js";
import { SEARCH_WORDS } from "../../site/ui/words/search.js";
import { search, groupTitles } from "./search-helpers.js";
import { queryWords } from "../../site/ui/search.js";

let browser;
before(async () => { browser = await launch(); });
after(async () => { await close(browser); });

test("a late reply of an older query never draws over the newer one", async () => {
  const page = await openTree(browser, "demo");
  // The first query's reply is held back until the second one has been drawn.
  let releaseSlow;
  const slowHeld = new Promise((resolve) => { releaseSlow = resolve; });
  await page.route((url) => url.searchParams.get("action") === "search" && url.searchParams.get("q") === "aurora", async (route) => {
    await slowHeld;
    // The page has given up on it meanwhile (a newer query aborts an older one's request).
    await route.continue().catch(() => {});
  });
  const asked = [];
  page.on("request", (request) => { if (request.url().includes("action=search")) asked.push(new URL(request.url()).searchParams.get("q")); });
  await page.locator("#search").fill("aurora");
  await page.waitForFunction(() => document.getElementById("search-results").dataset.state === "searching", null, { timeout: 15000 });
  await search(page, "copper");
  releaseSlow();
  await page.waitForTimeout(600);
  assert.equal(await page.locator("#search-results").getAttribute("data-query"), "copper");
  const artists = await groupTitles(page, "artists");
  assert.deepEqual(artists, ["The Copper Kettles"]);
  assert.deepEqual(asked, ["aurora", "copper"]);
  assert.deepEqual(page.problems.filter((p) => !p.includes("net::ERR_ABORTED")), []);
});

test("the first letter is sent at once, and letters typed within the pause after it send one query, for the whole text", async () => {
  const page = await openTree(browser, "demo");
  const asked = [];
  page.on("request", (request) => { if (request.url().includes("action=search")) asked.push(new URL(request.url()).searchParams.get("q")); });
  // Each letter as a keystroke gives the box its text and an input event, all within a few ms.
  await page.evaluate(() => {
    const box = document.getElementById("search");
    box.focus();
    for (const text of ["n", "ni", "nig", "nigh", "night", "nighti", "nighting", "nightingale"]) {
      box.value = text;
      box.dispatchEvent(new InputEvent("input", { bubbles: true, data: text.at(-1), inputType: "insertText" }));
    }
  });
  await page.waitForFunction(() => document.getElementById("search-results").dataset.query === "nightingale", null, { timeout: 15000 });
  await page.waitForTimeout(300);
  assert.deepEqual(asked, ["n", "nightingale"]);
  assert.deepEqual(await groupTitles(page, "artists"), ["Nightingale Quartet"]);
  assert.deepEqual(page.problems, []);
});

test("query syntax typed into the box is text: no error, nothing broken", async () => {
  const page = await openTree(browser, "demo");
  for (const text of ['"', '"*', "*", "-", "NEAR", "NEAR(aurora", "aurora OR copper", "{title}: x", "'; DROP TABLE track; --", "<b>x</b>", "—", "( ) ^ :"]) {
    await search(page, text);
    const state = await page.locator("#search-results").getAttribute("data-state");
    assert.equal(state, queryWords(text).length > 0 ? "done" : "idle", text);
    assert.equal(await page.locator("#search-results .error").count(), 0, text);
  }
  // The words of syntax are words: "aurora OR copper" needs a track with all three.
  await search(page, "aurora OR copper");
  assert.equal(await page.locator("#search-results [role=option]").count(), 0);
  // Too many words: said at once, nothing sent.
  await page.locator("#search").fill("a b c d e f g h i");
  await page.waitForFunction(() => document.getElementById("search-results").dataset.state === "refused", null, { timeout: 5000 });
  assert.equal(await page.locator("#search-results .error").textContent(), SEARCH_WORDS.enu.searchTooLong);
  // And the search still works.
  await search(page, "aurora");
  assert.deepEqual(await groupTitles(page, "artists"), ["Aurora Lane"]);
  assert.deepEqual(page.problems, []);
});
