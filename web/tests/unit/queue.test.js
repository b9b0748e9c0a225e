// The play queue without the page: what "play next", "add to queue", remove, move, shuffle and
// repeat do to the play order, what is kept in the browser's storage and what is refused from it,
// and the queue's words in every language of the page.
import { test } from "node:test";
import assert from "node:assert/strict";
import { createQueueModel, queueItem, readPlayerState, QUEUE_LIMIT } from "../../site/ui/queue.js";
import { sessionMetadata } from "../../site/ui/session.js";
import { QUEUE_WORDS } from "../../site/ui/words/queue.js";
import { LABELS } from "../../site/ui/labels.js";

const track = (n) => ({ stream: `${n}.flac`, title: `T${n}`, artist: "A", album: "B", duration: 60 });
const items = (...ns) => ns.map((n, i) => queueItem(track(n), "musiclib_album:X", i));
const streams = (m) => m.items.map((i) => i.stream);
// A fixed sequence of "random" numbers, so that a shuffle is the same on every run.
const seeded = (seed = 7) => () => {
  seed = (seed * 16807) % 2147483647;
  return (seed - 1) / 2147483646;
};
// Every item once, in play order, from the playing one on.
function playOrder(m) {
  const out = [m.currentItem().stream];
  for (let item = m.step(1); item && out.length < m.items.length; item = m.step(1)) out.push(item.stream);
  return out;
}

test("replacing the queue plays the chosen row; next and previous follow the queue and stop at its ends", () => {
  const m = createQueueModel();
  assert.equal(m.replace(items(1, 2, 3), 1).stream, "2.flac");
  assert.equal(m.step(1).stream, "3.flac");
  assert.equal(m.step(1), null);
  assert.equal(m.currentItem().stream, "3.flac");
  assert.equal(m.step(-1).stream, "2.flac");
  assert.equal(m.step(-1).stream, "1.flac");
  assert.equal(m.step(-1), null);
});

test("play next goes right after the playing item, add to queue at the end", () => {
  const m = createQueueModel();
  m.replace(items(1, 2, 3), 0);
  assert.equal(m.playNext(items(8, 9)), 2);
  assert.equal(m.add(items(7)), 1);
  assert.deepEqual(streams(m), ["1.flac", "8.flac", "9.flac", "2.flac", "3.flac", "7.flac"]);
  assert.equal(m.step(1).stream, "8.flac");
  assert.equal(m.step(1).stream, "9.flac");
});

test("a new list played keeps the rows put in by hand that have not played yet, right after the chosen row", () => {
  const m = createQueueModel();
  m.replace(items(1, 2, 3), 0);
  m.playNext(items(8));
  m.add(items(9));
  m.step(1); // 8 plays: it is no longer waiting
  assert.equal(m.currentItem().stream, "8.flac");
  assert.equal(m.replace(items(4, 5, 6), 1).stream, "5.flac");
  assert.deepEqual(streams(m), ["4.flac", "5.flac", "9.flac", "6.flac"]);
  // Kept across a reload, and still kept by the next list.
  const n = createQueueModel();
  assert.equal(n.load(JSON.parse(JSON.stringify(m.save()))), true);
  n.replace(items(7), 0);
  assert.deepEqual(streams(n), ["7.flac", "9.flac"]);
  // Once played, it is not kept.
  assert.equal(m.step(1).stream, "9.flac");
  assert.equal(m.step(1).stream, "6.flac");
  m.replace(items(1), 0);
  assert.deepEqual(streams(m), ["1.flac"]);
  // Cleared, nothing is kept.
  n.clear();
  n.replace(items(1, 2), 0);
  assert.deepEqual(streams(n), ["1.flac", "2.flac"]);
});

test("in shuffle, the rows put in by hand still play right after the chosen row", () => {
  const m = createQueueModel(seeded(3));
  m.setShuffle(true);
  m.replace(items(1, 2, 3), 0);
  m.add(items(8, 9));
  const first = m.replace(items(4, 5, 6, 7), 2);
  assert.equal(first.stream, "6.flac");
  assert.deepEqual(playOrder(m).slice(0, 3).sort(), ["6.flac", "8.flac", "9.flac"].sort());
});

test("added to an empty queue, the first item becomes the current one", () => {
  const m = createQueueModel();
  m.add(items(4, 5));
  assert.equal(m.currentItem().stream, "4.flac");
  const n = createQueueModel();
  n.playNext(items(6));
  assert.equal(n.currentItem().stream, "6.flac");
});

