// The page on a phone and on a desktop: below 700 px the tree is a drawer and the pane and the
// player take the screen with touch targets of at least 44 px and nothing wider than the screen;
// the Media Session names what plays and its controls play, pause, skip and seek.
import { test, before, after } from "node:test";
import assert from "node:assert/strict";
import { launch, close, openTree, item, screenshot } from "./harness.js";

let browser;
before(async () => { browser = await launch(["--autoplay-policy=no-user-gesture-required"]); });
after(async () => { await close(browser); });

const PHONE = { viewport: { width: 390, height: 844 }, hasTouch: true, isMobile: true, deviceScaleFactor: 2 };
const DESKTOP = { viewport: { width: 1280, height: 800 } };

// Whatever can be tapped and is on screen now, narrower or lower than 44 px.
const smallTargets = (page) => page.evaluate(() => {
  const targets = document.querySelectorAll("button, input, select, a[href], li[role=treeitem] > .row, #tracks .track, .queue-title");
  const small = [];
  for (const element of targets) {
    if (element.closest("[inert], [hidden]")) continue;
    const style = getComputedStyle(element);
    const rect = element.getBoundingClientRect();
    if (style.visibility === "hidden" || rect.width === 0 || rect.height === 0) continue;
    if (rect.right <= 0 || rect.left >= innerWidth || rect.bottom <= 0 || rect.top >= innerHeight) continue;
    if (rect.width < 44 || rect.height < 44)
      small.push(`${element.tagName.toLowerCase()}#${element.id}.${element.className} ${Math.round(rect.width)}x${Math.round(rect.height)}`);
  }
  return small;
});
// How far the page reaches past the screen's width (0: no horizontal scrolling).
const overflow = (page) => page.evaluate(() => Math.max(document.documentElement.scrollWidth, document.body.scrollWidth) - innerWidth);
async function waitListed(page, id) {
  await page.waitForFunction((node) => {
    const listing = document.getElementById("listing");
    return listing.dataset.node === node && listing.dataset.state === "loaded";
  }, id, { timeout: 20000 });
}
const drawerShown = (page) => page.evaluate(() => {
  const rect = document.getElementById("side").getBoundingClientRect();
  return getComputedStyle(document.getElementById("side")).visibility === "visible" && rect.right > 0 && rect.left < innerWidth;
});

