// The search box's checks of what was typed, before anything is sent.
import { test } from "node:test";
import assert from "node:assert/strict";
import { queryWords, isSendable, MAX_QUERY_WORDS } from "../../site/ui/search.js";

test("the words of a query are split at punctuation and spaces, as library.cgi splits them", () => {
  assert.deepEqual(queryWords("  The  beat\t"), ["The", "beat"]);
  assert.deepEqual(queryWords('AC/DC "live"*'), ["AC", "DC", "live"]);
  assert.deepEqual(queryWords("Déjà-vu 東京"), ["Déjà", "vu", "東京"]);
  assert.deepEqual(queryWords('" * - ( )'), []);
});

test("only a query of 1 to 8 words and at most 200 bytes is sent", () => {
  assert.equal(isSendable(""), false);
  assert.equal(isSendable(" - "), false);
  assert.equal(isSendable("beat"), true);
  assert.equal(isSendable(Array(MAX_QUERY_WORDS).fill("a").join(" ")), true);
  assert.equal(isSendable(Array(MAX_QUERY_WORDS + 1).fill("a").join(" ")), false);
  assert.equal(isSendable("a".repeat(200)), true);
  assert.equal(isSendable("a".repeat(201)), false);
  assert.equal(isSendable("é".repeat(101)), false); // 202 bytes
});
