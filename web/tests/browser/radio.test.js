// Internet radio on the page: a station added to User Defined from the page, played straight from a
// stream served in this test's own namespace, marked as a favourite and removed; bad input refused in
// the user's language; the directory sources on the internet say in the pane that they cannot be
// reached.
import { test, before, after } from "node:test";
import assert from "node:assert/strict";
import { createServer } from "node:http";
import { existsSync, readFileSync, rmSync, writeFileSync } from "node:fs";
import { launch, close, openTree, item, screenshot } from "./harness.js";

let browser;
let stream;          // the station's server
const requests = []; // what it was asked for
before(async () => {
  browser = await launch(["--autoplay-policy=no-user-gesture-required"]);
  const wav = sineWav(4);
  stream = createServer((request, response) => {
    requests.push(request.url);
    response.writeHead(200, { "Content-Type": "audio/wav", "Content-Length": wav.length });
    response.end(wav);
  });
  await new Promise((resolve) => stream.listen(0, "127.0.0.1", resolve));
});
after(async () => {
  await close(browser);
  await new Promise((resolve) => stream.close(resolve));
});

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

const stationsFile = (user) => `/usr/vanu/etc/preference/${user}/radio.stations`;
const stationUrl = () => `http://127.0.0.1:${stream.address().port}/live.wav`;

// Selects a tree node and waits until the pane and the radio panel have listed it.
async function selectRadio(page, id, loadedBefore) {
  await item(page, id).locator(":scope > .row .label").click();
  await page.waitForFunction(([before]) => Number(document.getElementById("radio-panel").dataset.loaded ?? 0) > before &&
    !document.getElementById("listing").hasAttribute("aria-busy"), [loadedBefore], { timeout: 15000 });
}
const panelLoads = (page) => page.evaluate(() => Number(document.getElementById("radio-panel").dataset.loaded ?? 0));
// Waits for the pane's next listing and the radio panel's after a change.
async function afterChange(page, action) {
  const loads = await panelLoads(page);
  const listed = await page.evaluate(() => Number(document.getElementById("listing").dataset.loaded ?? 0));
  await action();
  await page.waitForFunction(([p, l]) => Number(document.getElementById("radio-panel").dataset.loaded ?? 0) > p &&
    Number(document.getElementById("listing").dataset.loaded ?? 0) > l, [loads, listed], { timeout: 15000 });
}

test("a station added from the page plays from the station, becomes a favourite and is removed", async () => {
  const page = await openTree(browser, "demo");
  await selectRadio(page, "inetradio_new", 0);
  assert.equal(await page.locator("#radio-form").isVisible(), true);
  assert.equal(await page.evaluate(() => document.activeElement.id), "radio-name");
  assert.equal(await page.locator("#radio-notice").textContent(), "No stations yet. Add one with its name and stream URL.");

  await page.locator("#radio-name").fill("Test Stream");
  await page.locator("#radio-url").fill(stationUrl());
  await afterChange(page, () => page.locator("#radio-add").click());
  assert.equal(await page.locator("#status").textContent(), "The station was added.");
  const rows = page.locator("#tracks .track");
  assert.equal(await rows.count(), 1);
  assert.equal((await rows.first().locator(".title").textContent()).trim(), "Test Stream");
  assert.match(readFileSync(stationsFile("demo"), "utf8"), /name="Test Stream"\nurl="http:\/\/127\.0\.0\.1:\d+\/live\.wav"\nfavorite=0/);

  // Played by the audio element from the station itself.
  await page.evaluate(() => {
    const audio = document.getElementById("audio");
    window.maxTime = 0;
    audio.addEventListener("timeupdate", () => { window.maxTime = Math.max(window.maxTime, audio.currentTime); });
  });
  await rows.first().click();
  await page.waitForSelector("#player[data-state=playing]", { timeout: 15000 });
  await page.waitForFunction(() => window.maxTime > 0.2, null, { timeout: 15000 });
  assert.equal(await page.evaluate(() => document.getElementById("audio").src), stationUrl());
  assert.ok(requests.includes("/live.wav"), `requests: ${requests.join(", ")}`);
  assert.equal(await page.locator("#now-playing").textContent(), "Test Stream");
  await screenshot(page, "radio-playing");

  // A favourite: listed under My Favorites too.
  await afterChange(page, () => page.locator("#radio-stations .radio-favorite").first().click());
  assert.equal(await page.locator("#radio-stations .radio-favorite").first().getAttribute("aria-pressed"), "true");
  await selectRadio(page, "inetradio_favorite", await panelLoads(page));
  assert.equal(await page.locator("#radio-form").isVisible(), false);
  assert.deepEqual(await page.locator("#tracks .track .title").allTextContents(), ["Test Stream"]);

  // Removed: gone from both lists.
  await selectRadio(page, "inetradio_userdefined", await panelLoads(page));
  await afterChange(page, () => page.locator("#radio-stations .radio-remove").first().click());
  assert.equal(await page.locator("#tracks .track").count(), 0);
  assert.equal(await page.locator("#status").textContent(), "The station was removed.");
  await selectRadio(page, "inetradio_favorite", await panelLoads(page));
  assert.equal(await page.locator("#tracks .track").count(), 0);
  assert.equal(await page.locator("#radio-notice").textContent(), "No favourites yet. Mark a station in User Defined as a favourite.");
  assert.deepEqual(page.problems, []);
});

