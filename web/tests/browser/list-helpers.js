// The track list's tests' own helpers (keyboard, shortcuts, sorting): what has the focus, the
// rows' streams in their order, a slower playback, and the lists they work on.
import { item } from "./harness.js";
import { open, listed } from "./failure-checks.js";

// The focused element, described: its row's place in the list, or its id.
export const focused = (page) => page.evaluate(() => {
  const active = document.activeElement;
  return { rowIndex: active?.getAttribute("aria-rowindex") ?? null, id: active?.id ?? "", stream: active?.dataset?.stream ?? "", text: active?.textContent ?? "" };
});
export const rowStreams = (page) => page.locator("#tracks .track").evaluateAll((rows) =>
  rows.sort((a, b) => Number(a.dataset.index) - Number(b.dataset.index)).map((r) => r.dataset.stream));

// Tracks of a second play ten times slower, so that none ends (and the next starts) mid-test.
export const slowPlayback = (page) => page.evaluate(() => { document.getElementById("audio").defaultPlaybackRate = 0.1; });

// A sample album (1-second tracks, not the Bench folder's album), listed.
export async function listAlbum(page, nth = 0) {
  await open(page, "musiclib_music_album");
  const album = item(page, "musiclib_music_album").locator(":scope > ul > li[role=treeitem]").filter({ hasNotText: "Bench" }).nth(nth);
  await listed(page, await album.getAttribute("data-id"));
}
export async function listBench(page) {
  await open(page, "musiclib_root");
  await open(page, "musiclib_music_file");
  const bench = item(page, "musiclib_music_file").locator(":scope > ul > li[role=treeitem]", { hasText: "Bench" });
  await listed(page, await bench.getAttribute("data-id"));
}
