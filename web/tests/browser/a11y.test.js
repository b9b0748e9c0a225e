// The page checked by axe-core in the browser (axe.js), light and dark: the tree alone, a listing
// with a playing row, the radio pane with its form and a failed listing (a11y-playlists.test.js has
// a playlist, its dialog and the page in Japanese). No serious or critical violation anywhere.
import { test, before, after } from "node:test";
import assert from "node:assert/strict";
import { launch, close, openTree, item } from "./harness.js";
import { open, listed } from "./failure-checks.js";
import { expectAccessible } from "./axe.js";

let browser;
before(async () => { browser = await launch(["--autoplay-policy=no-user-gesture-required"]); });
after(async () => { await close(browser); });

test("the page is never given axe: it is the test's own", async () => {
  const page = await openTree(browser, "demo");
  assert.equal(await page.evaluate(() => typeof window.axe), "undefined");
  const scripts = await page.locator("script").evaluateAll((list) => list.map((s) => s.getAttribute("src")));
  assert.ok(scripts.every((src) => src && !src.includes("axe")), scripts.join());
});

test("the tree and a listing with a playing track have no serious or critical violation", async () => {
  const page = await openTree(browser, "demo");
  await expectAccessible(page, "root");

  await open(page, "musiclib_music_album");
  const album = item(page, "musiclib_music_album").locator(":scope > ul > li[role=treeitem]").filter({ hasNotText: "Bench" }).first();
  await listed(page, await album.getAttribute("data-id"));
  await page.evaluate(() => { document.getElementById("audio").defaultPlaybackRate = 0.1; });
  await page.locator("#tracks .track").nth(1).click();
  await page.waitForSelector('#tracks .track[aria-current="true"]', { timeout: 15000 });
  await page.locator("#tracks .track").nth(1).focus();
  await page.locator("#tracks [role=columnheader].artist button").click();
  await expectAccessible(page, "listing");
  assert.deepEqual(page.problems, []);
});

test("the radio pane with its form and a failed listing have no serious or critical violation", async () => {
  const page = await openTree(browser, "demo");
  await item(page, "inetradio_userdefined").locator(":scope > .row .label").click();
  await page.waitForFunction(() => !document.getElementById("radio-form").hidden, null, { timeout: 15000 });
  await expectAccessible(page, "radio");

  // A directory on the internet: the pane says that it cannot be reached, the status line too.
  await item(page, "inetradio_sc").locator(":scope > .row .label").click();
  await page.waitForSelector("#listing[data-state=failed]", { timeout: 15000 });
  await page.waitForFunction(() => !document.getElementById("radio-notice").hidden, null, { timeout: 15000 });
  await expectAccessible(page, "failure");
  assert.deepEqual(page.problems.filter((p) => !p.includes("503")), []);
});
