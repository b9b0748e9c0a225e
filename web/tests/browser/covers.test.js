// Cover art on the running system: the albums as a grid of covers with year and track count, an
// album artist's albums and all its tracks, covers in the track rows and beside the playing track,
// the neutral placeholder where there is none, and the images served behind the login with caching
// headers, so that a reload does not fetch them again.
import { test, before, after } from "node:test";
import assert from "node:assert/strict";
import { launch, close, openTree, item, baseURL, password, screenshot } from "./harness.js";

let browser;
before(async () => { browser = await launch(["--autoplay-policy=no-user-gesture-required"]); });
after(async () => { await close(browser); });

const listed = (page, node) =>
  page.waitForFunction((n) => document.getElementById("listing").dataset.node === n, node, { timeout: 20000 });
const choose = async (page, id) => {
  await item(page, id).locator(":scope > .row .label").click();
  await listed(page, id);
};
const expandNode = async (page, id) => {
  const li = item(page, id);
  if ((await li.getAttribute("aria-expanded")) !== "true") await li.locator(":scope > .row > .twisty").click();
  await page.waitForSelector(`li[data-id="${id}"][data-state=loaded]`, { timeout: 20000 });
};
const childNamed = (page, parent, text) =>
  item(page, parent).locator(":scope > ul > li[role=treeitem]").filter({ has: page.locator(`:scope > .row .label:text-is("${text}")`) });
// Every image of the document is shown (none broken).
const brokenImages = (page) => page.evaluate(async () => {
  const images = [...document.images].filter((img) => img.src.includes("/media/art/"));
  await Promise.all(images.map((img) => img.decode().catch(() => {})));
  return images.filter((img) => !img.complete || img.naturalWidth === 0).map((img) => img.src);
});

test("the albums are a grid of covers with year and track count, a placeholder where an album has none", async () => {
  const page = await openTree(browser, "demo");
  await choose(page, "musiclib_music_album");
  await page.waitForSelector("#containers.album-grid button.album-tile");
  const tiles = page.locator("#containers button.album-tile");
  const count = await tiles.count();
  assert.ok(count >= 24, `${count} albums`);
  assert.equal(count, await page.locator("#containers button.container").count());
  // A grid of albums without tracks of its own shows no "0 tracks" above it.
  assert.equal(await page.locator("#list-count").textContent(), "");
  // Aurora Lane (covers) and The Copper Kettles (none) in the sample share.
  const covered = tiles.filter({ hasText: "Aurora Lane" }).first();
  const plain = tiles.filter({ hasText: "The Copper Kettles" }).first();
  const coverSrc = await covered.locator("img.cover-image").getAttribute("src");
  assert.match(coverSrc, /^media\/art\/[0-9]+\.png$/);
  assert.equal(await plain.locator("img").count(), 0);
  assert.equal(await plain.locator(".cover-placeholder").count(), 1);
  const facts = await covered.locator(".album-facts").textContent();
  assert.match(facts, /^Aurora Lane · (199[5-9]|20[0-2][0-9]) · (10|5) tracks$/);
  assert.equal(await covered.locator(".album-title").textContent(), await covered.getAttribute("title"));
  assert.deepEqual(await brokenImages(page), []);
  // No cover is asked for that does not exist: every image request succeeded.
  await screenshot(page, "covers-album-grid");
  assert.deepEqual(page.problems, []);

  // A tile opens its album, whose rows carry its cover.
  await covered.click();
  await page.waitForFunction(() => (document.getElementById("listing").dataset.node ?? "").startsWith("musiclib_album:"), null, { timeout: 20000 });
  await page.waitForSelector('#tracks .track > .cover[data-state="known"] img', { timeout: 20000 });
  const rowCovers = await page.locator("#tracks .track > .cover img").evaluateAll((imgs) => imgs.map((i) => i.getAttribute("src")));
  assert.ok(rowCovers.length >= 5);
  assert.deepEqual(await brokenImages(page), []);
  assert.deepEqual(page.problems, []);
});

test("an artist lists its albums as the grid and Play all plays all its tracks, the cover beside the player", async () => {
  const page = await openTree(browser, "demo");
  await expandNode(page, "musiclib_music_aa");
  const artist = childNamed(page, "musiclib_music_aa", "Aurora Lane");
  const artistId = await artist.getAttribute("data-id");
  await artist.locator(":scope > .row .label").click();
  await listed(page, artistId);
  assert.equal(await page.locator("#containers.album-grid button.album-tile").count(), 3);
  // The artist is not repeated under each of its own albums.
  assert.match(await page.locator("#containers .album-facts").first().textContent(), /^(199[5-9]|20[0-2][0-9]) · (10|5) tracks$/);
  assert.equal(await page.locator("#list-count").textContent(), "25 tracks");
  assert.equal(await page.locator("#play-all").isDisabled(), false);
  const streams = await page.evaluate(async (node) => {
    const reply = await (await fetch(`webapi/library.cgi?action=albums&node=${encodeURIComponent(node)}`)).json();
    return reply.tracks.map((t) => t.stream);
  }, artistId);
  assert.equal(streams.length, 25);
  assert.equal(await page.locator("#tracks .track").first().getAttribute("data-stream"), streams[0]);
  await page.locator("#play-all").click();
  await page.waitForSelector("#player[data-state=playing]", { timeout: 15000 });
  assert.equal(await page.locator("#player").getAttribute("data-stream"), streams[0]);
  await page.waitForSelector("#now-cover img.cover-image", { timeout: 15000 });
  assert.match(await page.locator("#now-cover img").getAttribute("src"), /^media\/art\/[0-9]+\.png$/);
  await page.locator("#next").click();
  await page.waitForFunction((s) => document.getElementById("player").dataset.stream === s, streams[1], { timeout: 15000 });
  assert.deepEqual(await brokenImages(page), []);
  await screenshot(page, "covers-artist");

  // An artist without covers: placeholders in the grid, the rows and the player.
  const plain = childNamed(page, "musiclib_music_aa", "The Copper Kettles");
  const plainId = await plain.getAttribute("data-id");
  await plain.locator(":scope > .row .label").click();
  await listed(page, plainId);
  await page.waitForSelector("#tracks .track > .cover .cover-placeholder");
  assert.equal(await page.locator("#containers img, #tracks img").count(), 0);
  await page.locator("#play-all").click();
  await page.waitForSelector("#now-cover .cover-placeholder", { timeout: 15000 });
  assert.deepEqual(page.problems, []);
});

