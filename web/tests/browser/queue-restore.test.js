// The play queue across a reload: the queue, the playing item, the time in it and the volume come
// back paused; what the browser's storage holds is checked before it is believed.
import { test, before, after } from "node:test";
import assert from "node:assert/strict";
import { launch, close, openTree, item, screenshot } from "./harness.js";
import { list, firstAlbum, queueStreams, listedStreams, position, pause } from "./queue-helpers.js";

let browser;
before(async () => { browser = await launch(["--autoplay-policy=no-user-gesture-required"]); });
after(async () => { await close(browser); });

// Waits until the queue's panel shows its rows again (it is drawn on the next animation frame).
const settled = (page) => page.evaluate(() => new Promise((resolve) => requestAnimationFrame(() => requestAnimationFrame(resolve))));

test("after a reload the queue, its position, the time in the track and the volume are back, paused", async () => {
  const page = await openTree(browser, "demo");
  // A sample album: its tracks are real one-second FLAC files that the browser can seek in.
  await firstAlbum(page);
  const listed = await listedStreams(page);
  await page.locator('#tracks .track[data-index="2"]').click();
  await page.waitForSelector("#player[data-state=playing]", { timeout: 15000 });
  await pause(page);
  await page.locator("#seek").evaluate((input) => { input.value = "500"; input.dispatchEvent(new Event("input")); });
  await page.waitForFunction(() => document.getElementById("audio").currentTime > 0.3);
  const time = await page.evaluate(() => document.getElementById("audio").currentTime);
  await page.locator("#volume").evaluate((input) => { input.value = "35"; input.dispatchEvent(new Event("input")); });
  await page.locator("#shuffle").click();
  await page.locator("#repeat").click();
  await page.locator('#tracks .track[data-index="0"] .queue-add').click();
  await page.waitForFunction(() => JSON.parse(localStorage.getItem("harmona.player") ?? "{}").volume === 0.35);

  await page.reload();
  await page.waitForSelector("body[data-ready=true]", { timeout: 20000 });
  await page.waitForFunction(() => document.getElementById("audio").readyState >= 1, null, { timeout: 15000 });
  await page.waitForFunction(() => document.getElementById("audio").currentTime > 0, null, { timeout: 15000 });
  const audio = await page.evaluate(() => {
    const a = document.getElementById("audio");
    return { paused: a.paused, time: a.currentTime, volume: a.volume, src: a.getAttribute("src") };
  });
  assert.equal(audio.paused, true);
  assert.ok(Math.abs(audio.time - time) < 0.05, `${audio.time} against ${time}`);
  assert.equal(audio.volume, 0.35);
  assert.equal(audio.src, `media/${listed[2]}`);
  assert.equal(await page.locator("#volume").inputValue(), "35");
  assert.equal(await page.locator("#player").getAttribute("data-stream"), listed[2]);
  assert.notEqual(await page.locator("#now-playing").textContent(), "");
  assert.equal(await page.locator("#shuffle").getAttribute("aria-pressed"), "true");
  assert.equal(await page.locator("#repeat").getAttribute("data-repeat"), "one");
  await page.locator("#queue-toggle").click();
  assert.deepEqual(await queueStreams(page), [...listed, listed[0]]);
  assert.equal(await position(page), 2);
  // It stays paused: nothing plays by itself (the element has played no time range at all).
  await page.waitForTimeout(1500);
  assert.equal(await page.evaluate(() => document.getElementById("audio").paused), true);
  assert.equal(await page.evaluate(() => document.getElementById("audio").played.length), 0);
  assert.notEqual(await page.locator("#player").getAttribute("data-state"), "playing");
  assert.deepEqual(page.problems, []);
});

test("a stored queue that is not one is ignored, and a hostile one runs nothing", async () => {
  const page = await openTree(browser, "demo");
  for (const [queue, player] of [
    ["{not json", "[1,2"],
    [JSON.stringify({ version: 1, items: [{ url: "javascript:window.pwned=1", title: "x" }], position: 0 }), JSON.stringify({ time: "x", volume: 7 })],
    [JSON.stringify({ version: 1, items: [{ stream: "1.flac", title: "<img src=x onerror=window.pwned=1>" }], position: 0 }), "null"],
  ]) {
    await page.evaluate(([q, p]) => {
      localStorage.setItem("harmona.queue", q);
      localStorage.setItem("harmona.player", p);
    }, [queue, player]);
    await page.reload();
    await page.waitForSelector("body[data-ready=true]", { timeout: 20000 });
    await page.locator("#queue-toggle").click();
    await settled(page);
    assert.equal(await page.evaluate(() => document.getElementById("audio").volume), 1);
    assert.equal(await page.evaluate(() => window.pwned), undefined);
    assert.equal(await page.locator("#queue-spacer img").count(), 0);
  }
  // The last one is a playable item whose title is text.
  assert.equal(await page.locator("#queue-spacer .queue-name").first().textContent(), "<img src=x onerror=window.pwned=1>");
  assert.equal(await page.evaluate(() => document.getElementById("audio").paused), true);
  assert.deepEqual(page.problems, []);
});

test("a 10,000-track list played all is queued whole, drawn a window at a time, and back after a reload", async () => {
  const page = await openTree(browser, "demo");
  const folders = item(page, "musiclib_music_file");
  await folders.locator(":scope > .row > .twisty").click();
  await page.waitForSelector('li[data-id="musiclib_music_file"][data-state=loaded]', { timeout: 15000 });
  await list(page, await folders.locator(":scope > ul > li[role=treeitem]", { hasText: "Bench" }).getAttribute("data-id"));
  assert.equal(await page.locator("#list-count").textContent(), "10000 tracks");
  await page.evaluate(() => { document.getElementById("audio").muted = true; });
  await page.locator("#play-all").click();
  await page.waitForSelector("#player[data-state=playing]", { timeout: 15000 });
  await pause(page);
  await page.locator("#queue-toggle").click();
  assert.equal(await page.locator("#queue-panel").getAttribute("data-count"), "10000");
  assert.ok((await page.locator("#queue-spacer .queue-item").count()) < 60);
  await page.locator("#queue-list").evaluate((v) => { v.scrollTop = v.scrollHeight; });
  await page.waitForSelector('#queue-spacer .queue-item[data-index="9999"]', { timeout: 5000 });
  assert.ok((await page.locator("#queue-spacer .queue-item").count()) < 60);
  await page.waitForFunction(() => JSON.parse(localStorage.getItem("harmona.queue") ?? "{}").items?.length === 10000, null, { timeout: 10000 });
  await page.reload();
  await page.waitForSelector("body[data-ready=true]", { timeout: 20000 });
  assert.equal(await page.locator("#queue-panel").getAttribute("data-count"), "10000");
  await screenshot(page, "queue-bench");
  assert.deepEqual(page.problems, []);
});
