// The tree page's own behaviour, whatever the CGI's builders answer today: the real lighttpd serves
// the page (login, headers) and the CGI for the keep-alive, while the tree replies are scripted with
// Playwright's request routing, to show every reply shape the CGI sends, hostile texts and faults.
import { test, before, after } from "node:test";
import assert from "node:assert/strict";
import { launch, close, openTree, item, childIds, rootIds, screenshot, baseURL, password } from "./harness.js";

let browser;
before(async () => { browser = await launch(); });
after(async () => { await close(browser); });

const node = (id, text, extra = {}) => ({
  allowDrag: false, allowDrop: false, draggable: false, expanded: false, leaf: true,
  id, text, qtip: text, icon: "3rdparty/Harmona/images/files_class/icon_container.png", ...extra,
});
const category = (id, text, children, extra = {}) =>
  node(id, text, { icon: "3rdparty/Harmona/images/s.gif", iconCls: "x-tree-hide-icon", leaf: false, children, ...extra });

// A root tree as the CGI writes it, with texts as FillTreeNode encodes them.
const ROOT = [
  category("musiclib_root", "Library", [
    node("musiclib_music_album", "Album", { pid: "musiclib", icon: "3rdparty/Harmona/images/files_class/icon_class_album.png" }),
    node("musiclib_random", "Random 100", { pid: "musiclib", icon: "3rdparty/Harmona/images/files_class/icon_class_random100.png" }),
  ], { expanded: true }),
  category("musiclib_music_personal", "Personal Playlists", [
    node("musiclib_music_personal_refresh", "Refresh", { icon: "3rdparty/Harmona/images/button/btn_refresh.png" }),
    node("musiclib_music_personal_new", "New Playlist", { icon: "3rdparty/Harmona/images/button/btn_new_playlist.png", allowDrop: true }),
    node("musiclib_music_personal/playlist/Old", "Old", { pid: "musiclib_music_personal" }),
    node("musiclib_music_personal/playlist/<img src=x onerror=window.pwned=1>",
      "&lt;img src=x onerror=window.pwned=1&gt;", { pid: "musiclib_music_personal" }),
  ]),
  category("inetradio_root", "Internet Radio", [
    node("inetradio_new", "Add Radio Station", { pid: "inetradio_root", icon: "3rdparty/Harmona/images/button/btn_new_station.png" }),
    node("inetradio_sc", "Rock &amp; Roll &quot;FM&quot; &#39;live&#39;", { pid: "inetradio_root", icon: "javascript:alert(1)" }),
  ], { expanded: true }),
  category("mediaserver_root", "Media Servers", [
    node("mediaserver_refresh", "Search for media servers", { icon: "3rdparty/Harmona/images/button/btn_search_dms.png" }),
    node("mediaserver_http://old/ContentDirectory/control", "Old server", { pid: "mediaserver_root" }),
  ]),
];

// Routes the tree requests to `answer(params)` -> {body} or {status, body}; avoid_timeout and
// anything `answer` leaves (undefined) go to the real CGI.
async function script(page, answer) {
  const seen = [];
  await page.context().route("**/webapi/audiotree.cgi*", async (route) => {
    const params = Object.fromEntries(new URLSearchParams(route.request().postData() ?? ""));
    seen.push(params);
    const reply = answer(params);
    if (reply === undefined) return route.continue();
    return route.fulfill({ status: reply.status ?? 200, contentType: 'text/plain; charset="UTF-8"', body: reply.body });
  });
  return seen;
}
const json = (value) => ({ body: JSON.stringify(value) + "\n" });

async function openScripted(answer, options) {
  const context = await browser.newContext({ baseURL, httpCredentials: { username: "demo", password }, ...options });
  const page = await context.newPage();
  const errors = [];
  page.on("pageerror", (e) => errors.push(e.message));
  const seen = await script(page, answer);
  await page.goto("./");
  await page.waitForSelector("body[data-ready=true]");
  return { page, seen, errors };
}

