// Navigation on the running system: the breadcrumb above the pane, the browser's Back and Forward
// between views (a node selected in the tree, a container opened in the pane), one history entry for
// a walk through the tree with the arrow keys, and no internal id on screen. Across page loads:
// nav-reload.test.js.
import { test, before, after } from "node:test";
import assert from "node:assert/strict";
import { listed, choose, expandNode, crumbs, label, openFirstAlbum } from "./nav-helpers.js";
import { launch, close, openTree, item, screenshot } from "./harness.js";

let browser;
before(async () => { browser = await launch(); });
after(async () => { await close(browser); });

test("the pane shows the path to the open view as a breadcrumb, and no internal id", async () => {
  const page = await openTree(browser, "demo");
  await expandNode(page, "musiclib_root");
  await choose(page, "musiclib_music_album");
  const root = await label(page, "musiclib_root");
  const albums = await label(page, "musiclib_music_album");
  assert.deepEqual(await crumbs(page), [root, albums]);
  const album = await openFirstAlbum(page);
  assert.deepEqual(await crumbs(page), [root, albums, album.title]);
  assert.equal(await page.locator("#selected-text").textContent(), album.title);
  assert.equal(await page.locator("#breadcrumb [aria-current]").textContent(), album.title);
  // No node id anywhere in the pane's text.
  const text = await page.locator("#detail").innerText();
  assert.doesNotMatch(text, /musiclib_|mediaserver_|inetradio_|album:/);
  assert.equal(await page.locator("#selected-id").count(), 0);
  await screenshot(page, "nav-breadcrumb");

  // A part of the path opens its view again.
  await page.locator("#breadcrumb button.crumb", { hasText: albums }).click();
  await listed(page, "musiclib_music_album");
  assert.deepEqual(await crumbs(page), [root, albums]);
  assert.equal(await item(page, "musiclib_music_album").getAttribute("aria-selected"), "true");
  assert.deepEqual(page.problems, []);
});

test("Back and Forward move between the views and never leave the page while there is a view", async () => {
  const page = await openTree(browser, "demo");
  await expandNode(page, "musiclib_root");
  const start = page.url();
  await choose(page, "musiclib_music_album");
  const album = await openFirstAlbum(page);
  await choose(page, "musiclib_music_all");
  assert.equal(new URL(page.url()).searchParams.get("view"), "musiclib_music_all");

  await page.goBack();
  await listed(page, album.node);
  assert.equal(await page.locator("#selected-text").textContent(), album.title);
  await page.goBack();
  await listed(page, "musiclib_music_album");
  assert.equal(await item(page, "musiclib_music_album").getAttribute("aria-selected"), "true");
  await page.goForward();
  await listed(page, album.node);
  await page.goForward();
  await listed(page, "musiclib_music_all");
  assert.equal(await item(page, "musiclib_music_all").getAttribute("aria-selected"), "true");
  // Back to the first view, then once more: the page as it started, still the app.
  await page.goBack();
  await page.goBack();
  await listed(page, "musiclib_music_album");
  await page.goBack();
  await page.waitForFunction(() => document.getElementById("listing").hidden && !document.getElementById("hint").hidden);
  assert.equal(page.url(), start);
  assert.equal(await page.locator("body[data-ready=true]").count(), 1);
  assert.deepEqual(page.problems, []);
});

test("arrow keys through the tree make one history entry once they rest", async () => {
  const page = await openTree(browser, "demo");
  await expandNode(page, "musiclib_root");
  const length = await page.evaluate(() => history.length);
  await item(page, "musiclib_root").locator(":scope > .row").focus();
  // Four presses at once (as a held key repeats), so that a loaded machine cannot space them out.
  await page.evaluate(() => {
    for (let i = 0; i < 4; i++)
      document.activeElement.dispatchEvent(new KeyboardEvent("keydown", { key: "ArrowDown", bubbles: true, cancelable: true }));
  });
  const selected = await page.locator('#tree li[aria-selected="true"]').getAttribute("data-id");
  await page.waitForFunction((n) => new URL(location.href).searchParams.get("view") === n, selected);
  assert.equal(await page.evaluate(() => history.length), length + 1);
  assert.deepEqual(page.problems, []);
});

