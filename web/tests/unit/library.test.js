// The page's requests to library.cgi, against a real HTTP server on loopback: what a question and
// a change send, and what each kind of answer (or none) reads as.
import { test, before, after } from "node:test";
import assert from "node:assert/strict";
import http from "node:http";
import { askLibrary, tellLibrary, LIBRARY_CGI } from "../../site/ui/library.js";

// What the server saw of each request, and what it answers next: [status, body text] or "hang"
// (headers never sent) or "stall" (headers sent, the body never ends).
const seen = [];
let answer = [200, "{}"];
let server;
let base;
const browserFetch = globalThis.fetch;

before(async () => {
  server = http.createServer((request, response) => {
    let body = "";
    request.on("data", (chunk) => { body += chunk; });
    request.on("end", () => {
      seen.push({ method: request.method, url: request.url, type: request.headers["content-type"], body });
      if (answer === "hang") return;
      if (answer === "stall") {
        response.writeHead(200, { "Content-Type": "application/json" });
        response.write("{\"success\": tr");
        return;
      }
      response.writeHead(answer[0], { "Content-Type": "application/json" });
      response.end(answer[1]);
    });
  });
  await new Promise((resolve) => server.listen(0, "127.0.0.1", resolve));
  base = `http://127.0.0.1:${server.address().port}/app/`;
  // A page's fetch resolves its relative URLs against the page; Node's has no page.
  globalThis.fetch = (url, init) => browserFetch(new URL(url, base), init);
});

after(() => {
  globalThis.fetch = browserFetch;
  server.closeAllConnections();
  server.close();
});

test("a question is a GET with its parameters in the query string, and its reply body comes back", async () => {
  answer = [200, JSON.stringify({ success: true, tracks: [{ title: "Road" }] })];
  seen.length = 0;
  const reply = await askLibrary({ action: "search", q: "road & rain" });
  assert.equal(reply.kind, "ok");
  assert.deepEqual(reply.body.tracks, [{ title: "Road" }]);
  assert.equal(seen.length, 1);
  assert.equal(seen[0].method, "GET");
  assert.equal(seen[0].url, `/app/${LIBRARY_CGI}?action=search&q=road+%26+rain`);
});

test("a change is a urlencoded POST with its parameters in the body and none in the URL", async () => {
  answer = [200, JSON.stringify({ success: true, node: "musiclib_music_personal/playlist/Road" })];
  seen.length = 0;
  const reply = await tellLibrary({ action: "plcreate", category: "personal", name: "Road & Rain" });
  assert.equal(reply.kind, "ok");
  assert.equal(reply.body.node, "musiclib_music_personal/playlist/Road");
  assert.equal(seen[0].method, "POST");
  assert.equal(seen[0].url, `/app/${LIBRARY_CGI}`);
  assert.match(seen[0].type, /^application\/x-www-form-urlencoded/);
  assert.equal(seen[0].body, "action=plcreate&category=personal&name=Road+%26+Rain");
});

test("a refusal keeps its code, its message and the rule it names", async () => {
  answer = [400, JSON.stringify({ success: false, error: "rule_invalid", rule: "limit", message: "bad limit", errinfo: { sec: "error", key: "Invalid parameter", line: 0 } })];
  const reply = await tellLibrary({ action: "smartsave" });
  assert.equal(reply.kind, "error");
  assert.equal(reply.status, 400);
  assert.equal(reply.code, "rule_invalid");
  assert.equal(reply.rule, "limit");
  assert.equal(reply.message, "bad limit");
  assert.equal(reply.errinfo.key, "Invalid parameter");
});

test("an answer that is not library.cgi's (a login page, an empty 502) is read by its status", async () => {
  answer = [502, ""];
  assert.deepEqual(await askLibrary({ action: "list", node: "musiclib_root" }), { kind: "http", status: 502 });
  answer = [401, "<html>login</html>"];
  assert.deepEqual(await askLibrary({ action: "list", node: "musiclib_root" }), { kind: "http", status: 401 });
  answer = [200, JSON.stringify({ tracks: [] })]; // no "success": not a reply to trust
  assert.deepEqual(await askLibrary({ action: "list", node: "musiclib_root" }), { kind: "http", status: 200 });
});

test("no server at all is offline, for a question and for a change", async () => {
  const closed = http.createServer();
  await new Promise((resolve) => closed.listen(0, "127.0.0.1", resolve));
  const port = closed.address().port;
  await new Promise((resolve) => closed.close(resolve));
  const fetchHere = globalThis.fetch;
  globalThis.fetch = (url, init) => browserFetch(new URL(url, `http://127.0.0.1:${port}/`), init);
  try {
    assert.deepEqual(await askLibrary({ action: "probe", service: "media" }), { kind: "offline" });
    assert.deepEqual(await tellLibrary({ action: "language", language: "fre" }), { kind: "offline" });
  } finally {
    globalThis.fetch = fetchHere;
  }
});

test("a question its caller gave up on reads as aborted, before the answer and in the middle of its body", async () => {
  for (const how of ["hang", "stall"]) {
    answer = how;
    const controller = new AbortController();
    const pending = askLibrary({ action: "list", node: "musiclib_album" }, { signal: controller.signal });
    for (let wait = 0; wait < 400 && !seen.some((r) => r.url.includes("musiclib_album")); wait += 1)
      await new Promise((resolve) => setTimeout(resolve, 5));
    assert.ok(seen.some((r) => r.url.includes("musiclib_album")), `${how}: the request reached the server`);
    await new Promise((resolve) => setTimeout(resolve, 20));
    controller.abort();
    assert.deepEqual(await pending, { kind: "aborted" }, how);
    seen.length = 0;
  }
});