test("a URL that is not http or https is refused in the user's language and nothing is kept", async () => {
  const page = await openTree(browser, "hans");
  await selectRadio(page, "inetradio_userdefined", 0);
  await page.locator("#radio-name").fill("Kaputt");
  await page.locator("#radio-url").fill("ftp://198.51.100.9/stream");
  await page.locator("#radio-add").click();
  await page.waitForSelector("#status.error");
  assert.match(await page.locator("#status").textContent(), /^Geben Sie eine Stream-URL ein, die mit http:\/\/ oder https:\/\/ beginnt/);
  assert.equal(existsSync(stationsFile("hans")) ? readFileSync(stationsFile("hans"), "utf8").includes("Kaputt") : false, false);
  assert.equal(await page.locator("#tracks .track").count(), 0);
  // What the user typed stays, to be corrected.
  assert.equal(await page.locator("#radio-name").inputValue(), "Kaputt");
  assert.deepEqual(page.problems.filter((p) => !p.includes("400")), []);
});

test("the directory sources on the internet say in the pane that they cannot be reached", async (t) => {
  // Their station lists are set to an address where nobody listens.
  const conf = "/var/packages/Harmona/etc/audio.conf";
  const saved = existsSync(conf) ? readFileSync(conf, "utf8") : null;
  writeFileSync(conf, "radio_shoutcast_list=http://127.0.0.1:9/sc.xml\nradio_radioio_list=http://127.0.0.1:9/rio.xml\n");
  t.after(() => (saved === null ? rmSync(conf, { force: true }) : writeFileSync(conf, saved)));
  const page = await openTree(browser, "demo");
  for (const id of ["inetradio_sc", "inetradio_rio"]) {
    await item(page, id).locator(":scope > .row .label").click();
    await page.waitForFunction(() => !document.getElementById("radio-notice").hidden, null, { timeout: 15000 });
    assert.equal(await page.locator("#radio-notice").textContent(),
      "This station directory is on the internet and cannot be reached from this server.");
    assert.equal(await page.locator("#status").textContent(),
      "This station directory is on the internet and cannot be reached from this server.");
    assert.equal(await page.locator("#radio-form").isVisible(), false);
    assert.equal(await page.locator("#play-all").isDisabled(), true);
  }
  await screenshot(page, "radio-directory");
  assert.deepEqual(page.problems.filter((p) => !p.includes("503")), []);
});