test("the root tree: categories in order, expanded as the nodes say, texts decoded and shown as text", async () => {
  const { page, errors } = await openScripted((p) => (p.action === "gettreenode" && p.node === "audiotree_root" ? json(ROOT) : undefined));
  assert.deepEqual(await rootIds(page), ["musiclib_root", "musiclib_music_personal", "inetradio_root", "mediaserver_root"]);
  assert.equal(await item(page, "musiclib_root").getAttribute("aria-expanded"), "true");
  assert.equal(await item(page, "inetradio_root").getAttribute("aria-expanded"), "true");
  assert.equal(await item(page, "musiclib_music_personal").getAttribute("aria-expanded"), "false");
  assert.equal(await item(page, "inetradio_sc").locator(".label").textContent(), `Rock & Roll "FM" 'live'`);
  // The encoded markup is text: no element made of it, nothing ran.
  await item(page, "musiclib_music_personal").locator(":scope > .row").click();
  const hostile = item(page, "musiclib_music_personal/playlist/<img src=x onerror=window.pwned=1>");
  assert.equal(await hostile.locator(".label").textContent(), "<img src=x onerror=window.pwned=1>");
  assert.equal(await page.locator("#tree img:not(.icon)").count(), 0);
  assert.equal(await page.evaluate(() => window.pwned), undefined);
  // Icons: category icons hidden (x-tree-hide-icon), node icons shown, a foreign icon refused.
  assert.equal(await item(page, "musiclib_root").locator(":scope > .row > img.icon.hidden").count(), 1);
  assert.match(await item(page, "musiclib_music_album").locator(":scope > .row > img").getAttribute("src"), /icon_class_album\.png$/);
  assert.doesNotMatch(await item(page, "inetradio_sc").locator(":scope > .row > img").getAttribute("src"), /javascript/);
  await screenshot(page, "page-scripted-root");
  assert.deepEqual(errors, []);
});

test("a library container is loaded when opened; [[]] and [] show it empty", async () => {
  const { page, seen } = await openScripted((p) => {
    if (p.node === "audiotree_root") return json(ROOT);
    if (p.node === "musiclib_music_album") return json([node("musiclib_album/1", "First &amp; Last", { pid: "musiclib_music_album" }), node("musiclib_album/2", "Empty", { pid: "musiclib_music_album" })]);
    if (p.node === "musiclib_album/2") return json([[]]);
    if (p.node === "musiclib_random") return json([]);
    return undefined;
  });
  await item(page, "musiclib_music_album").locator(":scope > .row").click();
  await page.waitForSelector('li[data-id="musiclib_album/1"]');
  assert.deepEqual(await childIds(page, "musiclib_music_album"), ["musiclib_album/1", "musiclib_album/2"]);
  assert.equal(await item(page, "musiclib_album/1").locator(".label").textContent(), "First & Last");
  // The library still has both, the second empty: library.cgi tells an empty container from one that
  // left the library.
  await page.route((url) => url.pathname.endsWith("/webapi/library.cgi") && url.searchParams.get("action") === "list",
    (route) => route.fulfill({ status: 200, contentType: "application/json", body: JSON.stringify({ success: true, tracks: [], containers: [] }) }));
  await item(page, "musiclib_album/2").locator(":scope > .row").click();
  await page.waitForSelector('li[data-id="musiclib_album/2"][aria-expanded=true] li.empty');
  await item(page, "musiclib_random").locator(":scope > .row").click();
  await page.waitForSelector('li[data-id="musiclib_random"][aria-expanded=true] li.empty');
  const asked = seen.filter((p) => p.action === "gettreenode").map((p) => p.node);
  assert.deepEqual(asked, ["audiotree_root", "musiclib_music_album", "musiclib_album/2", "musiclib_random"]);
  // Closing and opening again asks nothing more.
  await item(page, "musiclib_music_album").locator(":scope > .row > .twisty").click();
  await item(page, "musiclib_music_album").locator(":scope > .row > .twisty").click();
  assert.equal(seen.filter((p) => p.action === "gettreenode").length, 4);
});

test("refresh buttons replace the children after the buttons with the reply's items", async () => {
  const { page, seen } = await openScripted((p) => {
    if (p.node === "audiotree_root") return json(ROOT);
    if (p.action === "refresh" && p.target === "personal")
      return json({ items: [node("musiclib_music_personal/playlist/New", "New", { pid: "musiclib_music_personal" })], success: true });
    if (p.action === "refresh" && p.target === "mediaserver") return { body: '{"items":null,"success":true}\n' };
    return undefined;
  });
  await item(page, "musiclib_music_personal").locator(":scope > .row").click();
  await item(page, "musiclib_music_personal_refresh").locator(".row").click();
  await page.waitForSelector('li[data-id="musiclib_music_personal"][data-refreshed="1"]');
  assert.deepEqual(await childIds(page, "musiclib_music_personal"),
    ["musiclib_music_personal_refresh", "musiclib_music_personal_new", "musiclib_music_personal/playlist/New"]);
  await item(page, "mediaserver_root").locator(":scope > .row").click();
  await item(page, "mediaserver_refresh").locator(".row").click();
  await page.waitForSelector('li[data-id="mediaserver_root"][data-refreshed="1"]');
  assert.deepEqual(await childIds(page, "mediaserver_root"), ["mediaserver_refresh"]);
  assert.deepEqual(seen.filter((p) => p.action === "refresh").map((p) => p.target), ["personal", "mediaserver"]);
});

