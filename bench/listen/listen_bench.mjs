// Runs inside scripts/system-inside (HARMONA_URL, HARMONA_USER, HARMONA_PASSWORD set): measures, in
// one run, the tree CGI's browse of the Bench folder (the baseline), library.cgi's listing of it, the
// page's time from a click on the folder to its first track rows drawn, and library.cgi's other
// actions: the radio stations listed, added and removed, and the same folder listed as a media
// server's on the network with one of its tracks fetched through library.cgi.
import { launch, close, openTree, item } from "../../web/tests/browser/harness.js";
import { measurePlaylists } from "./playlists_bench.mjs";
import { measureCovers } from "./covers_bench.mjs";
import { fillLibrary, measureSearchApi, measureSearchPage, QUERIES } from "./search_bench.mjs";
import { writeFileSync, chownSync, statSync, mkdirSync } from "node:fs";

const rounds = Number(process.env.BENCH_ROUNDS ?? 15);
const base = process.env.HARMONA_URL;
const auth = "Basic " + Buffer.from(`${process.env.HARMONA_USER}:${process.env.HARMONA_PASSWORD}`).toString("base64");

async function timed(url, body) {
  const start = performance.now();
  const response = await fetch(new URL(url, base), body === undefined ? { headers: { Authorization: auth } }
    : { method: "POST", body: new URLSearchParams(body), headers: { Authorization: auth } });
  const text = await response.text();
  if (!response.ok) throw new Error(`${url}: HTTP ${response.status}`);
  return { ms: performance.now() - start, bytes: text.length, text };
}
const median = (values) => [...values].sort((a, b) => a - b)[Math.floor(values.length / 2)];

const folders = JSON.parse((await timed("webapi/audiotree.cgi?action=gettreenode&node=musiclib_music_file")).text);
const bench = folders.find((node) => node && node.text === "Bench");
if (!bench) throw new Error("no Bench folder among the music library folders");
const node = bench.id;

// The user's radio stations: 499 of them (one below the bound), so that each round adds one and
// removes it again.
const prefs = `/usr/vanu/etc/preference/${process.env.HARMONA_USER}`;
mkdirSync(prefs, { recursive: true });
let stationsText = "";
for (let n = 1; n <= 499; n++) stationsText += `[${n}]\nname="Station ${n}"\nurl="http://198.51.100.9:8000/s${n}.mp3"\nfavorite=${n % 7 === 0 ? 1 : 0}\n`;
writeFileSync(`${prefs}/radio.stations`, stationsText);
const owner = statSync(prefs);
chownSync(`${prefs}/radio.stations`, owner.uid, owner.gid);

// The system's own media server as the audio daemon finds it on the network link: its Bench folder
// listed as another server's tracks, and one of them fetched through library.cgi.
let network = null;
for (let attempt = 0; attempt < 40 && !network; attempt++) {
  const servers = JSON.parse((await timed("webapi/audiotree.cgi?action=refresh&target=mediaserver")).text).items ?? [];
  network = servers.map((s) => s.id).find((id) => typeof id === "string" && id.includes(":50003/")) ?? null;
  if (!network) await new Promise((resolve) => setTimeout(resolve, 500));
}
if (!network) throw new Error("the audio daemon does not list the media server");
const remoteList = `webapi/library.cgi?action=list&node=${encodeURIComponent(network)}&object=${encodeURIComponent(node.slice("musiclib_".length))}`;
const remoteTracks = JSON.parse((await timed(remoteList)).text).tracks;
if (remoteTracks.length === 0 || typeof remoteTracks[0].url !== "string") throw new Error("no remote tracks listed");
const remoteTrack = remoteTracks[0].url;

const tree = [];
const api = [];
const radioList = [];
const radioAdd = [];
const radioRemove = [];
// The page's language: asked once per page load, saved from the language picker.
const languageAsk = [];
const languageSave = [];
const remote = [];
const remotePlay = [];
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
  radioList.push((await timed("webapi/library.cgi?action=list&node=inetradio_userdefined")).ms);
  const added = await timed("webapi/library.cgi", { action: "radio_add", name: "Bench station", url: "http://198.51.100.9:8000/bench.mp3" });
  radioAdd.push(added.ms);
  const id = JSON.parse(added.text).station.station;
  radioRemove.push((await timed("webapi/library.cgi", { action: "radio_remove", station: id })).ms);
  languageAsk.push((await timed("webapi/library.cgi?action=language")).ms);
  languageSave.push((await timed("webapi/library.cgi", { action: "language", language: "def" })).ms);
  remote.push((await timed(remoteList)).ms);
  remotePlay.push((await timed(remoteTrack)).ms);
}

// The search, over a library of 100,000 tracks, beside the listing of the Bench folder again.
const searchTracks = fillLibrary();
const searchList = [];
const search = await measureSearchApi({
  timed, rounds,
  between: async () => searchList.push((await timed(`webapi/library.cgi?action=list&node=${encodeURIComponent(node)}`)).ms),
});

const browser = await launch();
const clicks = [];
let searchPage = [];
const sorts = [];
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
  // A click on the title column's header: the 10,000 rows sorted, to the frame after the first rows.
  for (let i = 0; i < rounds; i++) {
    const ms = await page.evaluate(() => new Promise((resolve) => {
      const start = performance.now();
      document.querySelector("#tracks [role=columnheader].title button").click();
      requestAnimationFrame(() => resolve(performance.now() - start));
    }));
    sorts.push(ms);
  }
  // The page must not have drawn all rows.
  const drawn = await page.locator("#tracks .track").count();
  console.log(`rows in the document after the click: ${drawn} of ${apiTracks}`);
  searchPage = await measureSearchPage({ page, rounds });
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
line("page: click on a column header, rows sorted", sorts);
for (const text of await measurePlaylists({ base, auth, rounds, folderNode: node, listMedian: median(api) })) console.log(text);
for (const text of await measureCovers({ base, auth, rounds, folderNode: node, listMedian: median(api) })) console.log(text);
line("library.cgi list of 499 radio stations", radioList);
line("library.cgi radio_add (500th station)", radioAdd);
line("library.cgi radio_remove", radioRemove);
line(`library.cgi list, same folder on a network server`, remote);
line("library.cgi remote_stream of one of its tracks", remotePlay);
const listed = median(searchList);
const searchLine = (name, values) =>
  console.log(`${name.padEnd(44)} median ${median(values).toFixed(1).padStart(7)} ms  ` +
    `min ${Math.min(...values).toFixed(1).padStart(7)} ms  x${(median(values) / listed).toFixed(2)} of the listing`);
console.log(`search over ${searchTracks} tracks (library.cgi list of the folder in the same rounds: median ${listed.toFixed(1)} ms)`);
searchLine("library.cgi search, all queries", search.all);
for (const q of QUERIES) searchLine(`  q="${q}" (${search.found[q]} tracks/albums/artists)`, search.times[q]);
searchLine("page: keystroke to search results drawn", searchPage);
line("library.cgi language (GET, each page load)", languageAsk);
line("library.cgi language (POST, the picker)", languageSave);