test("at 390 px with touch the tree is a drawer and the pane, the player and the queue fit the screen", async () => {
  const page = await openTree(browser, "demo", { device: PHONE });
  assert.equal(await page.locator("body").getAttribute("data-layout"), "phone");
  assert.equal(await page.locator("body").getAttribute("data-drawer"), "closed");
  assert.equal(await drawerShown(page), false);
  assert.equal(await page.evaluate(() => document.getElementById("side").inert), true);
  assert.equal(await overflow(page), 0);
  assert.deepEqual(await smallTargets(page), []);
  await screenshot(page, "phone-start");

  // The drawer opens from the header's button; a category's twisty leaves it open.
  await page.locator("#tree-toggle").tap();
  await page.waitForFunction(() => document.body.dataset.drawer === "open");
  assert.equal(await page.locator("#tree-toggle").getAttribute("aria-expanded"), "true");
  await page.waitForTimeout(300); // the slide
  assert.equal(await drawerShown(page), true);
  const albums = item(page, "musiclib_music_album");
  await albums.locator(":scope > .row > .twisty").tap();
  await page.waitForSelector('li[data-id="musiclib_music_album"][data-state=loaded]', { timeout: 15000 });
  assert.equal(await page.locator("body").getAttribute("data-drawer"), "open");
  assert.equal(await overflow(page), 0);
  assert.deepEqual(await smallTargets(page), []);
  await screenshot(page, "phone-drawer");

  // Choosing an album lists it and closes the drawer; the list takes the screen.
  const album = albums.locator(":scope > ul > li[role=treeitem]").filter({ hasNotText: "Bench" }).first();
  const id = await album.getAttribute("data-id");
  await album.locator(":scope > .row .label").tap();
  await waitListed(page, id);
  await page.waitForFunction(() => document.body.dataset.drawer === "closed");
  await page.waitForTimeout(300);
  assert.equal(await drawerShown(page), false);
  const pane = await page.locator("#detail").boundingBox();
  assert.ok(pane.x < 1 && pane.width > 389, JSON.stringify(pane));
  assert.ok((await page.locator("#tracks .track").count()) >= 1);
  const title = await page.locator("#tracks .track .title").first().boundingBox();
  assert.ok(title.width > 120, `title ${title.width} px wide`);
  assert.equal(await overflow(page), 0);
  assert.deepEqual(await smallTargets(page), []);

  // A tapped row plays; the player's buttons are 44 px icons.
  await page.evaluate(() => { document.getElementById("audio").muted = true; });
  await page.locator("#tracks .track .title").first().tap();
  await page.waitForSelector("#player[data-state=playing]", { timeout: 15000 });
  await page.locator("#tracks .track .queue-add").first().tap();
  assert.equal(await overflow(page), 0);
  assert.deepEqual(await smallTargets(page), []);
  await screenshot(page, "phone-list");
  // The list starts right under the breadcrumb, and its sort buttons take one line above the rows.
  const layout = await page.evaluate(() => {
    const box = (selector) => document.querySelector(selector).getBoundingClientRect();
    const sorts = [...document.querySelectorAll(".track-head .sort")].map((b) => b.getBoundingClientRect());
    return {
      gap: box(".list-tools").top - box("#breadcrumb").bottom,
      sortLines: new Set(sorts.map((b) => Math.round(b.top))).size,
      headHeight: box(".tracks-head").height,
    };
  });
  console.log(`phone list layout: ${JSON.stringify(layout)}`);
  assert.ok(layout.gap <= 4, `${layout.gap} px between the breadcrumb and the list's tools`);
  assert.equal(layout.sortLines, 1);
  assert.ok(layout.headHeight < 50, `the sort line is ${layout.headHeight} px high`);
  // A keyboard (a tablet's, a phone's) moving down past the rows in view scrolls the row it reaches
  // wholly into view, between the sort line and the list's bottom.
  await page.locator("#tracks").focus();
  for (let i = 0; i < 9; i++) await page.keyboard.press("ArrowDown");
  const reached = await page.evaluate(() => {
    const box = (selector) => document.querySelector(selector).getBoundingClientRect();
    return { row: box("#track-cursor"), list: box("#tracks"), head: box(".tracks-head"), index: document.getElementById("track-cursor").dataset.index };
  });
  assert.equal(reached.index, "9");
  assert.ok(reached.row.top >= reached.head.bottom - 1 && reached.row.bottom <= reached.list.bottom + 1, JSON.stringify(reached));

  // The queue takes the pane's place.
  await page.locator("#queue-toggle").tap();
  assert.equal(await page.locator("#detail").isVisible(), false);
  const queue = await page.locator("#queue-panel").boundingBox();
  assert.ok(queue.width > 389 && queue.height > 400, JSON.stringify(queue));
  assert.ok((await page.locator("#queue-spacer .queue-item").count()) >= 2);
  assert.equal(await overflow(page), 0);
  assert.deepEqual(await smallTargets(page), []);
  await screenshot(page, "phone-queue");
  await page.locator("#queue-close").tap();
  assert.equal(await page.locator("#detail").isVisible(), true);

  // Escape and a tap beside the drawer close it too.
  await page.locator("#tree-toggle").tap();
  await page.waitForFunction(() => document.body.dataset.drawer === "open");
  await page.keyboard.press("Escape");
  await page.waitForFunction(() => document.body.dataset.drawer === "closed");
  assert.equal(await page.evaluate(() => document.activeElement.id), "tree-toggle");
  await page.locator("#tree-toggle").tap();
  await page.waitForFunction(() => document.body.dataset.drawer === "open");
  await page.waitForTimeout(300);
  await page.touchscreen.tap(380, 400);
  await page.waitForFunction(() => document.body.dataset.drawer === "closed");
  assert.deepEqual(page.problems, []);
});

