// Unit tests of the page's reply reading (web/site/ui/reply.js), under Node's test runner.
import { test } from "node:test";
import assert from "node:assert/strict";
import { parseReply, decodeEntities, languageFromTags, safeIcon, isLazyContainer, nodesOf } from "../../site/ui/reply.js";

const node = (id, extra = {}) => ({ id, text: id, qtip: id, leaf: true, expanded: false, ...extra });

test("a node array is read as nodes; a null reply prints as [] and is no node", () => {
  assert.deepEqual(parseReply(JSON.stringify([node("a"), node("b")])).nodes.map((n) => n.id), ["a", "b"]);
  assert.deepEqual(parseReply("[]"), { kind: "nodes", nodes: [] });
  assert.deepEqual(parseReply("null"), { kind: "nodes", nodes: [] });
});

test("an empty container's [[]] means no children", () => {
  assert.deepEqual(parseReply("[[]]\n"), { kind: "nodes", nodes: [] });
});

test("a refresh reply gives its items; null items are an empty list", () => {
  const reply = parseReply(JSON.stringify({ items: [node("x")], success: true }));
  assert.equal(reply.kind, "success");
  assert.deepEqual(reply.items.map((n) => n.id), ["x"]);
  assert.deepEqual(parseReply('{"items":null,"success":true}'), { kind: "success", items: [] });
  assert.deepEqual(parseReply('{"success":true}'), { kind: "success", items: [] });
});

test("the error envelope gives section, key and line, and the nodes built before the error", () => {
  const text = JSON.stringify({
    items: [node("musiclib_root")], success: false, errinfo: { sec: "common", key: "error_system", line: 364 },
  });
  const reply = parseReply(text);
  assert.equal(reply.kind, "error");
  assert.deepEqual(reply.errinfo, { sec: "common", key: "error_system", line: 364 });
  assert.deepEqual(reply.items.map((n) => n.id), ["musiclib_root"]);
  assert.deepEqual(parseReply('{"success":false}').errinfo, { sec: "", key: "", line: null });
});

test("bodies that are not the CGI's replies are invalid", () => {
  assert.equal(parseReply("").kind, "invalid");
  assert.equal(parseReply("<html>").kind, "invalid");
  assert.equal(parseReply('"text"').kind, "invalid");
  assert.equal(parseReply('{"other":1}').kind, "invalid");
});

test("entities of WebUtils::EncodeHtml are decoded once, others stay", () => {
  assert.equal(decodeEntities("Rock &amp; Roll &lt;Live&gt; &quot;x&quot; &#39;y&#39;"), `Rock & Roll <Live> "x" 'y'`);
  assert.equal(decodeEntities("&amp;lt;b&amp;gt;"), "&lt;b&gt;");
  assert.equal(decodeEntities("&#x1F3B5; &#233; &bogus; &#0; &#xD800;"), "\u{1F3B5} é &bogus; &#0; &#xD800;");
  assert.equal(decodeEntities(undefined), "");
});

test("the language falls back to the tags the CGI maps", () => {
  assert.equal(languageFromTags(["de-DE", "en"]), "ger");
  assert.equal(languageFromTags(["zh-TW"]), "cht");
  assert.equal(languageFromTags(["zh-Hant-HK"]), "cht");
  assert.equal(languageFromTags(["zh"]), "chs");
  assert.equal(languageFromTags(["pt-BR"]), "ptb");
  assert.equal(languageFromTags(["pt-PT"]), "ptg");
  assert.equal(languageFromTags(["xx", "FR-ca"]), "fre");
  assert.equal(languageFromTags(["xx"]), "enu");
  assert.equal(languageFromTags([]), "enu");
});

test("only images under the application's image folder are shown as icons", () => {
  assert.equal(safeIcon("3rdparty/Harmona/images/files_class/icon_container.png"), "3rdparty/Harmona/images/files_class/icon_container.png");
  assert.equal(safeIcon("3rdparty/Harmona/images/../../webapi/x.png"), null);
  assert.equal(safeIcon("javascript:alert(1)"), null);
  assert.equal(safeIcon("http://example.invalid/a.png"), null);
  assert.equal(safeIcon("/3rdparty/Harmona/images/s.gif"), null);
  assert.equal(safeIcon(42), null);
});

test("library categories and containers open lazily; playlists, buttons and inline parents do not", () => {
  assert.equal(isLazyContainer(node("musiclib_music_album")), true);
  assert.equal(isLazyContainer(node("musiclib_album/17")), true);
  assert.equal(isLazyContainer(node("musiclib_music_personal/playlist/Road Trip")), false);
  assert.equal(isLazyContainer(node("musiclib_music_shared/smart/Jazz")), false);
  assert.equal(isLazyContainer(node("musiclib_music_personal_refresh")), false);
  assert.equal(isLazyContainer(node("musiclib_music_shared_new")), false);
  assert.equal(isLazyContainer(node("inetradio_sc")), false);
  assert.equal(isLazyContainer(node("x_y", { leaf: false })), true);
  assert.equal(isLazyContainer(node("musiclib_root", { leaf: false, children: [] })), false);
  assert.deepEqual(nodesOf([[], node("a"), null, 3]).map((n) => n.id), ["a"]);
});
