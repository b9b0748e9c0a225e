// The page checked by axe-core in the browser (axe.js), light and dark: a playlist with its tools,
// the dialog of a new playlist, and the page in Japanese with its language picker. No serious or
// critical violation anywhere.
import { test, before, after } from "node:test";
import assert from "node:assert/strict";
import { launch, close, openTree, item } from "./harness.js";
import { open, listed } from "./failure-checks.js";
import { expectAccessible } from "./axe.js";

let browser;
before(async () => { browser = await launch(["--autoplay-policy=no-user-gesture-required"]); });
after(async () => { await close(browser); });

test("a playlist with its tools and the dialog of a new playlist have no serious or critical violation", async () => {
  const page = await openTree(browser, "demo");
  await open(page, "musiclib_music_personal");
  await listed(page, "musiclib_music_personal/playlist/Road Trip");
  await page.locator("#tracks .track").first().waitFor();
  await expectAccessible(page, "playlist");

  // The dialog of a new playlist, open over the page; closed again without a change.
  await item(page, "musiclib_music_personal_new").locator(":scope > .row .label").click();
  await page.locator("dialog[open]").waitFor();
  await expectAccessible(page, "playlist-dialog");
  await page.keyboard.press("Escape");
  assert.deepEqual(page.problems, []);
});

test("the page in Japanese, with its language picker, has no serious or critical violation", async () => {
  const page = await openTree(browser, "guest", { locale: "ja-JP" });
  assert.equal(await page.evaluate(() => document.documentElement.lang), "ja");
  await page.waitForSelector("#language[data-ready=true]");
  await open(page, "musiclib_root");
  await listed(page, "musiclib_random");
  await expectAccessible(page, "japanese");
  assert.deepEqual(page.problems, []);
});
