// The tree holds containers only: the tracks of a browsed container are listed in the pane, never
// drawn as tree items, and a track is played by selecting its row (mouse or keyboard). One Random
// 100: the tree's node, the pane and "New Random 100" show and change the user's one draw.
import { test, before, after } from "node:test";
import assert from "node:assert/strict";
import { readFileSync, rmSync } from "node:fs";
import { execFileSync } from "node:child_process";
import { launch, close, openTree, item, screenshot } from "./harness.js";
import { FAILURE_WORDS } from "../../site/ui/words/failures.js";

let browser;
before(async () => { browser = await launch(["--autoplay-policy=no-user-gesture-required"]); });
after(async () => { await close(browser); });

const db = "/var/packages/Harmona/var/library.db";
const TRACK_ID = /(^musiclib_|\/)track:\d+$/;
const open = async (page, id) => {
  const li = item(page, id);
  if ((await li.getAttribute("aria-expanded")) !== "true") await li.locator(":scope > .row > .twisty").click();
  await page.waitForSelector(`li[data-id="${id}"][data-state=loaded]`, { timeout: 20000 });
};
const treeIds = (page) => page.locator("#tree li[role=treeitem]").evaluateAll((lis) => lis.map((li) => li.dataset.id));
const shownStreams = (page) => page.evaluate(async () => {
  const node = document.getElementById("listing").dataset.node;
  const reply = await (await fetch(`webapi/library.cgi?action=list&node=${encodeURIComponent(node)}`)).json();
  return reply.tracks.map((t) => t.stream);
});
function streamsOfPlaylistFile(file) {
  const paths = readFileSync(file, "utf8").split("\n").filter((line) => line.startsWith("/"));
  return paths.map((path) => {
    const id = execFileSync("sqlite3", [db, `SELECT id FROM track WHERE path = '${path.replace(/'/g, "''")}'`], { encoding: "utf8" }).trim();
    return `${id}.${path.split(".").pop().toLowerCase()}`;
  });
}

test("All Music and an album show no track items in the tree; their tracks are in the pane", async () => {
  const page = await openTree(browser, "demo");
  await open(page, "musiclib_music_all");
  const ids = await treeIds(page);
  assert.equal(ids.filter((id) => TRACK_ID.test(id)).length, 0);
  assert.ok(ids.length < 100, `${ids.length} tree items`);
  assert.ok((await page.locator("#tree *").count()) < 1000);
  assert.equal(await item(page, "musiclib_music_all").locator(":scope > ul > li.note").textContent(), FAILURE_WORDS.enu.tracksInList);

  await open(page, "musiclib_music_album");
  const album = item(page, "musiclib_music_album").locator(":scope > ul > li[role=treeitem]").filter({ hasNotText: "Bench" }).first();
  const albumId = await album.getAttribute("data-id");
  await album.locator(":scope > .row .label").click();
  await page.waitForSelector(`li[data-id="${albumId}"][data-state=loaded]`, { timeout: 15000 });
  await page.waitForFunction((node) => document.getElementById("listing").dataset.node === node, albumId, { timeout: 15000 });
  assert.equal(await album.locator(":scope > ul > li[role=treeitem]").count(), 0);
  assert.equal(await album.locator(":scope > ul > li.note").count(), 1);
  assert.ok((await page.locator("#tracks .track").count()) >= 1);
  await screenshot(page, "tracks-album-in-pane");
  assert.deepEqual(page.problems, []);
});

