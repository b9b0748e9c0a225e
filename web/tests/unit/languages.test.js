// The page's words: every one of the eight UI languages carries every word the English page has
// (the base words and every feature's), none empty, each template with the same placeholders.
import { test } from "node:test";
import assert from "node:assert/strict";
import { LABELS, HTML_LANG } from "../../site/ui/labels.js";
import { LANGUAGE_NAMES } from "../../site/ui/words/a11y.js";
import { pickedLanguage } from "../../site/ui/language.js";

const EIGHT = ["chs", "cht", "enu", "fre", "ger", "ita", "jpn", "spn"];

// Every word's path ("failures.node_gone") and its text.
function words(dictionary, prefix = "") {
  return Object.entries(dictionary).flatMap(([key, value]) =>
    value !== null && typeof value === "object" ? words(value, `${prefix}${key}.`) : [[`${prefix}${key}`, value]]);
}
const placeholders = (text) => [...String(text).matchAll(/\{(\w+)\}/g)].map((m) => m[1]).sort();

test("the page speaks eight languages, each with its html tag and its own name in the picker", () => {
  assert.deepEqual(Object.keys(LABELS).sort(), EIGHT);
  assert.deepEqual(Object.keys(HTML_LANG).sort(), EIGHT);
  assert.deepEqual(Object.keys(LANGUAGE_NAMES).sort(), EIGHT);
});

test("every language has every word of English, none empty, with the same placeholders", () => {
  const english = new Map(words(LABELS.enu));
  assert.ok(english.size > 100, `${english.size} English words`);
  for (const code of EIGHT) {
    const own = new Map(words(LABELS[code]));
    const missing = [...english.keys()].filter((key) => !own.has(key));
    assert.deepEqual(missing, [], `${code} lacks ${missing.join(", ")}`);
    for (const [key, text] of own) {
      assert.equal(typeof text, "string", `${code} ${key}`);
      assert.notEqual(text.trim(), "", `${code} ${key}`);
      if (english.has(key)) assert.deepEqual(placeholders(text), placeholders(english.get(key)), `${code} ${key}`);
    }
  }
});

test("the player's words are the language's own, not English, beside the tree's", () => {
  for (const code of EIGHT.filter((c) => c !== "enu")) {
    for (const key of ["playAll", "next", "previous", "cannotPlay", "colTitle", "colArtist", "colDuration", "language", "languageAuto"])
      assert.notEqual(LABELS[code][key], LABELS.enu[key], `${code} ${key}`);
  }
});

test("the picker shows a saved language of the page's own, and the browser's language for anything else", () => {
  for (const code of EIGHT) assert.equal(pickedLanguage(code), code);
  for (const other of ["def", "", "dan", "krn", undefined, null, 7, "__proto__", "toString"]) assert.equal(pickedLanguage(other), "def", String(other));
});

test("the tree's own nodes are shown in the page's language; names of albums or playlists never change", async () => {
  const { treeTextTranslator } = await import("../../site/ui/language.js");
  const texts = {
    ger: { common: { class_music_album: "Album", random_playlist: "Zufalls-100" }, playlist: { newplaylist: "Neue Wiedergabeliste" } },
    fre: { common: { class_music_album: "Album", random_playlist: "Aléatoire 100" }, playlist: { newplaylist: "Nouvelle liste" } },
  };
  const text = treeTextTranslator(texts, "ger", "fre");
  assert.equal(text("Zufalls-100", "musiclib_random"), "Aléatoire 100");
  assert.equal(text("Neue Wiedergabeliste", "musiclib_music_personal_new"), "Nouvelle liste");
  assert.equal(text("Zufalls-100", "musiclib_album:Zufalls-100"), "Zufalls-100", "an album that happens to bear the name");
  assert.equal(text("Zufalls-100", "musiclib_music_personal/playlist/Zufalls-100"), "Zufalls-100");
  assert.equal(text("Something else", "musiclib_root"), "Something else");
  assert.equal(treeTextTranslator(texts, "ger", "ger")("Zufalls-100", "musiclib_random"), "Zufalls-100");
  assert.equal(treeTextTranslator(texts, "ger", "ita")("Zufalls-100", "musiclib_random"), "Zufalls-100", "no table: as it is");
  assert.equal(treeTextTranslator({}, "ger", "fre")("Zufalls-100", "musiclib_random"), "Zufalls-100");
});
