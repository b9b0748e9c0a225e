// The search tests' own helpers: a query typed and its results awaited, the titles of a group,
// library.cgi's own answer to a query.
import { queryWords } from "../../site/ui/search.js";

// Types `text` into the search box and waits for the results of exactly that text (for a text
// without words, for the box to be idle: nothing is sent).
export async function search(page, text) {
  await page.locator("#search").fill("");
  await page.locator("#search").fill(text);
  if (queryWords(text).length === 0) {
    await page.waitForFunction(() => document.getElementById("search-results").dataset.state === "idle", null, { timeout: 15000 });
    return;
  }
  await page.waitForFunction(
    (q) => { const p = document.getElementById("search-results"); return p.dataset.query === q && p.dataset.state !== "searching"; },
    text, { timeout: 15000 });
}
export const groupTitles = (page, group) =>
  page.locator(`#search-results [data-group=${group}] [role=option] .search-main`).allTextContents();
export const apiSearch = (page, q) => page.evaluate(async (text) =>
  (await fetch(`webapi/library.cgi?${new URLSearchParams({ action: "search", q: text })}`)).json(), q);
