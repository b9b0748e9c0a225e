// Runs inside scripts/system-inside (HARMONA_URL, HARMONA_USER, HARMONA_PASSWORD set): measures, in
// one run, the tree CGI's browse of the Bench folder (the baseline), library.cgi's listing of it, and
// the page's time from a click on the folder to its first track rows drawn.
import { launch, close, openTree, item } from "../../web/tests/browser/harness.js";
import { measurePlaylists } from "./playlists_bench.mjs";

const rounds = Number(process.env.BENCH_ROUNDS ?? 15);
const base = process.env.HARMONA_URL;
const auth = "Basic " + Buffer.from(`${process.env.HARMONA_USER}:${process.env.HARMONA_PASSWORD}`).toString("base64");

async function timed(url) {
  const start = performance.now();
  const response = await fetch(new URL(url, base), { headers: { Authorization: auth } });
  const text = await response.text();
  if (!response.ok) throw new Error(`${url}: HTTP ${response.status}`);
  return { ms: performance.now() - start, bytes: text.length, text };
}
const median = (values) => [...values].sort((a, b) => a - b)[Math.floor(values.length / 2)];

const folders = JSON.parse((await timed("webapi/audiotree.cgi?action=gettreenode&node=musiclib_music_file")).text);
const bench = folders.find((node) => node && node.text === "Bench");
if (!bench) throw new Error("no Bench folder among the music library folders");
const node = bench.id;

const tree = [];
const api = [];
let treeBytes = 0;
let apiBytes = 0;
let apiTracks = 0;
// library.cgi's probe of each service (the page asks it after an empty tree reply).
const probes = { media_server: [], audio_daemon: [] };
for (let i = 0; i < rounds; i++) {
  // Interleaved, so that both see the same machine load.
  const t = await timed(`webapi/audiotree.cgi?action=gettreenode&node=${encodeURIComponent(node)}`);
  tree.push(t.ms);
  treeBytes = t.bytes;
  const a = await timed(`webapi/library.cgi?action=list&node=${encodeURIComponent(node)}`);
  api.push(a.ms);
  apiBytes = a.bytes;
  apiTracks = JSON.parse(a.text).tracks.length;
  for (const service of Object.keys(probes))
    probes[service].push((await timed(`webapi/library.cgi?action=probe&service=${service}`)).ms);
}

const browser = await launch();
const clicks = [];
try {
  const page = await openTree(browser, process.env.HARMONA_USER);
  const open = async (id) => {
    const li = item(page, id);
    if ((await li.getAttribute("aria-expanded")) !== "true") await li.locator(":scope > .row > .twisty").click();
    await page.waitForSelector(`li[data-id="${id}"][data-state=loaded]`, { timeout: 20000 });
  };
  await open("musiclib_root");
  await open("musiclib_music_file");
  const clickLabel = (id) => page.evaluate((x) =>
    [...document.querySelectorAll("li[role=treeitem]")].find((li) => li.dataset.id === x)
      .querySelector(":scope > .row .label").click(), id);
  for (let i = 0; i < rounds; i++) {
    await clickLabel("musiclib_music_album");
    await page.waitForFunction(() => document.getElementById("listing").dataset.node === "musiclib_music_album" &&
      !document.getElementById("listing").hasAttribute("aria-busy"));
    // From the click to the frame after the first track row of the folder exists.
    const ms = await page.evaluate((id) => new Promise((resolve) => {
      const label = [...document.querySelectorAll("li[role=treeitem]")].find((li) => li.dataset.id === id)
        .querySelector(":scope > .row .label");
      const start = performance.now();
      const check = () => {
        const listing = document.getElementById("listing");
        if (listing.dataset.node === id && document.querySelector("#tracks .track"))
          requestAnimationFrame(() => resolve(performance.now() - start));
        else requestAnimationFrame(check);
      };
      label.click();
      requestAnimationFrame(check);
    }), node);
    clicks.push(ms);
  }
  // The page must not have drawn all rows.
  const drawn = await page.locator("#tracks .track").count();
  console.log(`rows in the document after the click: ${drawn} of ${apiTracks}`);
} finally {
  await close(browser);
}

const baseline = median(tree);
const line = (name, values) =>
  console.log(`${name.padEnd(44)} median ${median(values).toFixed(1).padStart(7)} ms  ` +
    `min ${Math.min(...values).toFixed(1).padStart(7)} ms  x${(median(values) / baseline).toFixed(2)} of the tree CGI`);
console.log(`container ${node}: ${apiTracks} tracks; tree CGI reply ${treeBytes} bytes, library.cgi reply ${apiBytes} bytes; ${rounds} rounds`);
line("tree CGI browse (gettreenode), baseline", tree);
line("library.cgi list", api);
for (const [service, values] of Object.entries(probes)) line(`library.cgi probe ${service}`, values);
line("page: click to first rows on screen", clicks);
for (const text of await measurePlaylists({ base, auth, rounds, folderNode: node, listMedian: median(api) })) console.log(text);