test("error replies are shown with their localized text; nodes built before the error stay", async () => {
  const { page } = await openScripted((p) => {
    if (p.node === "audiotree_root")
      return json({ items: ROOT.slice(0, 1), success: false, errinfo: { sec: "error", key: "Could not get the entry", line: 90 } });
    if (p.action === "rerandom100")
      return json({ success: false, errinfo: { sec: "playlist", key: "error_create_random100", line: 616 } });
    if (p.action === "refresh") return json({ success: false, errinfo: { sec: "no_such", key: "text", line: 1 } });
    return undefined;
  });
  assert.deepEqual(await rootIds(page), ["musiclib_root"]);
  assert.equal(await page.locator("#status").textContent(), "Could not get the entry.");
  assert.equal(await page.locator("#status").getAttribute("role"), "alert");
  await page.locator("#rerandom").click();
  await page.waitForSelector('#status[data-errinfo="playlist/error_create_random100"]');
  assert.equal(await page.locator("#status").textContent(), "Could not create the random playlist.");
  await screenshot(page, "page-scripted-error");
});

test("the error texts and the page follow the user's language", async () => {
  const { page } = await openScripted((p) => {
    if (p.node === "audiotree_root") return json(ROOT);
    if (p.action === "rerandom100") return json({ success: false, errinfo: { sec: "playlist", key: "error_create_random100", line: 616 } });
    return undefined;
  }, { httpCredentials: { username: "hans", password } });
  assert.equal(await page.getAttribute("body", "data-language"), "ger");
  assert.equal(await page.getAttribute("html", "lang"), "de");
  assert.equal(await page.locator("#rerandom").textContent(), "Neue Zufalls-100");
  await page.locator("#rerandom").click();
  await page.waitForSelector('#status[data-errinfo="playlist/error_create_random100"]');
  const texts = await page.evaluate(async () => (await (await fetch("ui/texts.json")).json()).ger.playlist.error_create_random100);
  assert.equal(await page.locator("#status").textContent(), texts);
});

test("a user without a login is refused; the CGI says why a request failed", async () => {
  const context = await browser.newContext({ baseURL });
  const response = await context.request.get("./");
  assert.equal(response.status(), 401);
  const wrong = await browser.newContext({ baseURL, httpCredentials: { username: "demo", password: password + "x" } });
  assert.equal((await wrong.request.get("./webapi/audiotree.cgi?action=avoid_timeout")).status(), 401);
  const { page } = await openScripted((p) => (p.node === "audiotree_root" ? json(ROOT) : p.action === "rerandom100" ? { status: 500, body: "" } : undefined));
  await page.locator("#rerandom").click();
  await page.waitForFunction(() => document.querySelector("#status").textContent.includes("500"));
});

test("headers: no caching of CGI replies, no sniffing, a content security policy on the page", async () => {
  const context = await browser.newContext({ baseURL, httpCredentials: { username: "demo", password } });
  const pageResponse = await context.request.get("./");
  assert.equal(pageResponse.status(), 200);
  assert.equal(pageResponse.headers()["x-content-type-options"], "nosniff");
  assert.match(pageResponse.headers()["content-security-policy"], /script-src 'self'/);
  assert.doesNotMatch(pageResponse.headers()["content-security-policy"], /unsafe/);
  const cgiResponse = await context.request.post("./webapi/audiotree.cgi", { form: { action: "avoid_timeout" } });
  assert.equal(cgiResponse.status(), 200);
  assert.equal(cgiResponse.headers()["cache-control"], "no-store");
  assert.equal(cgiResponse.headers()["x-content-type-options"], "nosniff");
  assert.deepEqual(await cgiResponse.json(), { success: true });
  // The UI text tables and the plugins beside the CGI are not served.
  assert.equal((await context.request.get("./texts/enu/strings")).status(), 403);
});

test("the keep-alive sends avoid_timeout to the real CGI while the page is open", async () => {
  const { page, seen } = await openScripted((p) => (p.node === "audiotree_root" ? json(ROOT) : undefined), {});
  await page.goto("./?keepalive=1");
  await page.waitForSelector("body[data-ready=true]");
  await page.waitForFunction(() => Number(document.body.dataset.keepalive) >= 2, null, { timeout: 10000 });
  assert.ok(seen.filter((p) => p.action === "avoid_timeout").length >= 2);
  // The status stays clean: the real CGI answered {"success": true}.
  assert.notEqual(await page.locator("#status").getAttribute("role"), "alert");
});
