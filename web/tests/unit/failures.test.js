// Which kind of failure a reply is, and which tree nodes are tracks that the tree leaves out.
import { test } from "node:test";
import assert from "node:assert/strict";
import { failureCode, readApiReply, isTrackNode, isBrowsedLibraryNode, splitTracks, FAILURE_CODES } from "../../site/ui/failures.js";
import { LABELS } from "../../site/ui/labels.js";

test("library.cgi's error codes are read from the reply; a bare 401 is an expired login", () => {
  const gone = readApiReply(404, { success: false, error: "node_gone", errinfo: { sec: "error", key: "Could not get the entry", line: 110 }, message: "x" });
  assert.equal(gone.kind, "error");
  assert.equal(failureCode(gone), "node_gone");
  assert.equal(gone.errinfo.line, 110);
  assert.equal(failureCode(readApiReply(502, { success: false, error: "media_server_down" })), "media_server_down");
  assert.equal(failureCode(readApiReply(401, null)), "login_expired");
  assert.equal(failureCode({ kind: "http", status: 401 }), "login_expired");
  assert.equal(failureCode({ kind: "http", status: 403 }), "request_refused");
  assert.equal(failureCode({ kind: "offline" }), "offline");
  assert.equal(readApiReply(200, { success: true, tracks: [] }).kind, "ok");
});

test("codes the page has no words for, and the tree CGI's errinfo replies, are not named", () => {
  assert.equal(failureCode(readApiReply(500, { success: false, error: "something_new" })), null);
  assert.equal(failureCode({ kind: "error", errinfo: { sec: "playlist", key: "error_create_random100", line: 616 } }), null);
  assert.equal(failureCode({ kind: "http", status: 500 }), null);
  assert.equal(failureCode(null), null);
  assert.equal(readApiReply(200, { success: false }).kind, "error");
  assert.equal(readApiReply(502, null).kind, "http");
});

test("every failure has words in each of the eight languages, distinct from one another", () => {
  for (const [language, labels] of Object.entries(LABELS)) {
    const texts = FAILURE_CODES.map((code) => labels.failures?.[code]);
    for (const [i, text] of texts.entries()) assert.ok(typeof text === "string" && text.length > 5, `${language} ${FAILURE_CODES[i]}`);
    assert.equal(new Set(texts).size, texts.length, language);
    assert.ok(labels.listLoading && labels.tracksInList, language);
  }
  assert.deepEqual(Object.keys(LABELS).sort(), ["chs", "cht", "enu", "fre", "ger", "ita", "jpn", "spn"]);
});

test("tracks of the media server are told from its containers by their ids", () => {
  for (const id of ["musiclib_track:12", "musiclib_album:A/B/track:7", "musiclib_folder:Bench/track:10000", "musiclib_random/track:3"])
    assert.equal(isTrackNode({ id }), true, id);
  for (const id of ["musiclib_album:A/B", "musiclib_folder:track%3A1", "musiclib_music_all", "musiclib_random", "musiclib_track:x",
    "mediaserver_http://192.0.2.2/track:1", "musiclib_music_personal/playlist/track:1x"])
    assert.equal(isTrackNode({ id }), false, id);
  assert.equal(isTrackNode(null), false);
  const { containers, tracks } = splitTracks([{ id: "musiclib_album:A/B" }, { id: "musiclib_album:A/B/track:1" }, { id: "musiclib_track:2" }]);
  assert.deepEqual(containers.map((n) => n.id), ["musiclib_album:A/B"]);
  assert.equal(tracks, 2);
});

test("library containers are browsed; playlist categories and the library root are not", () => {
  for (const id of ["musiclib_music_album", "musiclib_album:A/B", "musiclib_random", "musiclib_folder:Bench"])
    assert.equal(isBrowsedLibraryNode(id), true, id);
  for (const id of ["musiclib_root", "musiclib_music_personal", "musiclib_music_shared/playlist/7", "mediaserver_root", "inetradio_sc", null])
    assert.equal(isBrowsedLibraryNode(id), false, String(id));
});
