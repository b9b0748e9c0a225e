// The page's language: the user's own choice, else users.conf's, else the browser's; chosen by the
// user from the page (kept in the user's preference folder; the tree's own nodes follow, users.conf
// stays the administrator's); bad input refused with a clear 4xx that changes nothing. Dark mode
// follows the system's preference.
import { test, before, after } from "node:test";
import assert from "node:assert/strict";
import { existsSync, readFileSync, rmSync } from "node:fs";
import { launch, close, openTree, item, screenshot, baseURL, password } from "./harness.js";
import { LABELS } from "../../site/ui/labels.js";

const USERS = "/var/packages/Harmona/etc/users.conf";
const CHOICE = "/usr/vanu/etc/preference/guest/language";
const API = new URL("webapi/library.cgi", baseURL).href;
const basic = (user) => "Basic " + Buffer.from(`${user}:${password}`).toString("base64");

let browser;
let users; // users.conf as the system started with it
before(async () => {
  browser = await launch();
  users = readFileSync(USERS, "utf8");
  rmSync(CHOICE, { force: true });
});
after(async () => {
  rmSync(CHOICE, { force: true });
  await close(browser);
});

// The page's own words in its language: the player's, the list's headers, the picker's.
async function pageWords(page) {
  return page.evaluate(() => ({
    lang: document.documentElement.lang,
    language: document.body.dataset.language,
    playAll: document.getElementById("play-all").textContent,
    next: document.getElementById("next").textContent,
    tree: document.getElementById("tree").getAttribute("aria-label"),
    picker: document.getElementById("language-label").textContent,
    header: document.querySelector("#tracks [role=columnheader].title")?.textContent ?? "",
  }));
}
function expectWords(words, code, lang) {
  const labels = LABELS[code];
  assert.equal(words.lang, lang);
  assert.equal(words.language, code);
  assert.equal(words.playAll, labels.playAll);
  assert.equal(words.next, labels.next);
  assert.equal(words.tree, labels.tree);
  assert.equal(words.picker, labels.language);
  assert.equal(words.header, labels.colTitle);
}

test("users.conf's language comes before the browser's: hans reads German in a French browser", async () => {
  const page = await openTree(browser, "hans", { locale: "fr-FR" });
  expectWords(await pageWords(page), "ger", "de");
  await page.waitForSelector("#language[data-ready=true]");
  assert.equal(await page.locator("#language").inputValue(), "def", "no choice of hans's own");
  assert.deepEqual(page.problems, []);
});

test("without a language in users.conf the browser's language counts, player words included", async () => {
  // (Every language's words are checked without a browser: tests/unit/languages.test.js.)
  for (const [locale, code, lang] of [["fr-FR", "fre", "fr"], ["zh-TW", "cht", "zh-Hant"], ["es-ES", "spn", "es"]]) {
    const page = await openTree(browser, "guest", { locale });
    expectWords(await pageWords(page), code, lang);
    await page.waitForSelector("#language[data-ready=true]");
    assert.equal(await page.locator("#language").inputValue(), "def", "the picker says: the browser's language");
    assert.deepEqual(page.problems, [], locale);
    await page.context().close();
  }
});

test("a user chooses their own language from the page; the tree's own nodes follow; without a choice the browser's language comes back", async () => {
  try {
    const page = await openTree(browser, "guest", { locale: "en-US" });
    const treeBefore = await item(page, "musiclib_root").locator(":scope > .row .label").textContent();
    await page.waitForSelector("#language[data-ready=true]");
    const options = await page.locator("#language option").evaluateAll((list) => list.map((o) => [o.value, o.textContent, o.lang]));
    assert.equal(options.length, 9);
    assert.deepEqual(options[0], ["def", LABELS.enu.languageAuto, ""]);
    assert.ok(options.some(([value, text, lang]) => value === "fre" && text === "Français" && lang === "fr"));

    await Promise.all([page.waitForEvent("load"), page.selectOption("#language", "ita")]);
    await page.waitForSelector("body[data-ready=true]");
    expectWords(await pageWords(page), "ita", "it");
    const treeNow = await item(page, "musiclib_root").locator(":scope > .row .label").textContent();
    assert.notEqual(treeNow, treeBefore, "the tree's own nodes in Italian too");
    assert.equal(readFileSync(CHOICE, "utf8"), "language=ita\n");
    assert.equal(readFileSync(USERS, "utf8"), users, "users.conf stays the administrator's");
    await screenshot(page, "language-italian");

    await page.waitForSelector("#language[data-ready=true]");
    assert.equal(await page.locator("#language").inputValue(), "ita");
    await Promise.all([page.waitForEvent("load"), page.selectOption("#language", "def")]);
    await page.waitForSelector("body[data-ready=true]");
    expectWords(await pageWords(page), "enu", "en");
    assert.equal(await item(page, "musiclib_root").locator(":scope > .row .label").textContent(), treeBefore);
    assert.equal(readFileSync(CHOICE, "utf8"), "language=def\n");
    assert.equal(readFileSync(USERS, "utf8"), users);
    assert.deepEqual(page.problems, []);
  } finally {
    rmSync(CHOICE, { force: true });
  }
});

test("a bad language, a GET, another site or no login changes nothing", async () => {
  const post = (body, headers = {}) => fetch(API, {
    method: "POST",
    headers: { Authorization: basic("guest"), "Content-Type": "application/x-www-form-urlencoded", ...headers },
    body: new URLSearchParams(body),
  });
  for (const language of ["", "xx", "dan", "ENU", "ger\n[guest]\npermission=29", "def ", "a".repeat(5000)]) {
    const response = await post({ action: "language", language });
    assert.equal(response.status, 400, JSON.stringify(language));
    const reply = await response.json();
    assert.equal(reply.success, false);
    assert.equal(reply.error, "request_invalid");
  }
  const asked = await fetch(`${API}?action=language&language=fre`, { headers: { Authorization: basic("guest") } });
  assert.equal(asked.status, 200);
  assert.deepEqual(await asked.json(), { success: true, language: "enu", tree: "enu", saved: "" });
  const crossSite = await post({ action: "language", language: "fre" }, { "Sec-Fetch-Site": "cross-site", Origin: "http://elsewhere.test" });
  assert.equal(crossSite.status, 401);
  const anonymous = await fetch(API, { method: "POST", body: new URLSearchParams({ action: "language", language: "fre" }) });
  assert.equal(anonymous.status, 401);
  assert.equal(readFileSync(USERS, "utf8"), users);
  assert.equal(existsSync(CHOICE), false);
});

test("dark mode follows the system's preference", async () => {
  const page = await openTree(browser, "demo");
  const colours = () => page.evaluate(() => {
    const body = getComputedStyle(document.body);
    const side = getComputedStyle(document.getElementById("side"));
    const button = getComputedStyle(document.getElementById("play"));
    return { page: body.backgroundColor, text: body.color, side: side.backgroundColor, button: button.color, scheme: getComputedStyle(document.documentElement).colorScheme };
  });
  await page.emulateMedia({ colorScheme: "light" });
  const light = await colours();
  assert.equal(light.page, "rgb(244, 246, 250)");
  assert.equal(light.text, "rgb(29, 36, 51)");
  await page.emulateMedia({ colorScheme: "dark" });
  const dark = await colours();
  assert.equal(dark.page, "rgb(20, 25, 34)");
  assert.equal(dark.text, "rgb(227, 232, 242)");
  assert.equal(dark.side, "rgb(28, 34, 48)");
  assert.equal(dark.button, "rgb(227, 232, 242)");
  await screenshot(page, "dark-mode");
  assert.deepEqual(page.problems, []);
});