test("at 1280 px the tree stays beside the pane and the queue opens above the player", async () => {
  const page = await openTree(browser, "demo", { device: DESKTOP });
  assert.equal(await page.locator("body").getAttribute("data-layout"), "wide");
  assert.equal(await page.locator("#tree-toggle").isVisible(), false);
  assert.equal(await page.evaluate(() => document.getElementById("side").inert), false);
  const side = await page.locator("#side").boundingBox();
  assert.ok(side.x === 0 && side.width >= 220, JSON.stringify(side));
  await item(page, "musiclib_music_all").locator(":scope > .row .label").click();
  await waitListed(page, "musiclib_music_all");
  const detail = await page.locator("#detail").boundingBox();
  assert.ok(detail.x >= side.x + side.width, "the pane beside the tree");
  // Rows keep their desktop height and every column.
  assert.equal((await page.locator("#tracks .track").first().boundingBox()).height, 28);
  assert.equal(await page.locator("#tracks .track .album").first().isVisible(), true);
  // The rows carry a cover and the queue's buttons; the header's columns are still theirs, and every
  // cell of a row is on its one line.
  const first = page.locator("#tracks .track").first();
  assert.equal(await first.locator(":scope > .cover").count(), 1);
  assert.equal(await first.locator(":scope > .queue-tools").count(), 1);
  for (const column of ["number", "title", "artist", "album", "duration"]) {
    const head = await page.locator(`.track-head .${column}`).boundingBox();
    const cell = await first.locator(`:scope > .${column}`).boundingBox();
    assert.ok(Math.abs(head.x - cell.x) < 1 && Math.abs(head.width - cell.width) < 1, `${column}: header ${JSON.stringify(head)}, cell ${JSON.stringify(cell)}`);
  }
  const line = await first.boundingBox();
  for (const cell of await first.locator(":scope > *").all()) {
    const box = await cell.boundingBox();
    assert.ok(box.y >= line.y - 1 && box.y + box.height <= line.y + line.height + 1, `${await cell.getAttribute("class")} ${JSON.stringify(box)} in ${JSON.stringify(line)}`);
  }
  await page.locator("#queue-toggle").click();
  assert.equal(await page.locator("#detail").isVisible(), true);
  const queue = await page.locator("#queue-panel").boundingBox();
  const player = await page.locator("#player").boundingBox();
  assert.ok(queue.y + queue.height <= player.y + 1, "the queue above the player");
  assert.equal(await overflow(page), 0);
  await screenshot(page, "desktop-queue");
  assert.deepEqual(page.problems, []);
});

