// Cross-site request forgery through a real browser: a page of another site, open in the same
// browser as the logged-in tree, tries to redraw the user's random playlist and to start a media
// server search. The browser attaches the user's login to those requests; the CGI must refuse them
// (its own 401, not the web server's login challenge), and the playlist file must stay as it was,
// while the tree page's own request still draws.
import { test, before, after } from "node:test";
import assert from "node:assert/strict";
import { existsSync, readFileSync, statSync } from "node:fs";
import { createServer } from "node:http";
import { launch, close, openTree, baseURL } from "./harness.js";

// The other site: a web server of its own on loopback, under a host name that only this browser
// resolves (to 127.0.0.1), so that the browser sees another site than the tree's 127.0.0.1:8080.
const ELSEWHERE_HOST = "elsewhere.test";
const CGI = new URL("webapi/audiotree.cgi", baseURL).href;

let browser;
let elsewhere;
let elsewhereURL;
before(async () => {
  elsewhere = createServer((request, response) => {
    response.writeHead(200, { "Content-Type": "text/html; charset=utf-8" });
    response.end(attackPage);
  });
  await new Promise((listening) => elsewhere.listen(0, "127.0.0.1", listening));
  elsewhereURL = `http://${ELSEWHERE_HOST}:${elsewhere.address().port}/`;
  browser = await launch([`--host-resolver-rules=MAP ${ELSEWHERE_HOST} 127.0.0.1`]);
});
after(async () => {
  await close(browser);
  await new Promise((closed) => elsewhere?.close(closed));
});

// What a hostile page does: a plain GET (as an <img> or a link would), a no-cors fetch that sends
// the login, and a form-encoded POST, each for the two actions.
const attackPage = `<!doctype html><title>elsewhere</title><body><script>
  const cgi = ${JSON.stringify(CGI)};
  const tries = [];
  for (const query of ["action=rerandom100", "action=refresh&target=mediaserver"]) {
    const image = new Image();
    tries.push(new Promise((done) => { image.onload = image.onerror = done; }));
    image.src = cgi + "?" + query + "&via=img";
    tries.push(fetch(cgi + "?" + query + "&via=get", { mode: "no-cors", credentials: "include" }).catch(() => {}));
    tries.push(fetch(cgi + "?via=post&what=" + encodeURIComponent(query), {
      method: "POST", mode: "no-cors", credentials: "include",
      headers: { "Content-Type": "application/x-www-form-urlencoded" }, body: query,
    }).catch(() => {}));
  }
  Promise.all(tries).then(() => { document.body.dataset.done = "1"; });
</script></body>`;

const snapshot = (file) => (existsSync(file) ? { text: readFileSync(file, "utf8"), mtimeMs: statSync(file).mtimeMs } : null);

test("a page of another site cannot redraw the random playlist or start a media server search", async () => {
  const tree = await openTree(browser, "demo");
  const file = "/tmp/==DynaRandom100==.demo";
  // A playlist to protect: drawn by the tree page itself.
  await tree.locator("#rerandom").click();
  await tree.waitForSelector("body[data-rerandom='1']");
  const before = snapshot(file);
  assert.ok(before, "the tree page drew no random playlist");

  // The hostile page, in the same browser context (same login), from another site.
  const attacker = await tree.context().newPage();
  const answers = [];
  attacker.on("response", async (response) => {
    if (!response.url().startsWith(CGI)) return;
    const request = response.request();
    answers.push({
      url: response.url(), method: request.method(), status: response.status(),
      challenge: (await response.allHeaders())["www-authenticate"] ?? null,
      body: await response.text().catch(() => ""),
    });
  });
  const failed = [];
  attacker.on("requestfailed", (request) => failed.push(`${request.url()}: ${request.failure()?.errorText}`));
  await attacker.goto(elsewhereURL);
  await attacker.waitForSelector("body[data-done='1']", { state: "attached", timeout: 20000 });

  // Every try that the page may see the answer of reached the CGI with the login and was refused
  // there: 401 without the web server's login challenge (which would mean lighttpd, not the CGI,
  // said no) and without a body. The browser hides the answers to the <img> tries from the page
  // (they are no images); the playlist file below shows what they did.
  const final = answers.filter((a) => a.challenge === null);
  for (const via of ["get", "post"]) {
    for (const action of ["rerandom100", "mediaserver"]) {
      const tries = final.filter((a) => a.url.includes(`via=${via}`) && a.url.includes(action));
      assert.ok(tries.length > 0, `no answer for ${action} via ${via}: ${JSON.stringify(answers)} ${failed.join("; ")}`);
    }
  }
  for (const answer of final) {
    assert.equal(answer.status, 401, JSON.stringify(answer));
    assert.equal(answer.body, "", JSON.stringify(answer));
  }
  assert.deepEqual(snapshot(file), before, "the random playlist changed");

  // The tree page's own request still draws (so the file could have changed above).
  await tree.locator("#rerandom").click();
  await tree.waitForSelector("body[data-rerandom='2']");
  assert.notDeepEqual(snapshot(file), before);
  assert.deepEqual(tree.problems, []);
});
