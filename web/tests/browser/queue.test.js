// The play queue on the running system: "Play all" and a row's click fill it, "Play next" and
// "Add to queue" add to it, its panel removes, moves (buttons, keyboard, drag) and clears, shuffle
// and repeat change what plays after a track.
import { test, before, after } from "node:test";
import assert from "node:assert/strict";
import { launch, close, openTree, screenshot } from "./harness.js";
import { list, firstAlbum, queueStreams, listedStreams, position, stored, pause } from "./queue-helpers.js";

let browser;
before(async () => { browser = await launch(["--autoplay-policy=no-user-gesture-required"]); });
after(async () => { await close(browser); });

test("play all fills the queue; play next and add to queue put rows after the playing one and at the end", async () => {
  const page = await openTree(browser, "demo");
  await firstAlbum(page);
  const listed = await listedStreams(page);
  const count = listed.length;
  assert.ok(count >= 7, `${count} tracks`);
  await page.evaluate(() => { document.getElementById("audio").muted = true; });
  await page.locator("#play-all").click();
  await page.waitForSelector("#player[data-state=playing]", { timeout: 15000 });
  await pause(page);
  await page.locator("#queue-toggle").click();
  assert.equal(await page.locator("#queue-toggle").getAttribute("aria-expanded"), "true");
  assert.equal(await page.locator("#queue-panel").getAttribute("data-count"), String(count));
  assert.equal(await page.locator("#queue-count").textContent(), `${count} tracks`);
  assert.deepEqual(await queueStreams(page), listed);
  const at = await position(page);
  assert.equal(await page.locator("#player").getAttribute("data-stream"), listed[at]);
  assert.equal(await page.locator(`#queue-spacer .queue-item[data-index="${at}"]`).getAttribute("aria-current"), "true");

  await page.locator('#tracks .track[data-index="5"] .queue-next').click();
  await page.locator('#tracks .track[data-index="6"] .queue-add').click();
  assert.equal(await page.locator("#status").textContent(), "1 track was added to the queue.");
  assert.equal(await page.locator("#queue-panel").getAttribute("data-count"), String(count + 2));
  const queue = await queueStreams(page);
  assert.equal(queue[at + 1], listed[5]);
  assert.equal(queue.at(-1), listed[6]);
  // Nothing plays because of the additions; next plays the "play next" row.
  assert.equal(await page.evaluate(() => document.getElementById("audio").paused), true);
  await page.locator("#next").click();
  await page.waitForFunction((s) => document.getElementById("player").dataset.stream === s, listed[5]);
  assert.equal(await position(page), at + 1);

  // The whole list after the playing row: its rows follow it.
  await pause(page);
  await page.locator(".queue-all-next").click();
  assert.equal(await page.locator("#queue-panel").getAttribute("data-count"), String(2 * count + 2));
  const longer = await queueStreams(page);
  assert.deepEqual(longer.slice(at + 2, at + 2 + count), listed);
  await screenshot(page, "queue-open");

  // A row of the list played: the rows put in by hand that have not played yet stay, right after it.
  await page.locator('#tracks .track[data-index="1"] .title').click();
  await page.waitForFunction((s) => document.getElementById("player").dataset.stream === s, listed[1]);
  const replaced = await queueStreams(page);
  assert.deepEqual(replaced, [listed[0], listed[1], ...listed, listed[6], ...listed.slice(2)]);
  assert.equal(await position(page), 1);
  assert.deepEqual(page.problems, []);
});

