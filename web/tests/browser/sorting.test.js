// The track list sorted by its column headers, with the mouse and from the keyboard, over the
// 10,000 rows of the Bench folder of which only those in view are drawn.
import { test, before, after } from "node:test";
import assert from "node:assert/strict";
import { launch, close, openTree, item, screenshot } from "./harness.js";
import { open, listed } from "./failure-checks.js";
import { focused, rowStreams, slowPlayback, listAlbum, listBench } from "./list-helpers.js";

let browser;
before(async () => { browser = await launch(["--autoplay-policy=no-user-gesture-required"]); });
after(async () => { await close(browser); });

test("a click on a column header sorts by it, ascending then descending then as listed, announced by aria-sort", async () => {
  const page = await openTree(browser, "demo");
  await listBench(page);
  const node = await page.locator("#listing").getAttribute("data-node");
  const listing = await page.evaluate(async (id) =>
    (await (await fetch(`webapi/library.cgi?action=list&node=${encodeURIComponent(id)}`)).json()).tracks, node);
  const collator = new Intl.Collator("en", { sensitivity: "base", numeric: true });
  // Equal titles keep the listing's order both ways.
  const byTitle = listing.map((t, i) => ({ t, i })).sort((a, b) => collator.compare(a.t.title, b.t.title) || a.i - b.i).map((e) => e.t.stream);
  const byTitleDown = listing.map((t, i) => ({ t, i })).sort((a, b) => collator.compare(b.t.title, a.t.title) || a.i - b.i).map((e) => e.t.stream);
  const titleHeader = page.locator("#tracks [role=columnheader].title");

  await titleHeader.locator("button").click();
  assert.equal(await titleHeader.getAttribute("aria-sort"), "ascending");
  assert.equal(await page.locator("#tracks [aria-sort]").count(), 1);
  const first = (await rowStreams(page)).slice(0, 10);
  assert.deepEqual(first, byTitle.slice(0, 10));
  // The number cell still shows the track's place in the listing.
  const number = await page.locator('#tracks .track[aria-rowindex="2"] .number').textContent();
  assert.equal(listing[Number(number) - 1].stream, byTitle[0]);
  // The end of the sorted list, drawn only where it is.
  await page.locator("#tracks").evaluate((viewport) => { viewport.scrollTop = viewport.scrollHeight; });
  await page.waitForSelector('#tracks .track[aria-rowindex="10001"]', { timeout: 5000 });
  assert.equal(await page.locator('#tracks .track[aria-rowindex="10001"]').getAttribute("data-stream"), byTitle.at(-1));

  await titleHeader.locator("button").click();
  assert.equal(await titleHeader.getAttribute("aria-sort"), "descending");
  await page.locator("#tracks").evaluate((viewport) => { viewport.scrollTop = 0; });
  await page.waitForSelector('#tracks .track[aria-rowindex="2"]', { timeout: 5000 });
  assert.equal(await page.locator('#tracks .track[aria-rowindex="2"]').getAttribute("data-stream"), byTitleDown[0]);
  // Play all plays in the order shown.
  await slowPlayback(page);
  await page.locator("#play-all").click();
  await page.waitForFunction((s) => document.getElementById("player").dataset.stream === s, byTitleDown[0], { timeout: 10000 });
  assert.equal(await page.locator('#tracks .track[aria-current="true"]').getAttribute("aria-rowindex"), "2");

  await titleHeader.locator("button").click();
  assert.equal(await titleHeader.getAttribute("aria-sort"), null);
  assert.deepEqual((await rowStreams(page)).slice(0, 10), listing.slice(0, 10).map((t) => t.stream));

  // From the keyboard: Up from the first row reaches the headers, Enter sorts, Down comes back.
  await page.locator("#tracks").focus();
  await page.keyboard.press("ArrowDown");
  const firstRow = (await focused(page)).stream;
  await page.keyboard.press("ArrowUp");
  assert.equal((await focused(page)).text, "Title");
  await page.keyboard.press("ArrowRight");
  assert.equal((await focused(page)).text, "Artist");
  await page.keyboard.press("Enter");
  assert.equal(await page.locator("#tracks [role=columnheader].artist").getAttribute("aria-sort"), "ascending");
  // Down goes back to the row that had the focus, wherever the sort put it.
  await page.keyboard.press("ArrowDown");
  assert.equal((await focused(page)).stream, firstRow);
  // Another node starts in its own order.
  await listAlbum(page);
  assert.equal(await page.locator("#tracks [aria-sort]").count(), 0);
  assert.deepEqual(page.problems, []);
});
