// The page's requests to webapi/library.cgi: one way to ask (GET) and one way to change (POST),
// each reply read the same way (failures.js's readApiReply). No DOM here, so Node's test runner
// checks these functions too.
//
// A reply is {kind: "ok", body}, {kind: "error", status, code, message, rule, errinfo},
// {kind: "http", status} (no library.cgi reply: a login page, a bare status), {kind: "offline"}
// (no answer at all) or {kind: "aborted"} (the caller's signal ended the request).
import { readApiReply } from "./failures.js";

export const LIBRARY_CGI = "webapi/library.cgi";

async function request(url, init, signal) {
  let response = null;
  let body = null;
  try {
    response = await fetch(url, { credentials: "same-origin", cache: "no-store", signal, ...init });
    body = await response.json();
  } catch {
    if (signal?.aborted) return { kind: "aborted" };
    if (!response) return { kind: "offline" };
    // A body that is not JSON: read by its status below.
  }
  return readApiReply(response.status, body);
}

// A question (action=list, search, albums, ...): `params` in the query string.
export function askLibrary(params, { signal } = {}) {
  return request(`${LIBRARY_CGI}?${new URLSearchParams(params)}`, {}, signal);
}

// A change (a playlist's, a station's, the user's language): `params` as a urlencoded POST.
export function tellLibrary(params) {
  return request(LIBRARY_CGI, { method: "POST", body: new URLSearchParams(params) });
}
