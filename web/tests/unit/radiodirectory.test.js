// The words of the station directories' error codes, in every language of the page.
import { test } from "node:test";
import assert from "node:assert/strict";
import { radioErrorWords } from "../../site/ui/radio.js";
import { LABELS } from "../../site/ui/labels.js";
import { RADIO_WORDS } from "../../site/ui/words/radio.js";

test("a directory that is not set up, or answers no station list, is worded in every language", () => {
  for (const [language, labels] of Object.entries(LABELS)) {
    const notConfigured = radioErrorWords(labels, "directory_not_configured");
    assert.equal(notConfigured, RADIO_WORDS[language].radio_directory_not_configured, language);
    // The owner is told where to set the address.
    assert.match(notConfigured, /audio\.conf/, language);
    assert.equal(radioErrorWords(labels, "directory_invalid"), RADIO_WORDS[language].radio_directory_invalid, language);
    assert.notEqual(notConfigured, labels.radioDirectoryUnreachable, language);
  }
});
