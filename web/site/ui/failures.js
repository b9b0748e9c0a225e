// What went wrong with a request, as one kind that the page words in the user's language
// (words/failures.js), and the pieces of the page that follow from it. No DOM here, so Node's test
// runner checks these functions too.
//
// library.cgi's error replies carry a stable "error" code. The tree CGI's replies carry none; a
// bare HTTP status and a failed connection are read here too.

// The codes the page has words for.
export const FAILURE_CODES = [
  "media_server_down", "media_server_timeout", "media_server_invalid", "audio_daemon_down", "audio_daemon_timeout",
  "login_expired", "node_gone", "request_refused", "request_invalid", "library_unavailable", "too_large",
  "playlist_unreadable", "offline",
];

// The failure code of a reply as app.js and listen.js keep it ({kind: "http", status}, {kind:
// "offline"}, {kind: "error", code?, errinfo}), or null when the page cannot name the kind (the
// tree CGI's own error texts are shown then).
export function failureCode(reply) {
  if (!reply || typeof reply !== "object") return null;
  if (reply.kind === "offline") return "offline";
  if (typeof reply.code === "string" && FAILURE_CODES.includes(reply.code)) return reply.code;
  const status = reply.status;
  if (status === 401) return "login_expired";
  if (reply.kind === "http") {
    if (status === 403) return "request_refused";
    if (status === 404) return "node_gone";
  }
  return null;
}

// A library.cgi reply body and status as a reply of the page's kinds.
export function readApiReply(status, body) {
  if (status >= 200 && status < 300 && body && body.success === true) return { kind: "ok", body };
  if (body && typeof body === "object" && body.success === false) {
    const info = body.errinfo && typeof body.errinfo === "object" ? body.errinfo : {};
    return {
      kind: "error",
      status,
      code: typeof body.error === "string" ? body.error : undefined,
      message: typeof body.message === "string" ? body.message : undefined,
      rule: typeof body.rule === "string" ? body.rule : undefined,
      errinfo: { sec: String(info.sec ?? ""), key: String(info.key ?? ""), line: info.line ?? null },
    };
  }
  return { kind: "http", status };
}

// The tree keeps containers only. Our media server names a track "track:N" in All Music and
// "<container id>/track:N" everywhere else (a container's id never ends so: ":" inside a name is
// percent-encoded), and the tree CGI gives a browsed object the id "musiclib_<object id>".
const TRACK_ID = /^musiclib_(?:.*\/)?track:[0-9]+$/;
export function isTrackNode(node) {
  return node !== null && typeof node === "object" && typeof node.id === "string" && TRACK_ID.test(node.id);
}
// A library container whose children the tree asks for on the local media server (not a category
// of playlists, nor a playlist): its empty reply may stand for a failed browse.
export function isBrowsedLibraryNode(id) {
  if (typeof id !== "string" || !id.startsWith("musiclib_") || id === "musiclib_root") return false;
  return !/^musiclib_music_(personal|shared)/.test(id);
}
// Splits a node list into the containers the tree shows and the number of tracks it leaves out.
export function splitTracks(nodes) {
  const containers = [];
  let tracks = 0;
  for (const node of nodes) {
    if (isTrackNode(node)) tracks += 1;
    else containers.push(node);
  }
  return { containers, tracks };
}