test("removing the playing item makes the next one current; removing another keeps the current", () => {
  const m = createQueueModel();
  m.replace(items(1, 2, 3), 1);
  assert.equal(m.remove(0), false);
  assert.equal(m.currentItem().stream, "2.flac");
  assert.equal(m.remove(0), true);
  assert.equal(m.currentItem().stream, "3.flac");
  assert.equal(m.remove(0), true);
  assert.equal(m.currentItem(), null);
  assert.equal(m.remove(5), false);
});

test("moving an item keeps the playing one playing", () => {
  const m = createQueueModel();
  m.replace(items(1, 2, 3, 4), 1);
  assert.equal(m.move(3, 0), true);
  assert.deepEqual(streams(m), ["4.flac", "1.flac", "2.flac", "3.flac"]);
  assert.equal(m.currentItem().stream, "2.flac");
  assert.equal(m.position(), 2);
  assert.equal(m.move(0, 9), false);
  assert.equal(m.move(-1, 0), false);
  m.clear();
  assert.equal(m.items.length, 0);
  assert.equal(m.currentItem(), null);
});

test("repeat one plays the item again when it ends; next still moves on", () => {
  const m = createQueueModel();
  m.replace(items(1, 2), 0);
  m.setRepeat("one");
  assert.equal(m.afterEnd().stream, "1.flac");
  assert.equal(m.step(1).stream, "2.flac");
  m.setRepeat("bogus");
  assert.equal(m.repeat, "one");
});

test("repeat all starts the queue again after its last item, and previous goes round too", () => {
  const m = createQueueModel();
  m.replace(items(1, 2), 1);
  assert.equal(m.afterEnd(), null);
  m.setRepeat("all");
  assert.equal(m.afterEnd().stream, "1.flac");
  assert.equal(m.step(-1).stream, "2.flac");
});

test("shuffle plays every item once, the playing one first, without changing the queue's order", () => {
  const m = createQueueModel(seeded());
  m.replace(items(...Array.from({ length: 20 }, (_, i) => i + 1)), 4);
  const before = streams(m);
  m.setShuffle(true);
  const order = playOrder(m);
  assert.deepEqual(streams(m), before);
  assert.equal(order[0], "5.flac");
  assert.deepEqual([...order].sort(), [...before].sort());
  assert.notDeepEqual(order, before.slice(4).concat(before.slice(0, 4)), "a shuffled order");
  // Shuffle off: the queue's own order again, from the playing item on.
  m.setShuffle(false);
  const after = m.items[m.position() + 1] ?? null;
  assert.equal(m.step(1), after);
});

test("in shuffle, play next still plays next and added items come after the playing one", () => {
  const m = createQueueModel(seeded(3));
  m.replace(items(1, 2, 3, 4, 5), 0);
  m.setShuffle(true);
  m.step(1);
  m.step(1);
  const playing = m.currentItem().stream;
  m.playNext(items(90));
  m.add(items(91));
  const order = playOrder(m);
  assert.equal(order[0], playing);
  assert.equal(order[1], "90.flac");
  assert.ok(order.includes("91.flac"));
});

test("shuffle with repeat all draws a new order for the next round, not starting with the last item", () => {
  const m = createQueueModel(seeded(11));
  m.replace(items(1, 2, 3, 4), 0);
  m.setShuffle(true);
  m.setRepeat("all");
  const first = [m.currentItem().stream];
  for (let i = 0; i < 3; i++) first.push(m.step(1).stream);
  const second = [];
  for (let i = 0; i < 4; i++) second.push(m.step(1).stream);
  assert.notEqual(second[0], first[3]);
  assert.deepEqual([...second].sort(), [...first].sort());
});

test("the stored queue comes back with its items, position, shuffle order and repeat", () => {
  const m = createQueueModel(seeded());
  m.replace(items(1, 2, 3, 4, 5), 2);
  m.setShuffle(true);
  m.setRepeat("all");
  const stored = JSON.parse(JSON.stringify(m.save()));
  const n = createQueueModel();
  assert.equal(n.load(stored), true);
  assert.deepEqual(streams(n), streams(m));
  assert.equal(n.currentItem().stream, "3.flac");
  assert.equal(n.repeat, "all");
  assert.equal(n.shuffle, true);
  assert.deepEqual(playOrder(n), playOrder(m));
});

test("a queue too large to store keeps a window around the playing item", () => {
  const m = createQueueModel();
  m.replace(items(...Array.from({ length: 100 }, (_, i) => i)), 90);
  const stored = m.save(10);
  assert.equal(stored.items.length, 10);
  assert.equal(stored.items[stored.position].stream, "90.flac");
});

