// The library search, measured in the same run as the listing of the Bench folder (10,000 tracks):
// library.db is first brought to 100,000 tracks (rows added with SQLite, their words indexed by
// the track table's triggers as the indexer's own rows are), then library.cgi's action=search is
// timed for queries of one to three words, and, in Chromium, the time from the keystroke that
// completes a query to the frame after its results are drawn under the search box.
import { execFileSync } from "node:child_process";

const DB = "/var/packages/Harmona/var/library.db";
export const SEARCH_TRACKS = 100000;
const median = (values) => [...values].sort((a, b) => a - b)[Math.floor(values.length / 2)];

// The library filled up to `SEARCH_TRACKS` with tracks of made-up words (ten tracks per album,
// five albums per artist: 10,000 albums of 2,000 artists), in one transaction.
export function fillLibrary() {
  const sql = `
    WITH RECURSIVE
      words(n, w) AS (VALUES (0, 'Love'), (1, 'Night'), (2, 'Road'), (3, 'Blue'), (4, 'Heart'),
        (5, 'Fire'), (6, 'Rain'), (7, 'Dream'), (8, 'Song'), (9, 'River'), (10, 'Gold'),
        (11, 'Star'), (12, 'Moon'), (13, 'Time'), (14, 'Home'), (15, 'City'), (16, 'Summer'),
        (17, 'Shadow'), (18, 'Beat'), (19, 'Light'), (20, 'Ocean'), (21, 'Dance'), (22, 'Silver'),
        (23, 'Window')),
      n(i) AS (SELECT (SELECT COUNT(*) FROM track) + 1 UNION ALL SELECT i + 1 FROM n WHERE i < ${SEARCH_TRACKS})
    INSERT INTO track (path, title, artist, album, genre, duration_ms, added)
    SELECT '/volume1/music/Search bench/' || i || '.flac',
      (SELECT w FROM words WHERE n = i % 24) || ' ' || (SELECT w FROM words WHERE n = (i / 24) % 24) || ' ' || i,
      'Artist ' || (SELECT w FROM words WHERE n = (i / 50) % 24) || ' ' || (i / 50),
      (SELECT w FROM words WHERE n = (i / 10) % 24) || ' Album ' || (i / 10),
      (SELECT w FROM words WHERE n = i % 13) || ' Genre', 180000, 0
    FROM n;`;
  execFileSync("sqlite3", ["-bail", DB, "PRAGMA busy_timeout = 10000;", "BEGIN;", sql, "COMMIT;"]);
  return Number(execFileSync("sqlite3", [DB, "SELECT COUNT(*) FROM track"], { encoding: "utf8" }).trim());
}

export const QUERIES = ["beat", "love night", "silver album 12", "artist moon 1", "ocean dance", "r"];

// library.cgi's search for each query, `rounds` times, `between()` run before each round (the
// listing it is compared with, under the same load); its results per group of the last round.
export async function measureSearchApi({ timed, rounds, between }) {
  const times = {};
  const found = {};
  for (let i = 0; i < rounds; i++) {
    await between();
    for (const q of QUERIES) {
      const reply = await timed(`webapi/library.cgi?${new URLSearchParams({ action: "search", q })}`);
      (times[q] ??= []).push(reply.ms);
      const body = JSON.parse(reply.text);
      if (body.success !== true) throw new Error(`search ${q}: ${reply.text.slice(0, 200)}`);
      found[q] = `${body.tracks.length}/${body.albums.length}/${body.artists.length}`;
    }
  }
  return { times, found, all: Object.values(times).flat() };
}

// In the page: the time from the keydown of a query's last letter to the frame after the results
// of that query are drawn (typed 120 ms after the letters before it: the box sends it at once).
export async function measureSearchPage({ page, rounds }) {
  const times = [];
  for (let i = 0; i < rounds; i++) {
    for (const q of QUERIES) {
      await page.locator("#search").fill(q.slice(0, -1));
      await page.waitForTimeout(120);
      const waiting = page.evaluate((query) => new Promise((resolve) => {
        let pressed = 0;
        window.addEventListener("keydown", (event) => { pressed = event.timeStamp; }, { capture: true, once: true });
        const panel = document.getElementById("search-results");
        const check = () => {
          if (pressed > 0 && panel.dataset.query === query && panel.dataset.state === "done")
            requestAnimationFrame(() => resolve(performance.now() - pressed));
          else requestAnimationFrame(check);
        };
        requestAnimationFrame(check);
      }), q);
      await page.waitForTimeout(30);
      await page.keyboard.press(q.slice(-1));
      times.push(await waiting);
    }
  }
  return times;
}
