// What the failure tests check on the page: the pane after a failed listing, the status line, and
// the helpers to open, select and list tree nodes.
import assert from "node:assert/strict";
import { item, childIds } from "./harness.js";
import { FAILURE_WORDS } from "../../site/ui/words/failures.js";

export const words = FAILURE_WORDS.enu;

export const open = async (page, id) => {
  const li = item(page, id);
  if ((await li.getAttribute("aria-expanded")) !== "true") await li.locator(":scope > .row > .twisty").click();
  await page.waitForSelector(`li[data-id="${id}"][aria-expanded=true]`, { timeout: 15000 });
};
export const select = (page, id) => item(page, id).locator(":scope > .row .label").click();
export async function listed(page, id) {
  await select(page, id);
  await page.waitForFunction((node) => document.getElementById("listing").dataset.node === node &&
    document.getElementById("listing").dataset.state === "loaded", id, { timeout: 20000 });
}
// The pane after a failed listing: the failure's words, no rows, no count, nothing to play.
export async function expectFailedPane(page, code, text = words.failures[code], timeout = 20000) {
  await page.waitForSelector(`#listing[data-state=failed][data-error=${code}]`, { timeout });
  assert.equal(await page.locator("#list-state").textContent(), text);
  assert.equal(await page.locator("#tracks .track").count(), 0);
  assert.equal(await page.locator("#list-count").textContent(), "");
  assert.equal(await page.locator("#play-all").isDisabled(), true);
}
export async function expectStatus(page, code, text = words.failures[code], timeout = 20000) {
  await page.waitForSelector(`#status[data-error=${code}]`, { timeout });
  assert.equal(await page.locator("#status").textContent(), text);
  assert.equal(await page.locator("#status").getAttribute("role"), "alert");
}
// Failed requests are logged by the browser; the page itself must throw nothing.
export const noPageErrors = (page) => assert.deepEqual(page.problems.filter((p) => p.startsWith("page error")), []);
// Searches for media servers until the local one is listed; its node id.
export async function findLocalServer(page) {
  await open(page, "mediaserver_root");
  for (let attempt = 0; attempt < 30; attempt++) {
    const before = Number(await item(page, "mediaserver_root").getAttribute("data-refreshed") ?? 0);
    await item(page, "mediaserver_refresh").locator(".row").click();
    await page.waitForSelector(`li[data-id="mediaserver_root"][data-refreshed="${before + 1}"]`, { timeout: 15000 });
    const server = (await childIds(page, "mediaserver_root")).find((id) => id.includes(":50003/"));
    if (server) return server;
    await page.waitForTimeout(500);
  }
  throw new Error("the local media server was not found");
}
