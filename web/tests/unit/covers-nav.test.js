// The cover art's and the navigation's pure parts: which nodes show albums as a grid, which cover
// paths are ever put into an image, the view a URL names and the URL of a view, and their words in
// every language of the page.
import { test } from "node:test";
import assert from "node:assert/strict";
import { isAlbumView, isArtistNode, checkedCover } from "../../site/ui/covers.js";
import { checkedView, viewOfSearch, searchOfView } from "../../site/ui/nav.js";
import { LABELS } from "../../site/ui/labels.js";
import { COVER_WORDS } from "../../site/ui/words/covers.js";
import { NAV_WORDS } from "../../site/ui/words/nav.js";

test("the album views and an album artist show albums as a grid; an album and other nodes do not", () => {
  for (const node of ["musiclib_music_album", "musiclib_music_latestalbum", "musiclib_artist:Zo%C3%AB"]) assert.equal(isAlbumView(node), true, node);
  for (const node of ["musiclib_artist:A/Live", "musiclib_album:A/Live", "musiclib_music_aa", "musiclib_music_all", "", undefined])
    assert.equal(isAlbumView(node), false, String(node));
  assert.equal(isArtistNode("musiclib_artist:A"), true);
  assert.equal(isArtistNode("musiclib_music_album"), false);
});

test("only library.cgi's cover paths become an image's address", () => {
  assert.equal(checkedCover("media/art/12.jpg"), "media/art/12.jpg");
  assert.equal(checkedCover("media/art/7.png"), "media/art/7.png");
  for (const bad of ["https://example.com/a.jpg", "media/art/1.gif", "/media/art/1.jpg", "media/art/1.jpg?x", "media/12.flac", null, 5, undefined])
    assert.equal(checkedCover(bad), null, String(bad));
});

test("a view goes into the URL with the page's other parameters and comes back from it", () => {
  const view = { trail: [{ node: "musiclib_music_aa", title: "Artists" }, { node: "musiclib_artist:A%20B", title: "A B" }] };
  const search = searchOfView("?keepalive=2", view);
  const params = new URLSearchParams(search);
  assert.equal(params.get("keepalive"), "2");
  assert.equal(params.get("view"), "musiclib_artist:A%20B");
  assert.equal(params.get("title"), "A B");
  assert.equal(params.get("from"), "musiclib_music_aa", "the tree node it was opened from");
  assert.deepEqual(viewOfSearch(search), { trail: [{ node: "musiclib_music_aa", title: "" }, { node: "musiclib_artist:A%20B", title: "A B" }] });
  const top = searchOfView("", { trail: [{ node: "musiclib_music_aa", title: "Artists" }] });
  assert.equal(new URLSearchParams(top).get("from"), null);
  assert.deepEqual(viewOfSearch(top), { trail: [{ node: "musiclib_music_aa", title: "Artists" }] });
  assert.deepEqual(viewOfSearch("?view=a&from=a"), { trail: [{ node: "a", title: "" }] }, "a node is not its own origin");
  const remote = searchOfView("", { trail: [{ node: "mediaserver_http://192.0.2.1/ctl", title: "Jazz", object: "64$1" }] });
  assert.deepEqual(viewOfSearch(remote), { trail: [{ node: "mediaserver_http://192.0.2.1/ctl", title: "Jazz", object: "64$1" }] });
  assert.equal(searchOfView("?view=x&title=y&keepalive=2", null), "?keepalive=2");
  assert.equal(searchOfView("?view=x", null), "");
  assert.equal(viewOfSearch("?keepalive=2"), null);
});

test("a view from the history or the URL is checked before it is used", () => {
  assert.equal(checkedView(null), null);
  assert.equal(checkedView({ trail: [] }), null);
  assert.equal(checkedView({ trail: [{ node: "" }] }), null);
  assert.equal(checkedView({ trail: [{ node: 5 }] }), null);
  assert.equal(checkedView({ trail: [{ node: "x".repeat(5000) }] }), null);
  assert.equal(checkedView({ trail: Array(65).fill({ node: "a" }) }), null);
  assert.deepEqual(checkedView({ trail: [{ node: "a", title: 3, object: 4 }] }), { trail: [{ node: "a", title: "" }] });
});

test("the cover art's and the navigation's words are in every language of the page", () => {
  for (const words of [COVER_WORDS, NAV_WORDS]) {
    const keys = Object.keys(words.enu).sort();
    for (const code of Object.keys(LABELS)) {
      assert.deepEqual(Object.keys(words[code] ?? {}).sort(), keys, code);
      for (const key of keys) {
        assert.equal(typeof words[code][key], "string", `${code}.${key}`);
        assert.notEqual(words[code][key], "", `${code}.${key}`);
        assert.equal(LABELS[code][key], words[code][key], `${code}.${key}`);
      }
    }
  }
  for (const code of Object.keys(LABELS)) assert.ok(COVER_WORDS[code].coverTrackCount.includes("{count}"), code);
});
