// The track list from the keyboard: one tab stop, the arrows, Page Up/Down, Home and End move the
// focus over the rows (also over 10,000 rows, of which only those in view exist), Enter plays the
// focused row, the playing row is marked for assistive technology (shortcuts.test.js has the
// shortcuts and the sorting).
import { test, before, after } from "node:test";
import assert from "node:assert/strict";
import { launch, close, openTree, item, screenshot } from "./harness.js";
import { open, listed } from "./failure-checks.js";
import { focused, rowStreams, slowPlayback, listAlbum, listBench } from "./list-helpers.js";

let browser;
before(async () => { browser = await launch(["--autoplay-policy=no-user-gesture-required"]); });
after(async () => { await close(browser); });

test("the list is one tab stop; arrows, Page Down, End and Home move the focus over 10,000 rows drawn only in view", async () => {
  const page = await openTree(browser, "demo");
  await listBench(page);
  // Tab from Play all reaches the list itself (the tools of the listing may stand between), and
  // nothing inside it before.
  await page.locator("#play-all").focus();
  for (let i = 0; i < 10 && (await focused(page)).id !== "tracks"; i++) {
    await page.keyboard.press("Tab");
    assert.equal(await page.evaluate(() => document.getElementById("tracks").contains(document.activeElement) &&
      document.activeElement.id !== "tracks"), false);
  }
  assert.equal((await focused(page)).id, "tracks", "Tab from Play all reaches the list");
  await page.keyboard.press("ArrowDown");
  assert.equal((await focused(page)).rowIndex, "2", "the first row (the headers are row 1)");
  await page.keyboard.press("ArrowDown");
  assert.equal((await focused(page)).rowIndex, "3");
  // One tab stop: the focused row only; Tab leaves the list, Shift+Tab comes back to the same row.
  const tabStops = await page.locator("#tracks [tabindex='0'], #tracks[tabindex='0']").count();
  assert.equal(tabStops, 1);
  await page.keyboard.press("Tab");
  assert.notEqual((await focused(page)).rowIndex, "3");
  await page.keyboard.press("Shift+Tab");
  assert.equal((await focused(page)).rowIndex, "3");

  await page.keyboard.press("PageDown");
  const afterPage = Number((await focused(page)).rowIndex);
  assert.ok(afterPage > 10, `Page Down moved a page: row ${afterPage}`);
  await page.keyboard.press("PageUp");
  assert.equal((await focused(page)).rowIndex, "3");
  await page.keyboard.press("End");
  assert.equal((await focused(page)).rowIndex, "10001");
  assert.ok((await page.locator("#tracks .track").count()) < 100, "only the rows in view are drawn");
  assert.equal(await page.locator("#tracks").getAttribute("aria-rowcount"), "10001");
  await page.keyboard.press("Home");
  assert.equal((await focused(page)).rowIndex, "2");
  // Scrolled away by the wheel, the focused row stays in the document and keeps the focus.
  await page.locator("#tracks").evaluate((viewport) => { viewport.scrollTop = 4000 * 28; });
  await page.waitForSelector('#tracks .track[aria-rowindex="4001"]', { timeout: 5000 });
  assert.equal((await focused(page)).rowIndex, "2");
  await page.keyboard.press("ArrowDown");
  assert.equal((await focused(page)).rowIndex, "3");
  assert.ok(await page.locator('#tracks .track[aria-rowindex="3"]').isVisible(), "the focused row is scrolled into view");
  assert.deepEqual(page.problems, []);
});

test("Enter plays the focused row, which is then marked as the current one; the focus is visible", async () => {
  const page = await openTree(browser, "demo");
  await listAlbum(page);
  const streams = await rowStreams(page);
  assert.ok(streams.length >= 3);
  await slowPlayback(page);
  await page.locator("#tracks").focus();
  for (let i = 0; i < 3; i++) await page.keyboard.press("ArrowDown");
  await page.keyboard.press("ArrowUp");
  await page.keyboard.press("Enter");
  await page.waitForSelector("#player[data-state=playing]", { timeout: 15000 });
  assert.equal(await page.locator("#player").getAttribute("data-stream"), streams[1]);
  const current = page.locator('#tracks .track[aria-current="true"]');
  assert.equal(await current.count(), 1);
  assert.equal(await current.getAttribute("data-stream"), streams[1]);
  // The focused row shows a ring of the focus colour.
  const ring = await page.evaluate(() => getComputedStyle(document.activeElement).boxShadow);
  assert.match(ring, /inset/);
  // Every cell is a grid cell under a column header.
  const roles = await page.locator("#tracks .track").first().evaluate((row) => [...row.children].map((c) => c.getAttribute("role")));
  assert.ok(roles.length >= 5 && roles.every((role) => role === "gridcell"), roles.join());
  assert.deepEqual(await page.locator("#tracks [role=columnheader]").allTextContents(), ["No.", "Title", "Artist", "Album", "Duration"]);
  await screenshot(page, "keyboard-playing");
  assert.deepEqual(page.problems, []);
});
