// An expired login, a node that no longer exists and a refused request, each worded as what it is
// in the user's language.
import { test, before, after } from "node:test";
import assert from "node:assert/strict";
import { writeFileSync, unlinkSync } from "node:fs";
import { FAILURE_WORDS } from "../../site/ui/words/failures.js";
import { launch, close, openTree, item, childIds, screenshot, password } from "./harness.js";
import { open, select, listed, expectFailedPane, expectStatus, noPageErrors } from "./failure-checks.js";

let browser;
before(async () => { browser = await launch(); });
after(async () => { await close(browser); });

const playlists = "/usr/vanu/etc/preference/demo/playlists";

test("an expired login: the pane and the status line say to log in again", async () => {
  const page = await openTree(browser, "demo");
  await listed(page, "musiclib_music_album");
  // From now on the browser's login is one that the server does not accept: lighttpd answers every
  // request with 401, also after the browser answered its challenge.
  const stale = { username: "demo", password: password + "-no-longer" };
  await page.context().setHTTPCredentials(stale);
  await page.context().setExtraHTTPHeaders({ Authorization: "Basic " + Buffer.from(`${stale.username}:${stale.password}`).toString("base64") });
  await select(page, "musiclib_music_genre");
  await expectFailedPane(page, "login_expired");
  await expectStatus(page, "login_expired");
  await screenshot(page, "failures-login-expired");
  noPageErrors(page);
});

test("a node that no longer exists: the pane says so, the tree marks it, and the next listing clears the error", async () => {
  writeFileSync(`${playlists}/Soon Gone.m3u`, "#EXTM3U\n/volume1/music/x.flac\n");
  const page = await openTree(browser, "demo");
  await open(page, "musiclib_music_personal");
  const gone = "musiclib_music_personal/playlist/Soon Gone";
  assert.ok((await childIds(page, "musiclib_music_personal")).includes(gone));
  unlinkSync(`${playlists}/Soon Gone.m3u`);
  await select(page, gone);
  await expectFailedPane(page, "node_gone");
  await expectStatus(page, "node_gone");
  assert.equal(await item(page, gone).getAttribute("data-gone"), "true");
  await listed(page, "musiclib_music_personal/playlist/Road Trip");
  assert.equal(await page.locator("#status").textContent(), "");
  assert.notEqual(await page.locator("#status").getAttribute("role"), "alert");
  noPageErrors(page);
});

test("a container that left the library since the tree was drawn says so when expanded, not \"(empty)\"", async () => {
  const page = await openTree(browser, "demo");
  // The Artists category as the tree CGI drew it before the library lost one of them: the real
  // category's reply with one artist more, whose node the library no longer has.
  const left = "musiclib_artist:Left%20The%20Library";
  await page.route("**/webapi/audiotree.cgi*", async (route) => {
    const params = new URLSearchParams(route.request().postData() ?? "");
    if (params.get("action") !== "gettreenode" || params.get("node") !== "musiclib_music_aa") return route.continue();
    const response = await route.fetch();
    const nodes = JSON.parse(await response.text());
    nodes.push({ ...nodes[0], id: left, text: "Left The Library" });
    return route.fulfill({ response, body: JSON.stringify(nodes) + "\n" });
  });
  await open(page, "musiclib_music_aa");
  assert.ok((await childIds(page, "musiclib_music_aa")).includes(left));
  await item(page, left).locator(":scope > .row > .twisty").click();
  await expectStatus(page, "node_gone");
  assert.equal(await item(page, left).getAttribute("data-gone"), "true");
  assert.equal(await item(page, left).getAttribute("aria-expanded"), "false");
  assert.equal(await item(page, left).locator(".empty").count(), 0);
  // An artist still in the library expands as before.
  const kept = (await childIds(page, "musiclib_music_aa")).find((id) => id !== left);
  await open(page, kept);
  assert.equal(await item(page, kept).getAttribute("data-gone"), null);
  noPageErrors(page);
});

test("a refused request says that the permission is missing", async () => {
  const page = await openTree(browser, "guest");
  // The guest has no media server permission: a listing of one is refused by library.cgi itself.
  await page.route("**/webapi/library.cgi?*", (route) => {
    const url = new URL(route.request().url());
    if (url.searchParams.get("action") === "list") url.searchParams.set("node", "mediaserver_http://192.0.2.2:50003/ContentDirectory/control");
    return route.continue({ url: url.toString() });
  });
  await select(page, "musiclib_music_album");
  await expectFailedPane(page, "request_refused");
  await expectStatus(page, "request_refused");
  noPageErrors(page);
});

test("failures are worded in the user's language (German)", async () => {
  const page = await openTree(browser, "hans");
  await page.route("**/webapi/library.cgi?*", (route) => {
    const url = new URL(route.request().url());
    if (url.searchParams.get("action") === "list") url.searchParams.set("node", "musiclib_music_personal/playlist/Nowhere");
    return route.continue({ url: url.toString() });
  });
  await select(page, "musiclib_music_album");
  const german = FAILURE_WORDS.ger.failures.node_gone;
  await expectFailedPane(page, "node_gone", german);
  await expectStatus(page, "node_gone", german);
  noPageErrors(page);
});
