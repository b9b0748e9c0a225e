// Listening from the tree: the right-hand pane lists what the selected node holds (library.cgi) and
// plays it through lighttpd's proxy to harmona-mediad, over the indexed sample share (real FLAC
// files made with sox) and the Bench folder of 10,000 tracks.
import { test, before, after } from "node:test";
import assert from "node:assert/strict";
import { readFileSync } from "node:fs";
import { execFileSync } from "node:child_process";
import { launch, close, openTree, item, screenshot, baseURL, password } from "./harness.js";

let browser;
before(async () => { browser = await launch(["--autoplay-policy=no-user-gesture-required"]); });
after(async () => { await close(browser); });

const db = "/var/packages/Harmona/var/library.db";
const basic = (user) => "Basic " + Buffer.from(`${user}:${password}`).toString("base64");

// The stream ids that the library gives the paths of a playlist file, in file order.
function streamsOfPlaylistFile(file) {
  const paths = readFileSync(file, "utf8").split("\n").filter((line) => line.startsWith("/"));
  return paths.map((path) => {
    const id = execFileSync("sqlite3", [db, `SELECT id FROM track WHERE path = '${path.replace(/'/g, "''")}'`], { encoding: "utf8" }).trim();
    assert.match(id, /^\d+$/, path);
    return `${id}.${path.split(".").pop().toLowerCase()}`;
  });
}

const open = async (page, id) => {
  const li = item(page, id);
  if ((await li.getAttribute("aria-expanded")) !== "true") await li.locator(":scope > .row > .twisty").click();
  await page.waitForSelector(`li[data-id="${id}"][data-state=loaded]`, { timeout: 15000 });
};
// Selects a node by a click on its row and waits for the pane to list it.
async function selectNode(page, li) {
  const id = await li.getAttribute("data-id");
  await li.locator(":scope > .row .label").click();
  await page.waitForFunction((node) => document.getElementById("listing").dataset.node === node &&
    !document.getElementById("listing").hasAttribute("aria-busy"), id, { timeout: 20000 });
  return id;
}
async function listedStreams(page) {
  const node = await page.locator("#listing").getAttribute("data-node");
  return page.evaluate(async (id) => {
    const reply = await (await fetch(`webapi/library.cgi?action=list&node=${encodeURIComponent(id)}`)).json();
    return reply.tracks.map((t) => t.stream);
  }, node);
}

test("click an album and see its tracks, then play one", async () => {
  const page = await openTree(browser, "demo");
  await open(page, "musiclib_music_album");
  // A sample album (1-second tracks), not the Bench folder's album.
  const album = item(page, "musiclib_music_album").locator(":scope > ul > li[role=treeitem]")
    .filter({ hasNotText: "Bench" }).first();
  await selectNode(page, album);
  const rows = page.locator("#tracks .track");
  assert.ok((await rows.count()) >= 1);
  assert.notEqual((await rows.first().locator(".title").textContent()).trim(), "");
  assert.match(await rows.first().locator(".duration").textContent(), /^0:0[12]$/);
  const stream = await rows.first().getAttribute("data-stream");
  assert.match(stream, /^\d+\.flac$/);
  const html = await page.content();
  assert.ok(!html.includes("/volume1"), "no server path in the page");

  await page.evaluate(() => {
    const audio = document.getElementById("audio");
    window.maxTime = 0;
    audio.addEventListener("timeupdate", () => { window.maxTime = Math.max(window.maxTime, audio.currentTime); });
  });
  await rows.first().click();
  await page.waitForSelector("#player[data-state=playing]", { timeout: 15000 });
  await page.waitForFunction(() => window.maxTime > 0.2, null, { timeout: 15000 });
  assert.equal(await page.locator("#player").getAttribute("data-stream"), stream);
  assert.equal(await page.locator(`#tracks .track.playing`).getAttribute("data-stream"), stream);
  await screenshot(page, "listen-album");
  assert.deepEqual(page.problems, []);
});

test("seek: the stream is served with Range through the proxy", async () => {
  const page = await openTree(browser, "demo");
  await open(page, "musiclib_music_album");
  await selectNode(page, item(page, "musiclib_music_album").locator(":scope > ul > li[role=treeitem]").nth(1));
  const stream = await page.locator("#tracks .track").first().getAttribute("data-stream");
  const ranged = await page.evaluate(async (s) => {
    const response = await fetch(`media/${s}`, { headers: { Range: "bytes=4-13" } });
    return { status: response.status, range: response.headers.get("content-range"), length: (await response.arrayBuffer()).byteLength };
  }, stream);
  assert.equal(ranged.status, 206);
  assert.match(ranged.range, /^bytes 4-13\/\d+$/);
  assert.equal(ranged.length, 10);

  await page.locator("#tracks .track").first().click();
  await page.waitForSelector("#player[data-state=playing]", { timeout: 15000 });
  await page.locator("#play").click(); // pause
  await page.waitForSelector("#player[data-state=paused]");
  await page.locator("#seek").evaluate((input) => { input.value = "800"; input.dispatchEvent(new Event("input")); });
  const time = await page.evaluate(() => document.getElementById("audio").currentTime);
  const duration = await page.evaluate(() => document.getElementById("audio").duration);
  assert.ok(Math.abs(time - 0.8 * duration) < 0.05, `${time} of ${duration}`);
  await page.locator("#volume").evaluate((input) => { input.value = "30"; input.dispatchEvent(new Event("input")); });
  assert.equal(await page.evaluate(() => document.getElementById("audio").volume), 0.3);
  assert.deepEqual(page.problems, []);
});

