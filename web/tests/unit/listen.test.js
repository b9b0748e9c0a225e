// The listing pane's pure helpers: which tree nodes it asks library.cgi for, and how durations show.
import { test } from "node:test";
import assert from "node:assert/strict";
import { isListable, formatDuration } from "../../site/ui/listen.js";

test("library containers, playlists, smart playlists, random-100 and media servers are listed; categories and buttons are not", () => {
  for (const id of ["musiclib_music_album", "musiclib_album:A/B", "musiclib_random", "musiclib_folder:Bench",
    "musiclib_music_personal/playlist/Road Trip", "musiclib_music_shared/playlist/7", "mediaserver_http://192.0.2.1:8200/ctl",
    "musiclib_music_personal/smart/Jazz Only", "musiclib_music_shared/smart/Everything Electronic"])
    assert.equal(isListable(id), true, id);
  for (const id of ["musiclib_root", "musiclib_music_personal", "musiclib_music_shared", "musiclib_music_personal_refresh",
    "musiclib_music_personal_new", "musiclib_music_shared_new", "mediaserver_root", "mediaserver_refresh", "inetradio_root", "ipod_root", "", null, 7])
    assert.equal(isListable(id), false, String(id));
});

test("durations show as minutes and seconds; unknown ones as nothing", () => {
  assert.equal(formatDuration(0), "0:00");
  assert.equal(formatDuration(1), "0:01");
  assert.equal(formatDuration(61.9), "1:01");
  assert.equal(formatDuration(3600), "60:00");
  assert.equal(formatDuration(-1), "");
  assert.equal(formatDuration(NaN), "");
  assert.equal(formatDuration(undefined), "");
});