test("stored values that are not a queue leave it empty; unplayable items are refused", () => {
  const m = createQueueModel();
  for (const bad of [null, 7, "x", [], {}, { version: 2, items: [] }, { version: 1, items: "x" },
    { version: 1, items: [{ stream: "../etc/passwd" }] }, { version: 1, items: [{ url: "javascript:alert(1)" }] },
    { version: 1, items: [{ title: "no stream" }] }, { version: 1, items: [null] }]) {
    assert.equal(m.load(bad), false, JSON.stringify(bad));
    assert.equal(m.items.length, 0);
    assert.equal(m.currentItem(), null);
  }
  // A bad position, repeat or shuffle order is replaced by a sound one.
  assert.equal(m.load({ version: 1, items: [track(1), track(2)], position: 9, repeat: "always", shuffle: true, order: [0, 0] }), true);
  assert.equal(m.currentItem().stream, "1.flac");
  assert.equal(m.repeat, "off");
  assert.deepEqual([...m.order].sort(), m.items.map((i) => i.key).sort());
});

test("a queue item keeps a row's scalar fields only, and only rows with a stream, an http(s) address or this site's library.cgi path", () => {
  const item = queueItem({ stream: "12.mp3", title: "x".repeat(10), nested: { a: 1 }, list: [1], bad: NaN, fn: () => 1, "we ird": "y" }, "n", 3);
  assert.deepEqual(item, { stream: "12.mp3", title: "xxxxxxxxxx", from: "n", at: 3 });
  assert.equal(queueItem({ url: "https://radio.example/stream" }).url, "https://radio.example/stream");
  assert.equal(queueItem({ url: "ftp://radio.example/stream" }), null);
  // This site's own path for another media server's track or a directory's station, nothing else relative.
  const remote = "webapi/library.cgi?action=remote_stream&node=x&object=1";
  assert.equal(queueItem({ url: remote }).url, remote);
  assert.equal(queueItem({ url: "javascript:alert(1)" }), null);
  assert.equal(queueItem({ url: "/etc/passwd" }), null);
  assert.equal(queueItem({ url: "webapi/audiotree.cgi?action=x" }), null);
  assert.equal(queueItem({ stream: "12.flac", title: "y".repeat(5000) }).title, undefined);
  assert.equal(queueItem(null), null);
  assert.ok(QUEUE_LIMIT >= 10000, "a 10,000-track list fits");
});

test("the player's stored time and volume are read within their ranges only", () => {
  assert.deepEqual(readPlayerState({ time: 12.5, volume: 0.3 }), { time: 12.5, volume: 0.3 });
  assert.deepEqual(readPlayerState({ time: -1, volume: 3 }), { time: 0, volume: 1 });
  assert.deepEqual(readPlayerState({ time: "5", volume: null }), { time: 0, volume: 1 });
  assert.deepEqual(readPlayerState(null), { time: 0, volume: 1 });
});

test("the media controls get the item's title, artist and album, and artwork only when a cover is named", () => {
  assert.deepEqual(sessionMetadata({ title: "T", artist: "A", album: "B" }), { title: "T", artist: "A", album: "B", artwork: [] });
  assert.deepEqual(sessionMetadata({ title: "T" }, () => "art/1.jpg").artwork, [{ src: "art/1.jpg" }]);
  assert.deepEqual(sessionMetadata(null), { title: "", artist: "", album: "", artwork: [] });
});

test("the queue's words exist in each of the eight languages", () => {
  const keys = Object.keys(QUEUE_WORDS.enu).sort();
  assert.deepEqual(Object.keys(QUEUE_WORDS).sort(), Object.keys(LABELS).sort());
  for (const [code, words] of Object.entries(QUEUE_WORDS)) {
    assert.deepEqual(Object.keys(words).sort(), keys, code);
    for (const key of keys) assert.ok(typeof words[key] === "string" && words[key] !== "", `${code}.${key}`);
    for (const key of ["queueCount", "queuedNext", "queuedAdded"]) assert.ok(words[key].includes("{count}"), `${code}.${key}`);
    assert.ok(words.queueFull.includes("{max}"), code);
    assert.equal(LABELS[code].queue, words.queue);
    if (code !== "enu") assert.notEqual(words.queueEmpty, QUEUE_WORDS.enu.queueEmpty, code);
  }
});

test("play all from the start of play order: the first row, or in shuffle any row", () => {
  const m = createQueueModel(() => 0.99);
  assert.equal(m.replace(items(1, 2, 3), -1).stream, "1.flac");
  m.setShuffle(true);
  assert.equal(m.replace(items(1, 2, 3), -1).stream, "3.flac");
  assert.equal(m.order[0], m.current);
});
