// The navigation tests' own helpers: a node chosen in the tree and its listing awaited, a node
// expanded, the breadcrumb's parts, a tree label, the first album of the pane opened.
import { item } from "./harness.js";

export const listed = (page, node) =>
  page.waitForFunction((n) => document.getElementById("listing").dataset.node === n, node, { timeout: 20000 });
export const choose = async (page, id) => {
  await item(page, id).locator(":scope > .row .label").click();
  await listed(page, id);
};
export const expandNode = async (page, id) => {
  const li = item(page, id);
  if ((await li.getAttribute("aria-expanded")) !== "true") await li.locator(":scope > .row > .twisty").click();
  await page.waitForSelector(`li[data-id="${id}"][data-state=loaded]`, { timeout: 20000 });
};
export const crumbs = (page) => page.locator("#breadcrumb li").allTextContents();
export const label = (page, id) => item(page, id).locator(":scope > .row .label").textContent();
// Opens the first album tile of the pane; its node and title.
export async function openFirstAlbum(page) {
  const tile = page.locator("#containers button.container").first();
  const node = await tile.getAttribute("data-node");
  const title = await tile.getAttribute("title");
  await tile.click();
  await listed(page, node);
  return { node, title };
}
