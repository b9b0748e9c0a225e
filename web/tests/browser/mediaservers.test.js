// Another media server's tracks on the page: listed with title, artist, album and duration, and
// played through library.cgi behind the same login (the running system's own media server, which the
// audio daemon finds on the network link like any other).
import { test, before, after } from "node:test";
import assert from "node:assert/strict";
import { launch, close, openTree, item, screenshot, baseURL } from "./harness.js";

let browser;
before(async () => { browser = await launch(["--autoplay-policy=no-user-gesture-required"]); });
after(async () => { await close(browser); });

async function waitForListing(page) {
  await page.waitForFunction(() => !document.getElementById("listing").hasAttribute("aria-busy"), null, { timeout: 20000 });
}

test("a media server's album lists its tracks, and one plays through this server", async () => {
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
  await item(page, servers[0]).locator(":scope > .row .label").click();
  await page.waitForFunction((node) => document.getElementById("listing").dataset.node === node, servers[0], { timeout: 20000 });
  await waitForListing(page);
  await page.locator('#containers button[data-object="music_album"]').click();
  await page.waitForFunction(() => document.querySelectorAll("#containers button").length >= 2, null, { timeout: 20000 });
  await waitForListing(page);
  await page.locator("#containers button").filter({ hasNotText: "Bench" }).first().click();
  await page.waitForSelector("#tracks .track", { timeout: 20000 });
  await waitForListing(page);

  const rows = page.locator("#tracks .track");
  assert.ok((await rows.count()) >= 1);
  const first = rows.first();
  assert.notEqual((await first.locator(".title").textContent()).trim(), "");
  assert.notEqual((await first.locator(".artist").textContent()).trim(), "");
  assert.notEqual((await first.locator(".album").textContent()).trim(), "");
  assert.match(await first.locator(".duration").textContent(), /^0:0[12]$/);

  await page.evaluate(() => {
    const audio = document.getElementById("audio");
    window.maxTime = 0;
    audio.addEventListener("timeupdate", () => { window.maxTime = Math.max(window.maxTime, audio.currentTime); });
  });
  await first.click();
  await page.waitForSelector("#player[data-state=playing]", { timeout: 15000 });
  await page.waitForFunction(() => window.maxTime > 0.2, null, { timeout: 15000 });
  const src = new URL(await page.evaluate(() => document.getElementById("audio").src));
  assert.equal(src.origin, new URL(baseURL).origin);
  assert.equal(src.pathname, "/webapi/library.cgi");
  assert.equal(src.searchParams.get("action"), "remote_stream");
  assert.equal(src.searchParams.get("node"), servers[0]);
  await screenshot(page, "mediaserver-playing");

  // The same path with a Range, and without the login.
  const ranged = await page.evaluate(async (url) => {
    const response = await fetch(url, { headers: { Range: "bytes=4-13" } });
    return { status: response.status, range: response.headers.get("content-range"), length: (await response.arrayBuffer()).byteLength };
  }, src.href);
  assert.deepEqual({ status: ranged.status, length: ranged.length }, { status: 206, length: 10 });
  assert.match(ranged.range, /^bytes 4-13\/\d+$/);
  assert.equal((await fetch(src.href)).status, 401);
  assert.deepEqual(page.problems, []);
});

test("a user without the media server bit gets no track from a media server", async () => {
  const page = await openTree(browser, "guest");
  const status = await page.evaluate(async () => {
    const response = await fetch("webapi/library.cgi?action=remote_stream&node=mediaserver_http%3A%2F%2F192.0.2.1%3A50003%2Fx&object=1");
    return { status: response.status, body: await response.json() };
  });
  assert.equal(status.status, 403);
  assert.equal(status.body.error, "request_refused");
});
