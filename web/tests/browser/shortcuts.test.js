// The page's shortcuts (Space, n, p, /) wherever the focus is not in a text field (sorting.test.js
// has the sorting by the column headers).
import { test, before, after } from "node:test";
import assert from "node:assert/strict";
import { launch, close, openTree, item, screenshot } from "./harness.js";
import { open, listed } from "./failure-checks.js";
import { focused, rowStreams, slowPlayback, listAlbum } from "./list-helpers.js";

let browser;
before(async () => { browser = await launch(["--autoplay-policy=no-user-gesture-required"]); });
after(async () => { await close(browser); });

test("Space pauses and plays, n and p step through the tracks, / goes to the search box and typing there is not a shortcut", async () => {
  const page = await openTree(browser, "demo");
  await listAlbum(page);
  const streams = await rowStreams(page);
  await slowPlayback(page);
  await page.locator("#tracks").focus();
  await page.keyboard.press("ArrowDown");
  await page.keyboard.press("Space"); // nothing plays yet: the focused row starts
  await page.waitForSelector("#player[data-state=playing]", { timeout: 15000 });
  assert.equal(await page.locator("#player").getAttribute("data-stream"), streams[0]);
  await page.keyboard.press("Space");
  await page.waitForSelector("#player[data-state=paused]", { timeout: 5000 });
  await page.keyboard.press("Space");
  await page.waitForSelector("#player[data-state=playing]", { timeout: 5000 });
  await page.keyboard.press("n");
  await page.waitForFunction((s) => document.getElementById("player").dataset.stream === s, streams[1], { timeout: 5000 });
  await page.keyboard.press("p");
  await page.waitForFunction((s) => document.getElementById("player").dataset.stream === s, streams[0], { timeout: 5000 });
  await page.keyboard.press("Space");
  await page.waitForSelector("#player[data-state=paused]", { timeout: 5000 });
  // "/" takes the focus to the search box, and n typed there stays text.
  await page.locator("#tracks").focus();
  await page.keyboard.press("/");
  assert.equal((await focused(page)).id, "search");
  const playing = await page.locator("#player").getAttribute("data-stream");
  await page.keyboard.type("n p");
  assert.equal(await page.locator("#search").inputValue(), "n p");
  assert.equal(await page.locator("#player").getAttribute("data-stream"), playing);
  assert.equal(await page.locator("#player").getAttribute("data-state"), "paused");
  // In the tree, Space is the tree's own (it opens or closes the node) and not play/pause.
  await item(page, "musiclib_music_album").locator(":scope > .row").focus();
  const state = await page.locator("#player").getAttribute("data-state");
  const expanded = await item(page, "musiclib_music_album").getAttribute("aria-expanded");
  await page.keyboard.press("Space");
  await page.waitForFunction((was) => document.querySelector('li[data-id="musiclib_music_album"]').getAttribute("aria-expanded") !== was, expanded);
  assert.equal(await page.locator("#player").getAttribute("data-state"), state);
  assert.deepEqual(page.problems, []);
});
