// The running system through a real browser: lighttpd, audiotree.cgi, harmona-mediad over the
// indexed sample share, vanuaudiod, as scripts/system-inside starts them (the same as scripts/demo).
import { test, before, after } from "node:test";
import assert from "node:assert/strict";
import { writeFileSync, statSync, readFileSync, mkdirSync, existsSync } from "node:fs";
import { launch, close, openTree, item, childIds, rootIds, screenshot } from "./harness.js";

let browser;

before(async () => { browser = await launch(); });
after(async () => { await close(browser); });

const open = async (page, id) => {
  const li = item(page, id);
  if ((await li.getAttribute("aria-expanded")) !== "true") await li.locator(":scope > .row > .twisty").click();
  await page.waitForSelector(`li[data-id="${id}"][aria-expanded=true]`);
};

test("log in and see the root categories", async () => {
  const page = await openTree(browser, "demo");
  const ids = await rootIds(page);
  assert.deepEqual(ids.slice(0, 3), ["musiclib_root", "musiclib_music_personal", "musiclib_music_shared"]);
  assert.ok(ids.includes("inetradio_root"));
  assert.equal(ids.at(-1), "mediaserver_root");
  assert.deepEqual(await childIds(page, "inetradio_root"),
    ["inetradio_new", "inetradio_sc", "inetradio_rio", "inetradio_userdefined", "inetradio_favorite"]);
  assert.equal(await item(page, "inetradio_root").locator(":scope > .row .label").textContent(), "Internet Radio");
  await screenshot(page, "tree-root");
  assert.deepEqual(page.problems, []);
});

test("expand Albums and see the sample albums", async () => {
  const page = await openTree(browser, "demo");
  await open(page, "musiclib_music_album");
  await page.waitForSelector('li[data-id="musiclib_music_album"] li[role=treeitem]', { timeout: 15000 });
  const labels = await item(page, "musiclib_music_album").locator(":scope > ul > li > .row .label").allTextContents();
  assert.ok(labels.includes("Rock & Roll <Live>"), `albums: ${labels.join(", ")}`);
  assert.ok(labels.length >= 12, `albums: ${labels.join(", ")}`);
  // Open one album and see its tracks.
  const first = item(page, "musiclib_music_album").locator(":scope > ul > li[role=treeitem]").first();
  await first.locator(":scope > .row > .twisty").click();
  await page.waitForFunction((id) => {
    const li = [...document.querySelectorAll("li[role=treeitem]")].find((x) => x.dataset.id === id);
    return li && li.dataset.state === "loaded";
  }, await first.getAttribute("data-id"));
  assert.ok((await first.locator(":scope > ul > li").count()) >= 1);
  await screenshot(page, "tree-albums");
  assert.deepEqual(page.problems, []);
});

test("refresh the personal playlists after a playlist file was added", async () => {
  const page = await openTree(browser, "demo");
  await open(page, "musiclib_music_personal");
  const before = await childIds(page, "musiclib_music_personal");
  assert.ok(before.includes("musiclib_music_personal/playlist/Road Trip"), before.join(", "));
  assert.ok(before.includes("musiclib_music_personal/smart/Jazz Only"), before.join(", "));
  writeFileSync("/usr/vanu/etc/preference/demo/playlists/Added Later.m3u", "#EXTM3U\n/volume1/music/x.flac\n");
  await item(page, "musiclib_music_personal_refresh").locator(".row").click();
  await page.waitForSelector('li[data-id="musiclib_music_personal"][data-refreshed="1"]');
  const after = await childIds(page, "musiclib_music_personal");
  assert.deepEqual(after.slice(0, 2), ["musiclib_music_personal_refresh", "musiclib_music_personal_new"]);
  assert.ok(after.includes("musiclib_music_personal/playlist/Added Later"), after.join(", "));
  assert.equal(after.length, before.length + 1);
  const hostile = item(page, "musiclib_music_personal/playlist/Rock & Roll <Favourites>");
  assert.equal(await hostile.locator(".label").textContent(), "Rock & Roll <Favourites>");
  await open(page, "musiclib_music_shared");
  assert.ok((await childIds(page, "musiclib_music_shared")).includes("musiclib_music_shared/playlist/7"));
  await screenshot(page, "tree-playlists");
});

test("regenerate random-100", async () => {
  const page = await openTree(browser, "demo");
  const file = "/tmp/==DynaRandom100==.demo";
  const before = existsSync(file) ? readFileSync(file, "utf8") : "";
  await page.locator("#rerandom").click();
  await page.waitForSelector("body[data-rerandom='1']");
  const after = readFileSync(file, "utf8");
  assert.match(after, /^#EXTM3U\n/);
  assert.equal(after.split("\n").filter((line) => line.startsWith("/volume1/music/")).length, 100);
  assert.notEqual(after, before);
  assert.equal(await page.locator("#status").textContent(), "A new Random 100 playlist was drawn.");
  assert.equal(statSync(file).mode & 0o777, 0o600);
});

test("the media server node lists the local server after a scan", async () => {
  const page = await openTree(browser, "demo");
  await open(page, "mediaserver_root");
  let servers = [];
  for (let attempt = 0; attempt < 20 && servers.length === 0; attempt++) {
    await item(page, "mediaserver_refresh").locator(".row").click();
    await page.waitForSelector(`li[data-id="mediaserver_root"][data-refreshed="${attempt + 1}"]`);
    servers = (await childIds(page, "mediaserver_root")).filter((id) => id !== "mediaserver_refresh");
    if (servers.length === 0) await page.waitForTimeout(500);
  }
  assert.ok(servers.some((id) => id.includes(":50003/")), `servers: ${servers.join(", ")}`);
  await screenshot(page, "tree-mediaservers");
});

test("a user without permission bits 1 and 8 sees no iPod and no media server node", async () => {
  // An attached iPod (the directory is what the root tree looks at), so that its absence means the bit.
  mkdirSync("/usr/vanu/etc/audio/ipod", { recursive: true });
  const guest = await openTree(browser, "guest");
  const ids = await rootIds(guest);
  assert.ok(!ids.includes("ipod_root"), ids.join(", "));
  assert.ok(!ids.includes("mediaserver_root"), ids.join(", "));
  assert.ok(ids.includes("inetradio_root"));
  await screenshot(guest, "tree-guest");
  const demo = await openTree(browser, "demo");
  const demoIds = await rootIds(demo);
  assert.ok(demoIds.includes("ipod_root"), demoIds.join(", "));
  assert.ok(demoIds.includes("mediaserver_root"), demoIds.join(", "));
  await open(demo, "ipod_root");
  assert.equal((await childIds(demo, "ipod_root"))[0], "ipod_refresh");
});

test("the tree in the user's language (German)", async () => {
  const page = await openTree(browser, "hans", { locale: "en-US" });
  assert.equal(await page.getAttribute("html", "lang"), "de");
  const texts = await page.evaluate(async () => (await (await fetch("ui/texts.json")).json()).ger);
  assert.equal(await item(page, "inetradio_root").locator(":scope > .row .label").textContent(), texts.radio.radio);
  assert.equal(await item(page, "inetradio_new").locator(".label").textContent(), texts.radio.new_radio_title);
  await screenshot(page, "tree-german");
});
