// Filling the page's words: {name} places get their values, and a count of one reads in the
// singular where the language has one ("1 track", "1 piste", "0 piste"), never "1 tracks".
import { test } from "node:test";
import assert from "node:assert/strict";
import { format, counted } from "../../site/ui/text.js";
import { LABELS, HTML_LANG } from "../../site/ui/labels.js";

test("a word's places get their values, and a value not given leaves nothing", () => {
  assert.equal(format("{count} tracks added to “{name}”.", { count: 3, name: "Road" }), "3 tracks added to “Road”.");
  assert.equal(format("{count} of {max}", { count: 2 }), "2 of ");
  assert.equal(format("{name}", { name: "{count}" }), "{count}", "a value is not filled again");
  assert.equal(format(undefined, {}), "");
});

test("one track, two tracks and no tracks read as each language says them", () => {
  const say = (code, key, count, values) => counted(LABELS[code], key, count, values, HTML_LANG[code]);
  assert.equal(say("enu", "trackCount", 1), "1 track");
  assert.equal(say("enu", "trackCount", 2), "2 tracks");
  assert.equal(say("enu", "trackCount", 0), "0 tracks");
  assert.equal(say("enu", "queuedAdded", 1), "1 track was added to the queue.");
  assert.equal(say("enu", "plAdded", 1, { name: "Road" }), "1 track added to “Road”.");
  assert.equal(say("fre", "trackCount", 0), "0 piste", "French counts zero as one");
  assert.equal(say("fre", "trackCount", 2), "2 pistes");
  assert.equal(say("ger", "queuedAdded", 1), "1 Titel wurde zur Warteschlange hinzugefügt.");
  assert.equal(say("ger", "queuedAdded", 5), "5 Titel wurden zur Warteschlange hinzugefügt.");
  assert.equal(say("spn", "searchAlbumCount", 1), "1 álbum");
  assert.equal(say("ita", "queueCount", 1), "1 brano");
  assert.equal(say("jpn", "trackCount", 1), "1 曲");
  assert.equal(say("chs", "queueCount", 1), "1 首曲目");
});

test("every counted word of every language has its form for one, with the same places", () => {
  for (const [code, words] of Object.entries(LABELS))
    for (const [key, text] of Object.entries(words)) {
      if (typeof text !== "string" || !text.includes("{count}") || key.endsWith("One")) continue;
      const one = words[`${key}One`];
      assert.equal(typeof one, "string", `${code} ${key}One`);
      assert.deepEqual(one.match(/\{\w+\}/g), text.match(/\{\w+\}/g), `${code} ${key}One`);
    }
});

test("a word without a form for one, or a language tag the browser does not know, still reads", () => {
  assert.equal(counted({ n: "{count} items" }, "n", 1, {}, "en"), "1 items");
  assert.equal(counted({ n: "{count} items", nOne: "{count} item" }, "n", 1, {}, "not a tag!"), "1 item");
  assert.equal(counted(undefined, "n", 1, {}, "en"), "");
});