// The harness logs in through Playwright's credentials, which turn the browser's HTTP cache off;
// this page sends the login as a header instead, so that the cache works as a user's does.
async function openCachingPage() {
  const context = await browser.newContext({
    baseURL,
    viewport: { width: 1000, height: 760 },
    extraHTTPHeaders: { Authorization: `Basic ${Buffer.from(`demo:${password}`).toString("base64")}` },
  });
  const page = await context.newPage();
  await page.goto("./");
  await page.waitForSelector("body[data-ready=true]", { timeout: 20000 });
  return page;
}

test("a cover comes through the login with caching headers, and a reload does not fetch it again", async () => {
  const page = await openCachingPage();
  await choose(page, "musiclib_music_album");
  await page.waitForSelector("#containers img.cover-image");
  assert.deepEqual(await brokenImages(page), []);
  const src = await page.locator("#containers img.cover-image").first().getAttribute("src");
  const headers = await page.evaluate(async (url) => {
    const first = await fetch(url, { cache: "no-store" });
    const etag = first.headers.get("ETag");
    const again = await fetch(url, { cache: "no-store", headers: { "If-None-Match": etag } });
    return { status: first.status, type: first.headers.get("Content-Type"), cache: first.headers.get("Cache-Control"),
      etag, modified: first.headers.get("Last-Modified"), again: again.status };
  }, src);
  assert.equal(headers.status, 200);
  assert.equal(headers.type, "image/png");
  assert.match(headers.cache, /max-age=[1-9][0-9]*/);
  assert.match(headers.cache, /private/);
  assert.ok(headers.etag, "ETag");
  assert.ok(headers.modified, "Last-Modified");
  assert.equal(headers.again, 304);
  // Without the login: 401, no image.
  const anonymous = await fetch(new URL(src, baseURL));
  assert.equal(anonymous.status, 401);

  const cdp = await page.context().newCDPSession(page);
  await cdp.send("Network.enable");
  const fetched = [];
  const cached = new Set();
  cdp.on("Network.requestServedFromCache", ({ requestId }) => cached.add(requestId));
  cdp.on("Network.responseReceived", ({ requestId, response }) => {
    if (response.url.includes("/media/art/"))
      fetched.push({ url: response.url, requestId, status: response.status, fromCache: Boolean(response.fromDiskCache || response.fromMemoryCache) });
  });
  await page.reload();
  await page.waitForSelector("body[data-nav-ready=true]", { timeout: 20000 });
  await listed(page, "musiclib_music_album");
  await page.waitForSelector("#containers img.cover-image");
  assert.deepEqual(await brokenImages(page), []);
  const fromNetwork = fetched.filter((f) => !f.fromCache && !cached.has(f.requestId) && f.status !== 304);
  assert.deepEqual(fromNetwork, []);
  await page.context().close();
});

test("bad cover and album requests get a clear 4xx and no file", async () => {
  const page = await openTree(browser, "demo");
  const replies = await page.evaluate(async () => {
    const ask = async (path) => {
      const response = await fetch(path);
      let error = null;
      try { error = (await response.json()).error; } catch { /* not JSON */ }
      return [response.status, error];
    };
    return {
      streams: await ask("webapi/library.cgi?action=covers&streams=..%2Fetc%2Fpasswd"),
      none: await ask("webapi/library.cgi?action=covers"),
      many: await ask(`webapi/library.cgi?action=covers&streams=${Array.from({ length: 201 }, (_, i) => `${i + 1}.flac`).join(",")}`),
      node: await ask("webapi/library.cgi?action=albums&node=musiclib_music_all"),
      artist: await ask("webapi/library.cgi?action=albums&node=musiclib_artist%3A..%2F.."),
      gif: await ask("media/art/1.gif"),
      traversal: await ask("media/art/..%2F..%2Fetc%2Fpasswd"),
      noCover: await ask("media/art/999999999.jpg"),
    };
  });
  assert.deepEqual(replies.streams, [400, "request_invalid"]);
  assert.deepEqual(replies.none, [400, "request_invalid"]);
  assert.deepEqual(replies.many, [413, "too_large"]);
  assert.deepEqual(replies.node, [404, "node_gone"]);
  assert.deepEqual(replies.artist, [404, "node_gone"]);
  assert.equal(replies.gif[0], 404);
  assert.equal(replies.traversal[0], 404);
  assert.equal(replies.noCover[0], 404);
});