test("play a personal playlist in order", async () => {
  const page = await openTree(browser, "demo");
  await open(page, "musiclib_music_personal");
  await selectNode(page, item(page, "musiclib_music_personal/playlist/Road Trip"));
  const expected = streamsOfPlaylistFile("/usr/vanu/etc/preference/demo/playlists/Road Trip.m3u");
  const shown = await page.locator("#tracks .track").evaluateAll((rows) => rows.map((r) => r.dataset.stream));
  assert.deepEqual(shown, expected);
  await page.evaluate(() => {
    const audio = document.getElementById("audio");
    audio.defaultPlaybackRate = 4;
    window.played = [];
    audio.addEventListener("playing", () => {
      const s = document.getElementById("player").dataset.stream;
      if (window.played.at(-1) !== s) window.played.push(s);
    });
  });
  await page.locator("#play-all").click();
  await page.waitForFunction(() => window.played.length >= 3, null, { timeout: 30000 });
  const played = await page.evaluate(() => window.played);
  assert.deepEqual(played.slice(0, 3), expected.slice(0, 3));
  await page.locator("#next").click();
  await page.locator("#prev").click();
  assert.ok(expected.includes(await page.locator("#player").getAttribute("data-stream")));
  assert.deepEqual(page.problems, []);
});

test("the random-100 node lists the file drawn by New Random 100", async () => {
  const page = await openTree(browser, "demo");
  await page.locator("#rerandom").click();
  await page.waitForSelector("body[data-rerandom='1']");
  await open(page, "musiclib_root");
  await selectNode(page, item(page, "musiclib_random"));
  const expected = streamsOfPlaylistFile("/tmp/==DynaRandom100==.demo");
  assert.equal(expected.length, 100);
  assert.deepEqual(await listedStreams(page), expected);
  assert.equal(await page.locator("#list-count").textContent(), "100 tracks");
  assert.deepEqual(page.problems, []);
});

test("a 10,000-track container opens and scrolls, drawing only the rows in view", async () => {
  const page = await openTree(browser, "demo");
  await open(page, "musiclib_root");
  await open(page, "musiclib_music_file");
  const bench = item(page, "musiclib_music_file").locator(":scope > ul > li[role=treeitem]", { hasText: "Bench" });
  await selectNode(page, bench);
  assert.equal(await page.locator("#list-count").textContent(), "10000 tracks");
  assert.ok((await page.locator("#tracks .track").count()) < 100);
  await page.locator("#tracks").evaluate((viewport) => { viewport.scrollTop = viewport.scrollHeight; });
  await page.waitForSelector('#tracks .track[aria-rowindex="10000"]', { timeout: 5000 });
  assert.ok((await page.locator("#tracks .track").count()) < 100);
  await page.locator("#tracks").evaluate((viewport) => { viewport.scrollTop = 5000 * 28; });
  await page.waitForSelector('#tracks .track[aria-rowindex="5001"]', { timeout: 5000 });
  await screenshot(page, "listen-bench");
  assert.deepEqual(page.problems, []);
});

test("a media server on the network shows its top containers, browsed on that server", async () => {
  const page = await openTree(browser, "demo");
  const root = item(page, "mediaserver_root");
  if ((await root.getAttribute("aria-expanded")) !== "true") await root.locator(":scope > .row > .twisty").click();
  let servers = [];
  for (let attempt = 0; attempt < 20 && servers.length === 0; attempt++) {
    await item(page, "mediaserver_refresh").locator(".row").click();
    await page.waitForSelector(`li[data-id="mediaserver_root"][data-refreshed="${attempt + 1}"]`);
    servers = await root.locator(":scope > ul > li[role=treeitem]").evaluateAll((lis) =>
      lis.map((li) => li.dataset.id).filter((id) => id.includes(":50003/")));
    if (servers.length === 0) await page.waitForTimeout(500);
  }
  assert.equal(servers.length, 1, `servers: ${servers.join(", ")}`);
  await selectNode(page, item(page, servers[0]));
  const containers = await page.locator("#containers button").evaluateAll((buttons) => buttons.map((b) => b.dataset.object));
  assert.deepEqual(containers, ["music_all", "music_file", "music_album", "music_aa", "music_genre", "random", "music_latestalbum"]);
  // One level down on that server: the albums.
  await page.locator('#containers button[data-object="music_album"]').click();
  await page.waitForFunction(() => document.querySelectorAll("#containers button").length >= 12 &&
    !document.getElementById("listing").hasAttribute("aria-busy"), null, { timeout: 20000 });
  assert.deepEqual(page.problems, []);
});

test("without the login nothing is served (401), an unknown stream id gets 404", async () => {
  for (const path of ["webapi/library.cgi?action=list&node=musiclib_random", "media/1.flac"]) {
    const response = await fetch(new URL(path, baseURL));
    assert.equal(response.status, 401, path);
  }
  const headers = { Authorization: basic("demo") };
  const known = await (await fetch(new URL("webapi/library.cgi?action=list&node=musiclib_music_all", baseURL), { headers })).json();
  const stream = known.tracks[0].stream;
  assert.equal((await fetch(new URL(`media/${stream}`, baseURL), { headers })).status, 200);
  for (const path of ["media/99999999.flac", `media/${stream.replace(".flac", ".mp3")}`, "media/..%2Fetc%2Fpasswd", "media/1.flac/x",
    "webapi/library.cgi?action=track&stream=99999999.flac"]) {
    const response = await fetch(new URL(path, baseURL), { headers });
    assert.equal(response.status, 404, path);
  }
});
