// The audio tree CGI's replies, read as the CGI writes them (no DOM here, so Node's test runner
// checks these functions too):
//   node arrays of "gettreenode" (root tree, child nodes, library listings): [node, ...];
//     [] or [[]] = no children;
//   refresh replies (playlists, iPod, media servers): {"items": [...] or null, "success": true};
//   success envelope ("avoid_timeout", "rerandom100"): {"success": true};
//   error envelope: {"success": false, "errinfo": {"sec", "key", "line"}}, possibly with the nodes
//     the root tree built before the error under "items";
//   a null value prints as [] at the top level.

const isNode = (value) => value !== null && typeof value === "object" && !Array.isArray(value);

// Tree nodes of a JSON value that should be a node list; anything else (null, a nested empty array
// for an empty container, stray values) counts as no node.
export function nodesOf(value) {
  return Array.isArray(value) ? value.filter(isNode) : [];
}

// Classifies a reply body:
//   {kind: "nodes", nodes}                 a node array
//   {kind: "success", items}               a success envelope; items = its "items" as nodes
//   {kind: "error", errinfo, items}        an error envelope
//   {kind: "invalid", text}                not JSON, or JSON of another shape
export function parseReply(text) {
  let value;
  try {
    value = JSON.parse(text);
  } catch {
    return { kind: "invalid", text: String(text).slice(0, 200) };
  }
  if (value === null || Array.isArray(value)) return { kind: "nodes", nodes: nodesOf(value) };
  if (!isNode(value)) return { kind: "invalid", text: String(text).slice(0, 200) };
  if (value.success === false) {
    const info = isNode(value.errinfo) ? value.errinfo : {};
    return {
      kind: "error",
      errinfo: { sec: String(info.sec ?? ""), key: String(info.key ?? ""), line: info.line ?? null },
      items: nodesOf(value.items),
    };
  }
  if (value.success === true) return { kind: "success", items: nodesOf(value.items) };
  return { kind: "invalid", text: String(text).slice(0, 200) };
}

// The server HTML-encodes node texts (WebUtils::EncodeHtml: & < > " '). Decodes the entities once,
// for display as text (textContent), never through markup. Unknown entities stay as they are.
const NAMED = { amp: "&", lt: "<", gt: ">", quot: '"', apos: "'", nbsp: "\u00a0" };
export function decodeEntities(text) {
  return String(text ?? "").replace(/&(#x[0-9a-fA-F]{1,6}|#[0-9]{1,7}|[a-zA-Z]{2,8});/g, (whole, body) => {
    if (body[0] === "#") {
      const code = body[1] === "x" || body[1] === "X" ? parseInt(body.slice(2), 16) : parseInt(body.slice(1), 10);
      const valid = code > 0 && code <= 0x10ffff && !(code >= 0xd800 && code <= 0xdfff);
      return valid ? String.fromCodePoint(code) : whole;
    }
    return Object.hasOwn(NAMED, body) ? NAMED[body] : whole;
  });
}

// UI language codes and their language tags, as the CGI maps Accept-Language (platform/README.md,
// "Requests, users and permissions"), for when the server cannot say: the first tag that maps, by
// descending q-value, then by order.
const TAGS = [
  ["enu", ["en"]], ["ger", ["de"]], ["fre", ["fr"]], ["ita", ["it"]], ["spn", ["es"]], ["jpn", ["ja"]],
  ["dan", ["da"]], ["nor", ["nb", "nn", "no"]], ["sve", ["sv"]], ["nld", ["nl"]], ["rus", ["ru"]],
  ["plk", ["pl"]], ["ptb", ["pt-br"]], ["ptg", ["pt"]], ["hun", ["hu"]], ["trk", ["tr"]], ["csy", ["cs"]],
  ["chs", ["zh-cn", "zh-sg", "zh-hans", "zh"]], ["cht", ["zh-tw", "zh-hk", "zh-hant"]], ["krn", ["ko"]],
  ["tha", ["th"]],
];
function codeOfTag(tag) {
  const lower = String(tag).trim().toLowerCase();
  let best = null;
  let bestLength = 0;
  for (const [code, tags] of TAGS)
    for (const known of tags) {
      const matches = lower === known || lower.startsWith(known + "-") || (!known.includes("-") && lower.split("-")[0] === known);
      if (matches && known.length > bestLength) {
        best = code;
        bestLength = known.length;
      }
    }
  return best;
}
export function languageFromTags(tags) {
  for (const tag of tags || []) {
    const code = codeOfTag(tag);
    if (code) return code;
  }
  return "enu";
}

// Where a node's icon may come from: an image under the application's image folder, relative to
// the web root. Anything else (a scheme, "..", another folder) is not shown.
export function safeIcon(icon) {
  if (typeof icon !== "string") return null;
  if (!/^3rdparty\/Harmona\/images\/[A-Za-z0-9_.\/-]+\.(png|gif)$/.test(icon)) return null;
  return icon.split("/").includes("..") ? null : icon;
}

// The buttons among the nodes (refresh, new playlist and new radio buttons) and what their click sends.
export const REFRESH_TARGETS = {
  musiclib_music_personal_refresh: "personal",
  musiclib_music_shared_refresh: "shared",
  ipod_refresh: "ipod",
  mediaserver_refresh: "mediaserver",
};
export const BUTTON_IDS = new Set([
  ...Object.keys(REFRESH_TARGETS),
  "musiclib_music_personal_new",
  "musiclib_music_shared_new",
  "inetradio_new",
]);

// A node whose children the page asks for with "gettreenode" when it is opened: a node that says it
// is not a leaf, or a music library category or container (the CGI writes those as leaves, but the
// library is browsed below them with "gettreenode"). Playlists, smart playlists and buttons are never opened.
export function isLazyContainer(node) {
  if (!isNode(node) || Array.isArray(node.children)) return false;
  const id = typeof node.id === "string" ? node.id : "";
  if (BUTTON_IDS.has(id)) return false;
  if (node.leaf === false) return true;
  if (!id.startsWith("musiclib_") || id === "musiclib_root") return false;
  if (/^musiclib_music_(personal|shared)\/(playlist|smart)\//.test(id)) return false;
  return id !== "musiclib_music_personal" && id !== "musiclib_music_shared";
}
