// A stopped and a hung media server on the running system: the tree and the pane say which, in
// the user's words, instead of showing empty lists; a listing shows that it loads and can be left
// while it does; a later success clears the error.
import { test, before, after } from "node:test";
import assert from "node:assert/strict";
import { stopService, startService, hangService } from "./services.js";
import { launch, close, openTree, item, childIds, screenshot } from "./harness.js";
import { words, open, select, listed, expectFailedPane, expectStatus, noPageErrors } from "./failure-checks.js";

let browser;
before(async () => { browser = await launch(); });
after(async () => { await close(browser); });

test("a stopped media server: tree and pane say it is not running instead of (empty); a later success clears it", async () => {
  const page = await openTree(browser, "demo");
  await stopService("harmona-mediad");
  try {
    await item(page, "musiclib_music_album").locator(":scope > .row > .twisty").click();
    await page.waitForSelector('li[data-id="musiclib_music_album"][data-state=failed]', { timeout: 15000 });
    assert.equal(await item(page, "musiclib_music_album").locator("li.empty").count(), 0);
    assert.equal(await item(page, "musiclib_music_album").getAttribute("aria-expanded"), "false");
    await expectStatus(page, "media_server_down");
    await select(page, "musiclib_music_genre");
    await expectFailedPane(page, "media_server_down");
    assert.equal(await item(page, "musiclib_music_genre").locator("li.empty").count(), 0);
    await screenshot(page, "failures-media-server-stopped");
  } finally {
    await startService("harmona-mediad");
  }
  await open(page, "musiclib_music_album");
  assert.ok((await childIds(page, "musiclib_music_album")).length >= 12);
  await page.waitForFunction(() => document.getElementById("status").getAttribute("role") !== "alert");
  assert.equal(await page.locator("#status").textContent(), "");
  await listed(page, "musiclib_music_genre");
  assert.ok((await page.locator("#containers button").count()) >= 1);
  noPageErrors(page);
});

test("a hung media server: the pane shows it loads and nothing else's rows, can be left, and says it did not answer in time", async () => {
  const page = await openTree(browser, "demo");
  await open(page, "musiclib_music_personal");
  const roadTrip = "musiclib_music_personal/playlist/Road Trip";
  await listed(page, roadTrip);
  const rows = await page.locator("#tracks .track").evaluateAll((r) => r.map((x) => x.dataset.stream));
  assert.ok(rows.length > 0);
  const resume = hangService("harmona-mediad");
  try {
    await select(page, "musiclib_music_album");
    await page.waitForSelector("#listing[data-state=loading][aria-busy=true]");
    assert.equal(await page.locator("#list-title").textContent(), "Album");
    assert.equal(await page.locator("#list-state").textContent(), words.listLoading);
    assert.equal(await page.locator("#tracks .track").count(), 0);
    assert.equal(await page.locator("#play-all").isDisabled(), true);
    await screenshot(page, "failures-media-server-hung-loading");
    // Left while it loads: another node lists at once.
    await listed(page, roadTrip);
    assert.deepEqual(await page.locator("#tracks .track").evaluateAll((r) => r.map((x) => x.dataset.stream)), rows);
    assert.equal(await page.locator("#play-all").isDisabled(), false);
    // The album's own tree request runs into the time limit; the pane stays with the playlist.
    await expectStatus(page, "media_server_timeout", undefined, 40000);
    assert.equal(await page.locator("#listing").getAttribute("data-node"), roadTrip);
    assert.equal(await page.locator("#list-title").textContent(), "Road Trip");
    assert.equal(await page.locator("#tracks .track").count(), rows.length);
    // A listing that waits out the time limit says so.
    await select(page, "musiclib_music_genre");
    await expectFailedPane(page, "media_server_timeout", undefined, 40000);
    await screenshot(page, "failures-media-server-hung");
  } finally {
    resume();
  }
  await listed(page, "musiclib_music_genre");
  noPageErrors(page);
});