test("a track row is played by the keyboard: arrows move over the rows, Enter plays", async () => {
  const page = await openTree(browser, "demo");
  await open(page, "musiclib_music_album");
  const album = item(page, "musiclib_music_album").locator(":scope > ul > li[role=treeitem]").filter({ hasNotText: "Bench" }).nth(1);
  const albumId = await album.getAttribute("data-id");
  await album.locator(":scope > .row .label").click();
  await page.waitForFunction((node) => document.getElementById("listing").dataset.node === node, albumId, { timeout: 15000 });
  const streams = await page.locator("#tracks .track").evaluateAll((rows) => rows.map((r) => r.dataset.stream));
  assert.ok(streams.length >= 2);
  await page.locator("#tracks").focus();
  await page.keyboard.press("ArrowDown");
  await page.keyboard.press("ArrowDown");
  assert.equal(await page.locator("#tracks .track.cursor").getAttribute("data-stream"), streams[1]);
  await page.keyboard.press("Enter");
  await page.waitForSelector("#player[data-state=playing]", { timeout: 15000 });
  assert.equal(await page.locator("#player").getAttribute("data-stream"), streams[1]);
  assert.equal(await page.locator("#tracks .track.playing").getAttribute("data-stream"), streams[1]);
  assert.deepEqual(page.problems, []);
});

test("arrow keys through the tree list a container once the keys rest and never ask for a track", async () => {
  const page = await openTree(browser, "demo");
  await open(page, "musiclib_music_album");
  const asked = [];
  page.on("request", (request) => {
    const url = request.url();
    if (url.includes("library.cgi") || url.includes("audiotree.cgi")) asked.push(decodeURIComponent(url + " " + (request.postData() ?? "")));
  });
  const first = item(page, "musiclib_music_album").locator(":scope > ul > li[role=treeitem]").first();
  await first.locator(":scope > .row").focus();
  for (let i = 0; i < 8; i++) await page.keyboard.press("ArrowDown");
  const selected = await page.locator('#tree li[aria-selected="true"]').getAttribute("data-id");
  await page.waitForFunction((node) => document.getElementById("listing").dataset.node === node, selected, { timeout: 15000 });
  const lists = asked.filter((a) => a.includes("action=list"));
  assert.ok(lists.length <= 2, lists.join("\n"));
  assert.ok(lists.at(-1).includes(selected), lists.join("\n"));
  assert.equal(asked.filter((a) => a.includes("track:")).length, 0, asked.join("\n"));
  assert.equal(asked.filter((a) => a.includes("gettreenode")).length, 0, asked.join("\n"));
  assert.deepEqual(page.problems, []);
});

test("one Random 100: the tree's node lists the user's draw (drawn when there is none), and New Random 100 changes what it shows", async () => {
  const file = "/tmp/==DynaRandom100==.guest";
  rmSync(file, { force: true });
  const page = await openTree(browser, "guest");
  await item(page, "musiclib_random").locator(":scope > .row .label").click();
  await page.waitForFunction(() => document.getElementById("listing").dataset.node === "musiclib_random", null, { timeout: 20000 });
  assert.equal(await page.locator("#list-count").textContent(), "100 tracks");
  const first = streamsOfPlaylistFile(file);
  assert.equal(first.length, 100);
  assert.deepEqual(await shownStreams(page), first);
  assert.equal(await page.locator("#tracks .track").first().getAttribute("data-stream"), first[0]);
  // The tree shows no list of its own under the node.
  await page.waitForSelector('li[data-id="musiclib_random"][data-state=loaded]', { timeout: 20000 });
  assert.equal(await item(page, "musiclib_random").locator(":scope > ul > li[role=treeitem]").count(), 0);

  const loaded = Number(await page.locator("#listing").getAttribute("data-loaded"));
  await page.locator("#rerandom").click();
  await page.waitForFunction((n) => Number(document.getElementById("listing").dataset.loaded) > n, loaded, { timeout: 20000 });
  const second = streamsOfPlaylistFile(file);
  assert.notDeepEqual(second, first);
  assert.equal(await page.locator("#tracks .track").first().getAttribute("data-stream"), second[0]);
  assert.deepEqual(await shownStreams(page), second);
  assert.equal(await page.locator("#status").textContent(), "A new Random 100 playlist was drawn.");
  await screenshot(page, "tracks-random-100");
  assert.deepEqual(page.problems, []);
});
