// The internet radio pane's pure parts: which node a tree node lists, the words of the error codes,
// and its words in every language of the page.
import { test } from "node:test";
import assert from "node:assert/strict";
import { listedRadioNode, isRadioNode, radioErrorWords } from "../../site/ui/radio.js";
import { isListable } from "../../site/ui/listen.js";
import { LABELS } from "../../site/ui/labels.js";
import { RADIO_WORDS } from "../../site/ui/words/radio.js";

test("the Add Radio Station button lists the user's own stations; the sources list themselves", () => {
  assert.equal(listedRadioNode("inetradio_new"), "inetradio_userdefined");
  for (const id of ["inetradio_userdefined", "inetradio_favorite", "inetradio_sc", "inetradio_rio"]) {
    assert.equal(listedRadioNode(id), id);
    assert.equal(isRadioNode(id), true, id);
    assert.equal(isListable(id), true, id);
  }
  for (const id of ["inetradio_root", "inetradio_new", "inetradio_x", "musiclib_music_all", "", undefined]) {
    assert.equal(isRadioNode(id), false, String(id));
  }
  assert.equal(isListable("inetradio_root"), false);
});

test("error codes of the radio actions have words, other codes none", () => {
  const labels = LABELS.enu;
  assert.equal(radioErrorWords(labels, "url_invalid"), RADIO_WORDS.enu.radio_url_invalid);
  assert.equal(radioErrorWords(labels, "directory_unreachable"), RADIO_WORDS.enu.radioDirectoryUnreachable);
  for (const code of ["rule_invalid", "", null, undefined, 7, "__proto__x", "constructor", "a".repeat(41)])
    assert.equal(radioErrorWords(labels, code), null, String(code));
});

test("every language of the page has every radio word", () => {
  const keys = Object.keys(RADIO_WORDS.enu).sort();
  assert.deepEqual(Object.keys(RADIO_WORDS).sort(), Object.keys(LABELS).sort());
  for (const [code, words] of Object.entries(RADIO_WORDS)) {
    assert.deepEqual(Object.keys(words).sort(), keys, code);
    for (const key of keys) assert.ok(typeof words[key] === "string" && words[key] !== "", `${code}.${key}`);
    assert.equal(LABELS[code].radioAdd, words.radioAdd);
  }
});