test("the Media Session names the playing track and plays, pauses, skips and seeks", async () => {
  // The handlers the page gives the browser, kept where the test can call them as the browser would.
  const page = await openTree(browser, "demo", { device: PHONE });
  await page.addInitScript(() => {
    const set = MediaSession.prototype.setActionHandler;
    window.mediaHandlers = {};
    MediaSession.prototype.setActionHandler = function (action, handler) {
      window.mediaHandlers[action] = handler;
      return set.call(this, action, handler);
    };
  });
  await page.reload();
  await page.waitForSelector("body[data-ready=true]", { timeout: 20000 });
  const actions = await page.evaluate(() => Object.keys(window.mediaHandlers).sort());
  assert.deepEqual(actions, ["nexttrack", "pause", "play", "previoustrack", "seekbackward", "seekforward", "seekto"]);

  // A sample album: its tracks are real one-second FLAC files that the browser can seek in.
  await page.locator("#tree-toggle").tap();
  const albums = item(page, "musiclib_music_album");
  await albums.locator(":scope > .row > .twisty").tap();
  await page.waitForSelector('li[data-id="musiclib_music_album"][data-state=loaded]', { timeout: 15000 });
  const album = albums.locator(":scope > ul > li[role=treeitem]").filter({ hasNotText: "Bench" }).first();
  const id = await album.getAttribute("data-id");
  await album.locator(":scope > .row .label").tap();
  await waitListed(page, id);
  const rows = await page.locator("#tracks .track").evaluateAll((all) => all.map((r) => ({
    stream: r.dataset.stream, title: r.querySelector(".title").textContent, artist: r.querySelector(".artist").textContent,
    album: r.querySelector(".album").textContent,
  })));
  await page.evaluate(() => { document.getElementById("audio").muted = true; });
  // Repeat one: a track that ends plays again, so that only the controls move to another.
  await page.locator("#repeat").tap();
  await page.locator('#tracks .track[data-index="1"] .title').tap();
  await page.waitForSelector("#player[data-state=playing]", { timeout: 15000 });
  const metadata = () => page.evaluate(() => {
    const m = navigator.mediaSession.metadata;
    return { title: m.title, artist: m.artist, album: m.album, artwork: m.artwork.length, state: navigator.mediaSession.playbackState };
  });
  // The artwork is the track's cover when it has one (library.cgi's covers), as it comes.
  const cover = await page.evaluate(async (stream) => {
    const reply = await (await fetch(`webapi/library.cgi?action=covers&streams=${encodeURIComponent(stream)}`)).json();
    return reply.covers[stream] ? new URL(reply.covers[stream], document.baseURI).href : null;
  }, rows[1].stream);
  await page.waitForFunction((n) => navigator.mediaSession.metadata?.artwork.length === n, cover ? 1 : 0, { timeout: 10000 });
  assert.deepEqual(await metadata(), { title: rows[1].title, artist: rows[1].artist, album: rows[1].album, artwork: cover ? 1 : 0, state: "playing" });
  if (cover) assert.equal(await page.evaluate(() => navigator.mediaSession.metadata.artwork[0].src), cover);

  await page.evaluate(() => window.mediaHandlers.pause({ action: "pause" }));
  await page.waitForSelector("#player[data-state=paused]");
  assert.equal((await metadata()).state, "paused");
  await page.evaluate(() => window.mediaHandlers.play({ action: "play" }));
  await page.waitForSelector("#player[data-state=playing]");

  await page.evaluate(() => window.mediaHandlers.nexttrack({ action: "nexttrack" }));
  await page.waitForFunction((s) => document.getElementById("player").dataset.stream === s, rows[2].stream);
  assert.equal((await metadata()).title, rows[2].title);
  await page.evaluate(() => window.mediaHandlers.previoustrack({ action: "previoustrack" }));
  await page.waitForFunction((s) => document.getElementById("player").dataset.stream === s, rows[1].stream);
  assert.equal((await metadata()).title, rows[1].title);
  // Seeking, paused: the position the control names, or 10 s back (clamped at the start).
  await page.evaluate(() => window.mediaHandlers.pause({ action: "pause" }));
  await page.waitForSelector("#player[data-state=paused]");
  await page.evaluate(() => window.mediaHandlers.seekto({ action: "seekto", seekTime: 0.5 }));
  await page.waitForFunction(() => Math.abs(document.getElementById("audio").currentTime - 0.5) < 0.05);
  await page.evaluate(() => window.mediaHandlers.seekbackward({ action: "seekbackward" }));
  await page.waitForFunction(() => document.getElementById("audio").currentTime === 0);
  await page.evaluate(() => window.mediaHandlers.seekforward({ action: "seekforward", seekOffset: 0.25 }));
  await page.waitForFunction(() => Math.abs(document.getElementById("audio").currentTime - 0.25) < 0.05);
  assert.deepEqual(page.problems, []);
});
