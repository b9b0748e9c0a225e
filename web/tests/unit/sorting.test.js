// The track list sorted by a column header: texts in the language's order, durations as numbers,
// the number column as listed; equal values keep the listing's order, unknown values go last.
import { test } from "node:test";
import assert from "node:assert/strict";
import { sortedTracks, COLUMNS } from "../../site/ui/listen.js";

const tracks = [
  { title: "beta", artist: "Zed", album: "B", duration: 200 },
  { title: "Alpha", artist: "", album: "A", duration: -1 },
  { title: "Émile", artist: "Ann", album: "B", duration: 5 },
  { title: "alpha", artist: "ann", album: "A", duration: 200 },
];
const titles = (list) => list.map((t) => t.title);

test("the columns with headers are number, title, artist, album and duration", () => {
  assert.deepEqual(COLUMNS.map((c) => c.name), ["number", "title", "artist", "album", "duration"]);
});

test("a text column sorts in the language's order, ignoring case and accents, ties as listed", () => {
  const collator = new Intl.Collator("fr", { sensitivity: "base", numeric: true });
  assert.deepEqual(titles(sortedTracks(tracks, "title", "ascending", collator)), ["Alpha", "alpha", "beta", "Émile"]);
  assert.deepEqual(titles(sortedTracks(tracks, "title", "descending", collator)), ["Émile", "beta", "Alpha", "alpha"]);
  // An empty artist goes last both ways.
  assert.deepEqual(titles(sortedTracks(tracks, "artist", "ascending", collator)), ["Émile", "alpha", "beta", "Alpha"]);
  assert.deepEqual(titles(sortedTracks(tracks, "artist", "descending", collator)), ["beta", "Émile", "alpha", "Alpha"]);
});

test("durations sort as numbers with unknown ones last; the number column is the listing's order", () => {
  assert.deepEqual(titles(sortedTracks(tracks, "duration", "ascending")), ["Émile", "beta", "alpha", "Alpha"]);
  assert.deepEqual(titles(sortedTracks(tracks, "duration", "descending")), ["beta", "alpha", "Émile", "Alpha"]);
  assert.deepEqual(titles(sortedTracks(tracks, "number", "ascending")), titles(tracks));
  assert.deepEqual(titles(sortedTracks(tracks, "number", "descending")), titles(tracks).reverse());
  assert.notEqual(sortedTracks(tracks, "title", "ascending"), tracks, "the listing itself is not reordered");
  assert.deepEqual(titles(tracks), ["beta", "Alpha", "Émile", "alpha"]);
});
