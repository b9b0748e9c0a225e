// The search box: tracks, albums and artists of the library found as the user types, grouped,
// played or opened by the mouse and the keyboard, late replies of older queries never drawn,
// query syntax typed as text, the words in the user's language.
import { test, before, after } from "node:test";
import assert from "node:assert/strict";
import { launch, close, openTree, screenshot } from "./harness.js";
import { SEARCH_WORDS } from "../../site/ui/words/search.js";
import { search, groupTitles } from "./search-helpers.js";

let browser;
before(async () => { browser = await launch(["--autoplay-policy=no-user-gesture-required"]); });
after(async () => { await close(browser); });

test("typing finds the library's tracks, albums and artists, grouped, by the beginnings of their words", async () => {
  const page = await openTree(browser, "demo");
  const box = page.locator("#search");
  assert.equal(await box.getAttribute("placeholder"), SEARCH_WORDS.enu.searchPlaceholder);
  await search(page, "auro");
  assert.equal(await page.locator("#search-results").isVisible(), true);
  assert.equal(await box.getAttribute("aria-expanded"), "true");
  assert.deepEqual(await groupTitles(page, "artists"), ["Aurora Lane"]);
  const albums = await page.locator("#search-results [data-group=albums] [role=option] .search-detail").allTextContents();
  assert.ok(albums.length >= 1);
  for (const detail of albums) assert.match(detail, /^Aurora Lane · \d+ tracks$/);
  const tracks = await page.locator("#search-results [data-group=tracks] [role=option] .search-detail").allTextContents();
  assert.ok(tracks.length >= 1);
  for (const detail of tracks) assert.match(detail, /^Aurora Lane · /);
  assert.deepEqual(
    await page.locator("#search-results .search-heading").allTextContents(),
    [SEARCH_WORDS.enu.searchTracks, SEARCH_WORDS.enu.searchAlbums, SEARCH_WORDS.enu.searchArtists]);
  // Several words all count, accents are ignored.
  await search(page, "zoe ørs");
  assert.deepEqual(await groupTitles(page, "artists"), ["Zoë Ørsted"]);
  await search(page, "aurora zoe");
  assert.equal(await page.locator("#search-results [role=option]").count(), 0);
  assert.equal(await page.locator("#search-results .search-none").textContent(), SEARCH_WORDS.enu.searchNone);
  await screenshot(page, "search-results");
  assert.deepEqual(page.problems, []);
});

test("the search's words come in the user's language", async () => {
  const page = await openTree(browser, "hans");
  assert.equal(await page.locator("#search").getAttribute("placeholder"), SEARCH_WORDS.ger.searchPlaceholder);
  assert.equal(await page.locator("#search").getAttribute("aria-label"), SEARCH_WORDS.ger.searchLabel);
  await search(page, "aurora");
  assert.deepEqual(
    await page.locator("#search-results .search-heading").allTextContents(),
    [SEARCH_WORDS.ger.searchTracks, SEARCH_WORDS.ger.searchAlbums, SEARCH_WORDS.ger.searchArtists]);
  assert.deepEqual(page.problems, []);
});

test("every language has every search word", () => {
  const keys = Object.keys(SEARCH_WORDS.enu).sort();
  for (const code of ["enu", "ger", "fre", "spn", "ita", "jpn", "chs", "cht"]) {
    assert.deepEqual(Object.keys(SEARCH_WORDS[code] ?? {}).sort(), keys, code);
    for (const key of keys) assert.ok(SEARCH_WORDS[code][key].trim() !== "", `${code}.${key}`);
  }
});