test("the queue's rows are removed, moved with buttons, the keyboard and a drag, and cleared", async () => {
  const page = await openTree(browser, "demo");
  await firstAlbum(page);
  const listed = await listedStreams(page);
  assert.ok(listed.length >= 3, `${listed.length} tracks`);
  // Four rows added to an empty queue: the first is loaded, nothing plays.
  for (const i of [0, 1, 2]) await page.locator(`#tracks .track[data-index="${i}"] .queue-add`).click();
  await page.locator('#tracks .track[data-index="0"] .queue-add').click();
  assert.equal(await page.evaluate(() => document.getElementById("audio").paused), true);
  assert.equal(await page.locator("#player").getAttribute("data-stream"), listed[0]);
  await page.locator("#queue-toggle").click();
  assert.deepEqual(await queueStreams(page), [listed[0], listed[1], listed[2], listed[0]]);

  // Buttons: the third row up; the first row's up button is disabled.
  assert.equal(await page.locator('#queue-spacer .queue-item[data-index="0"] .queue-up').isDisabled(), true);
  await page.locator('#queue-spacer .queue-item[data-index="2"] .queue-up').click();
  assert.deepEqual(await queueStreams(page), [listed[0], listed[2], listed[1], listed[0]]);
  // The keyboard: Enter on a move button moves the row, and the focus stays with it.
  await page.locator('#queue-spacer .queue-item[data-index="1"] .queue-down').focus();
  await page.keyboard.press("Enter");
  assert.deepEqual(await queueStreams(page), [listed[0], listed[1], listed[2], listed[0]]);
  await page.keyboard.press("Enter");
  assert.deepEqual(await queueStreams(page), [listed[0], listed[1], listed[0], listed[2]]);
  assert.equal(await page.evaluate(() => document.activeElement.closest(".queue-item")?.dataset.index), "3");
  // At the bottom the focus goes to the row's next button that can still be used.
  assert.equal(await page.evaluate(() => document.activeElement.classList.contains("queue-down")), false);

  // A drag of the last row's handle onto the first row.
  const handle = page.locator('#queue-spacer .queue-item[data-index="3"] .queue-drag');
  const target = await page.locator('#queue-spacer .queue-item[data-index="0"]').boundingBox();
  const box = await handle.boundingBox();
  await page.mouse.move(box.x + box.width / 2, box.y + box.height / 2);
  await page.mouse.down();
  await page.mouse.move(box.x + box.width / 2, target.y + 4, { steps: 8 });
  assert.equal(await page.locator("#queue-panel").getAttribute("data-dragging"), "true");
  await page.mouse.up();
  assert.deepEqual(await queueStreams(page), [listed[2], listed[0], listed[1], listed[0]]);
  // The loaded item moved with its row.
  assert.equal(await position(page), 1);

  // Remove: the loaded row goes, the next one takes its place in the player.
  await page.locator('#queue-spacer .queue-item[data-index="1"] .queue-remove').click();
  assert.deepEqual(await queueStreams(page), [listed[2], listed[1], listed[0]]);
  assert.equal(await page.locator("#player").getAttribute("data-stream"), listed[1]);
  assert.equal(await page.evaluate(() => document.getElementById("audio").paused), true);
  assert.deepEqual((await stored(page, "harmona.queue")).items.map((i) => i.stream), [listed[2], listed[1], listed[0]]);

  await page.locator("#queue-clear").click();
  assert.equal(await page.locator("#queue-panel").getAttribute("data-count"), "0");
  assert.equal(await page.locator("#queue-empty").isVisible(), true);
  assert.equal(await page.locator("#player").getAttribute("data-stream"), null);
  assert.equal(await page.locator("#queue-clear").isDisabled(), true);
  assert.equal(await page.locator("#status").textContent(), "The queue was cleared.");
  await page.waitForFunction(() => JSON.parse(localStorage.getItem("harmona.queue")).items.length === 0);
  // Escape closes the panel and gives the focus back to its button.
  await page.locator("#queue-close").focus();
  await page.keyboard.press("Escape");
  assert.equal(await page.locator("#queue-panel").isHidden(), true);
  assert.equal(await page.evaluate(() => document.activeElement.id), "queue-toggle");
  assert.deepEqual(page.problems, []);
});

test("shuffle plays each track of the list once; repeat one plays a track again; repeat all starts over", async () => {
  const page = await openTree(browser, "demo");
  await firstAlbum(page);
  const listed = await listedStreams(page);
  await page.evaluate(() => {
    const audio = document.getElementById("audio");
    audio.defaultPlaybackRate = 4;
    audio.muted = true;
    window.played = [];
    audio.addEventListener("playing", () => window.played.push(document.getElementById("player").dataset.stream));
  });
  await page.locator("#shuffle").click();
  assert.equal(await page.locator("#shuffle").getAttribute("aria-pressed"), "true");
  await page.locator("#play-all").click();
  await page.waitForFunction((n) => window.played.length >= n, listed.length, { timeout: 60000 });
  // Once through, and then it stops: repeat is off.
  await page.waitForSelector("#player[data-state=ended]", { timeout: 15000 });
  const played = await page.evaluate(() => window.played);
  assert.equal(played.length, listed.length);
  assert.deepEqual([...played].sort(), [...listed].sort());
  // The queue's own order stays the list's.
  await page.locator("#queue-toggle").click();
  assert.deepEqual(await queueStreams(page), listed);

  // Repeat one: the playing track again when it ends.
  await page.locator("#shuffle").click();
  await page.locator("#repeat").click();
  assert.equal(await page.locator("#repeat").getAttribute("data-repeat"), "one");
  assert.equal(await page.locator("#repeat").textContent(), "Repeat: this track");
  await page.locator('#queue-spacer .queue-item[data-index="0"] .queue-title').click();
  await page.evaluate(() => { window.played = []; });
  await page.waitForFunction(() => window.played.length >= 3, null, { timeout: 30000 });
  const again = await page.evaluate(() => window.played.slice(0, 3));
  assert.deepEqual(again, [listed[0], listed[0], listed[0]]);

  // Repeat all: after the last track the first one.
  await page.locator("#repeat").click();
  assert.equal(await page.locator("#repeat").getAttribute("data-repeat"), "all");
  const last = listed.length - 1;
  await pause(page);
  await page.locator(`#queue-spacer .queue-item[data-index="${last}"] .queue-title`).click();
  await page.waitForFunction((s) => window.played.lastIndexOf(s) >= 0 && window.played.lastIndexOf(s) < window.played.length - 1,
    listed[last], { timeout: 30000 });
  const round = await page.evaluate((s) => window.played.slice(window.played.lastIndexOf(s)), listed[last]);
  assert.equal(round[1], listed[0]);
  assert.deepEqual((await stored(page, "harmona.queue")).repeat, "all");
  await page.locator("#repeat").click();
  assert.equal(await page.locator("#repeat").getAttribute("data-repeat"), "off");
  assert.deepEqual(page.problems, []);
});

