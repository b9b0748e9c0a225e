// A station directory on the network in the page: its address set in audio.conf, its stations listed
// from a directory served in this test's own namespace, and a station played through library.cgi's
// tune-in (a redirect to the stream that the station's playlist names); a directory without an
// address says in the pane that the owner can set one.
import { test, before, after } from "node:test";
import assert from "node:assert/strict";
import { createServer } from "node:http";
import { existsSync, readFileSync, writeFileSync, rmSync } from "node:fs";
import { launch, close, openTree, item, screenshot } from "./harness.js";

const AUDIO_CONF = "/var/packages/Harmona/etc/audio.conf";
let browser;
let directory;       // the station directory and the stations' streams
const requests = []; // what it was asked for
let savedConf = null;

// A mono 16-bit PCM WAV file of a 440 Hz tone.
function sineWav(seconds, rate = 8000) {
  const samples = seconds * rate;
  const data = Buffer.alloc(44 + samples * 2);
  data.write("RIFF", 0); data.writeUInt32LE(36 + samples * 2, 4); data.write("WAVE", 8);
  data.write("fmt ", 12); data.writeUInt32LE(16, 16); data.writeUInt16LE(1, 20); data.writeUInt16LE(1, 22);
  data.writeUInt32LE(rate, 24); data.writeUInt32LE(rate * 2, 28); data.writeUInt16LE(2, 32); data.writeUInt16LE(16, 34);
  data.write("data", 36); data.writeUInt32LE(samples * 2, 40);
  for (let i = 0; i < samples; i++) data.writeInt16LE(Math.round(8000 * Math.sin((2 * Math.PI * 440 * i) / rate)), 44 + i * 2);
  return data;
}

const origin = () => `http://127.0.0.1:${directory.address().port}`;
const LIST = `<?xml version="1.0" encoding="UTF-8"?>
<stationlist><tunein base="/sbin/tunein-station.pls"/>
<station name="Tone &amp; Co" mt="audio/mpeg" id="4321" br="128" genre="Test Tones" lc="3"/>
<station name="Second" mt="audio/mpeg" id="77" br="64" genre="Talk" lc="1"/>
</stationlist>`;

before(async () => {
  browser = await launch(["--autoplay-policy=no-user-gesture-required"]);
  const wav = sineWav(4);
  directory = createServer((request, response) => {
    requests.push(request.url);
    if (request.url === "/list.xml") {
      response.writeHead(200, { "Content-Type": "text/xml" });
      response.end(LIST);
    } else if (request.url.startsWith("/sbin/tunein-station.pls?id=")) {
      response.writeHead(200, { "Content-Type": "audio/x-scpls" });
      response.end(`[playlist]\nnumberofentries=1\nFile1=${origin()}/tone.wav\nTitle1=Tone\nLength1=-1\nVersion=2\n`);
    } else if (request.url === "/tone.wav") {
      response.writeHead(200, { "Content-Type": "audio/wav", "Content-Length": wav.length });
      response.end(wav);
    } else {
      response.writeHead(404);
      response.end();
    }
  });
  await new Promise((resolve) => directory.listen(0, "127.0.0.1", resolve));
  if (existsSync(AUDIO_CONF)) savedConf = readFileSync(AUDIO_CONF);
});
after(async () => {
  if (savedConf === null) rmSync(AUDIO_CONF, { force: true });
  else writeFileSync(AUDIO_CONF, savedConf);
  await close(browser);
  await new Promise((resolve) => directory.close(resolve));
});

function configure(lines) {
  writeFileSync(AUDIO_CONF, `${savedConf === null ? "" : savedConf.toString()}\n${lines.join("\n")}\n`, { mode: 0o644 });
}

// Selects a tree node and waits until the pane has listed it (or said why not).
async function selectNode(page, id) {
  const loaded = await page.evaluate(() => Number(document.getElementById("listing").dataset.loaded ?? 0));
  await item(page, id).locator(":scope > .row .label").click();
  await page.waitForFunction(([before]) => Number(document.getElementById("listing").dataset.loaded ?? 0) > before ||
    !document.getElementById("radio-notice").hidden, [loaded], { timeout: 15000 });
}

test("a configured directory lists its stations and a station plays through the tune-in", async () => {
  configure([`radio_shoutcast_list=${origin()}/list.xml`]);
  const page = await openTree(browser, "demo");
  await selectNode(page, "inetradio_sc");
  const rows = page.locator("#tracks .track");
  await page.waitForFunction(() => document.querySelectorAll("#tracks .track").length === 2, null, { timeout: 15000 });
  assert.deepEqual((await rows.locator(".title").allTextContents()).map((t) => t.trim()), ["Tone & Co", "Second"]);
  assert.match(await rows.first().textContent(), /Test Tones/);
  assert.match(await rows.first().textContent(), /128 kbit\/s/);
  assert.equal(await page.locator("#radio-form").isVisible(), false);
  assert.equal(await page.locator("#radio-notice").isVisible(), false);
  assert.ok(requests.includes("/list.xml"), `requests: ${requests.join(", ")}`);

  await page.evaluate(() => {
    const audio = document.getElementById("audio");
    window.maxTime = 0;
    audio.addEventListener("timeupdate", () => { window.maxTime = Math.max(window.maxTime, audio.currentTime); });
  });
  await rows.first().click();
  await page.waitForSelector("#player[data-state=playing]", { timeout: 15000 });
  await page.waitForFunction(() => window.maxTime > 0.2, null, { timeout: 15000 });
  // The audio element asked this server, which tuned in at the directory and redirected it to the
  // stream named by the station's playlist.
  assert.match(await page.evaluate(() => document.getElementById("audio").src),
    /\/webapi\/library\.cgi\?action=radio_tunein&node=inetradio_sc&station=4321$/);
  assert.ok(requests.includes("/sbin/tunein-station.pls?id=4321"), `requests: ${requests.join(", ")}`);
  assert.ok(requests.includes("/tone.wav"), `requests: ${requests.join(", ")}`);
  assert.equal(await page.locator("#now-playing").textContent(), "Tone & Co — Test Tones");
  await screenshot(page, "radio-directory-playing");
  assert.deepEqual(page.problems, []);
});

test("a directory without a list address says that the owner can set one", async () => {
  configure([`radio_shoutcast_list=${origin()}/list.xml`]);
  const page = await openTree(browser, "demo");
  await item(page, "inetradio_rio").locator(":scope > .row .label").click();
  await page.waitForFunction(() => !document.getElementById("radio-notice").hidden, null, { timeout: 15000 });
  const words = "This station directory is not set up. The owner can set the address of its station list in the settings (audio.conf).";
  assert.equal(await page.locator("#radio-notice").textContent(), words);
  assert.equal(await page.locator("#status").textContent(), words);
  assert.equal(await page.locator("#tracks .track").count(), 0);
  assert.equal(await page.locator("#play-all").isDisabled(), true);
  assert.deepEqual(page.problems.filter((p) => !p.includes("503")), []);
});
