// Cross-site request forgery through a real browser: a page of another site, open in the same
// browser as the logged-in tree, makes the browser redraw the user's random playlist and start a
// media server search, by a link (a GET navigation) and by a form that submits itself (a POST),
// the two ways that carry the user's login to the CGI. The CGI must refuse them itself (its own
// 401, not the web server's login challenge), and the playlist file must stay as it was, while
// the tree page's own request still draws.
import { test, before, after } from "node:test";
import assert from "node:assert/strict";
import { existsSync, readFileSync, statSync } from "node:fs";
import { createServer } from "node:http";
import { launch, close, openTree, baseURL } from "./harness.js";

// The other site: a web server of its own on loopback, under a host name that only this browser
// resolves (to 127.0.0.1), so that the browser sees another site than the tree's 127.0.0.1:8080.
const ELSEWHERE_HOST = "elsewhere.test";
const CGI = new URL("webapi/audiotree.cgi", baseURL).href;

// The hostile page for one try: ?method=GET|POST&query=<CGI parameters>.
function attackPage(url) {
  const { searchParams } = new URL(url, "http://x/");
  const method = searchParams.get("method") ?? "GET";
  const query = searchParams.get("query") ?? "";
  if (method === "GET") {
    return `<!doctype html><title>elsewhere</title><script>
      location.href = ${JSON.stringify(`${CGI}?${query}`)};
    </script>`;
  }
  const fields = [...new URLSearchParams(query)]
    .map(([name, value]) => `<input type="hidden" name="${name}" value="${value}">`).join("");
  return `<!doctype html><title>elsewhere</title>
    <form method="POST" action=${JSON.stringify(CGI)}>${fields}</form>
    <script>document.forms[0].submit();</script>`;
}

let browser;
let elsewhere;
let elsewhereURL;
before(async () => {
  elsewhere = createServer((request, response) => {
    response.writeHead(200, { "Content-Type": "text/html; charset=utf-8" });
    response.end(attackPage(request.url));
  });
  await new Promise((listening) => elsewhere.listen(0, "127.0.0.1", listening));
  elsewhereURL = `http://${ELSEWHERE_HOST}:${elsewhere.address().port}/`;
  browser = await launch([`--host-resolver-rules=MAP ${ELSEWHERE_HOST} 127.0.0.1`]);
});
after(async () => {
  await close(browser);
  await new Promise((closed) => elsewhere?.close(closed));
});

const snapshot = (file) => (existsSync(file) ? { text: readFileSync(file, "utf8"), mtimeMs: statSync(file).mtimeMs } : null);

// Opens the hostile page for one try in the tree's browser context (same login) and returns what
// the CGI answered the navigation it caused.
async function attack(context, method, query) {
  const page = await context.newPage();
  const answered = page.waitForResponse((response) => response.url().startsWith(CGI), { timeout: 20000 });
  await page.goto(`${elsewhereURL}?${new URLSearchParams({ method, query })}`);
  const response = await answered;
  const request = response.request();
  const answer = {
    method, query, status: response.status(),
    challenge: (await response.allHeaders())["www-authenticate"] ?? null,
    site: (await request.allHeaders())["sec-fetch-site"] ?? null,
    type: (await response.allHeaders())["content-type"] ?? null,
  };
  await page.close();
  return answer;
}

test("a page of another site cannot redraw the random playlist or start a media server search", async () => {
  const tree = await openTree(browser, "demo");
  const file = "/tmp/==DynaRandom100==.demo";
  // A playlist to protect: drawn by the tree page itself.
  await tree.locator("#rerandom").click();
  await tree.waitForSelector("body[data-rerandom='1']");
  const before = snapshot(file);
  assert.ok(before, "the tree page drew no random playlist");

  for (const method of ["GET", "POST"]) {
    for (const query of ["action=rerandom100", "action=refresh&target=mediaserver"]) {
      const answer = await attack(tree.context(), method, query);
      // The browser sent it as a cross-site request with the user's login: the web server let it
      // through (no login challenge), and the CGI refused it with its bare 401 (no reply body,
      // so no content type).
      assert.equal(answer.site, "cross-site", JSON.stringify(answer));
      assert.equal(answer.challenge, null, JSON.stringify(answer));
      assert.equal(answer.status, 401, JSON.stringify(answer));
      assert.equal(answer.type, null, JSON.stringify(answer));
    }
  }
  assert.deepEqual(snapshot(file), before, "the random playlist changed");

  // The tree page's own request still draws (so the file could have changed above).
  await tree.locator("#rerandom").click();
  await tree.waitForSelector("body[data-rerandom='2']");
  assert.notDeepEqual(snapshot(file), before);
  assert.deepEqual(tree.problems, []);
});
