// The queue tests' own steps: listing a node, reading the queue's panel, pausing the player.
import { item } from "./harness.js";

// Lists the tree node `id` in the pane (a click on its label; its parent opened first when given).
export async function list(page, id, parent) {
  if (parent) {
    const li = item(page, parent);
    if ((await li.getAttribute("aria-expanded")) !== "true") await li.locator(":scope > .row > .twisty").click();
    await page.waitForSelector(`li[data-id="${parent}"][data-state=loaded]`, { timeout: 15000 });
  }
  await item(page, id).locator(":scope > .row .label").first().click();
  await page.waitForFunction((node) => {
    const listing = document.getElementById("listing");
    return listing.dataset.node === node && listing.dataset.state === "loaded";
  }, id, { timeout: 20000 });
}
// The first album of the sample share (1-second tracks).
export async function firstAlbum(page) {
  const li = item(page, "musiclib_music_album");
  if ((await li.getAttribute("aria-expanded")) !== "true") await li.locator(":scope > .row > .twisty").click();
  await page.waitForSelector('li[data-id="musiclib_music_album"][data-state=loaded]', { timeout: 15000 });
  const id = await li.locator(":scope > ul > li[role=treeitem]").filter({ hasNotText: "Bench" }).first().getAttribute("data-id");
  await list(page, id);
  return id;
}
// Every item of the queue's panel, not only the drawn ones: the panel is scrolled through.
export const queueStreams = (page) => page.evaluate(async () => {
  const frame = () => new Promise((resolve) => requestAnimationFrame(() => requestAnimationFrame(resolve)));
  const rows = [];
  const viewport = document.getElementById("queue-list");
  for (let top = 0; ; top += viewport.clientHeight) {
    viewport.scrollTop = top;
    await frame();
    for (const row of document.querySelectorAll("#queue-spacer .queue-item")) rows[Number(row.dataset.index)] = row.dataset.stream;
    if (top + viewport.clientHeight >= viewport.scrollHeight) break;
  }
  viewport.scrollTop = 0;
  await frame();
  return rows;
});
export const listedStreams = (page) => page.locator("#tracks .track").evaluateAll((rows) => rows.map((r) => r.dataset.stream));
export const position = async (page) => Number(await page.locator("#queue-panel").getAttribute("data-position"));
export const stored = (page, key) => page.evaluate((k) => JSON.parse(localStorage.getItem(k)), key);
export async function pause(page) {
  await page.evaluate(() => document.getElementById("audio").pause());
  await page.waitForFunction(() => document.getElementById("audio").paused);
}
