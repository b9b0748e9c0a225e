// Navigation on the running system, across page loads: the view and the expanded tree after a
// reload, a bookmarked view in a new browser, and a view in the URL that names no node.
import { test, before, after } from "node:test";
import assert from "node:assert/strict";
import { listed, choose, expandNode, crumbs, label, openFirstAlbum } from "./nav-helpers.js";
import { launch, close, openTree, item } from "./harness.js";

let browser;
before(async () => { browser = await launch(); });
after(async () => { await close(browser); });

test("a reload opens the same view, with the tree expanded as it was", async () => {
  const page = await openTree(browser, "demo");
  await expandNode(page, "musiclib_root");
  await expandNode(page, "musiclib_music_aa");
  const artist = item(page, "musiclib_music_aa").locator(":scope > ul > li[role=treeitem]").first();
  const artistId = await artist.getAttribute("data-id");
  // A click on its name selects and expands it.
  await choose(page, artistId);
  await page.waitForSelector(`li[data-id="${artistId}"][aria-expanded=true]`, { timeout: 20000 });
  const album = await openFirstAlbum(page);
  const before = await crumbs(page);
  await page.reload();
  await page.waitForSelector("body[data-nav-ready=true]", { timeout: 30000 });
  await listed(page, album.node);
  assert.deepEqual(await crumbs(page), before);
  for (const id of ["musiclib_root", "musiclib_music_aa", artistId])
    assert.equal(await item(page, id).getAttribute("aria-expanded"), "true", id);
  // Back still goes to the artist.
  await page.goBack();
  await listed(page, artistId);
  assert.deepEqual(page.problems, []);
});

test("a bookmarked view opens in a new browser, its path found in the tree", async () => {
  const first = await openTree(browser, "demo");
  await expandNode(first, "musiclib_root");
  await choose(first, "musiclib_music_album");
  const bookmark = new URL(first.url());
  const page = await openTree(browser, "demo", { query: bookmark.search });
  await page.waitForSelector("body[data-nav-ready=true]", { timeout: 30000 });
  await listed(page, "musiclib_music_album");
  assert.equal(await page.locator("#containers button.container").count() > 0, true);
  assert.equal(await page.locator("#breadcrumb [aria-current]").textContent(), await label(first, "musiclib_music_album"));
  assert.deepEqual(page.problems, []);
});

test("a bookmarked album opened from the album grid opens in a new browser with its whole path", async () => {
  const first = await openTree(browser, "demo");
  await expandNode(first, "musiclib_root");
  await choose(first, "musiclib_music_album");
  const album = await openFirstAlbum(first);
  const path = await crumbs(first);
  assert.ok(path.length >= 3, JSON.stringify(path));
  const bookmark = new URL(first.url());
  assert.equal(bookmark.searchParams.get("from"), "musiclib_music_album");
  const page = await openTree(browser, "demo", { query: bookmark.search });
  await page.waitForSelector("body[data-nav-ready=true]", { timeout: 30000 });
  await listed(page, album.node);
  assert.deepEqual(await crumbs(page), path);
  // Its parent's part of the path leads back to the grid.
  await page.locator("#breadcrumb button.crumb").last().click();
  await listed(page, "musiclib_music_album");
  assert.deepEqual(page.problems, []);
});

test("a view in the URL that names no node shows the failure in the pane and changes nothing", async () => {
  const page = await openTree(browser, "demo", { query: "?view=musiclib_nothing%3Ahere&title=Nothing" });
  await page.waitForSelector("body[data-nav-ready=true]", { timeout: 30000 });
  await page.waitForSelector("#listing[data-state=failed]", { timeout: 20000 });
  assert.equal(await page.locator("#listing").getAttribute("data-error"), "node_gone");
  assert.equal(await page.locator("#selected-text").textContent(), "Nothing");
  // The tree is as it was.
  assert.equal(await page.locator('#tree li[aria-selected="true"]').count(), 0);
});
