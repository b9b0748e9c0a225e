// Shared set-up of the browser tests: Debian's Chromium driven by playwright-core, logged in to the
// running system that scripts/system-inside started (HARMONA_URL, HARMONA_USER, HARMONA_PASSWORD).
import { chromium } from "playwright-core";
import { mkdirSync } from "node:fs";
import { join } from "node:path";

export const baseURL = process.env.HARMONA_URL ?? "http://127.0.0.1:8080/";
export const password = process.env.HARMONA_PASSWORD ?? "";
export const artifacts = process.env.HARMONA_ARTIFACTS ?? "build/artifacts";
mkdirSync(artifacts, { recursive: true });

// A fresh profile per browser: Playwright's launch() gives Chromium a new temporary --user-data-dir
// of its own (and refuses one in args), so none is passed here.
// `extraArgs` go to Chromium after the usual ones.
export async function launch(extraArgs = []) {
  return chromium.launch({
    executablePath: process.env.HARMONA_CHROMIUM ?? "/usr/bin/chromium",
    headless: true,
    args: [
      "--headless", "--no-sandbox", "--disable-gpu", "--disable-quic", "--no-first-run",
      "--disable-background-networking", "--disable-component-update", "--disable-sync",
      ...extraArgs,
    ],
  });
}

export async function close(browser) {
  await browser?.close();
}

// A logged-in page of `user` with the tree loaded. `query` is appended to the URL; `device`: more
// options of the browser context (a phone's viewport, touch).
export async function openTree(browser, user = "demo", { query = "", locale = "en-US", device = {} } = {}) {
  const context = await browser.newContext({
    baseURL,
    locale,
    httpCredentials: { username: user, password },
    viewport: { width: 1000, height: 760 },
    ...device,
  });
  const page = await context.newPage();
  const problems = [];
  page.on("pageerror", (error) => problems.push(`page error: ${error.message}`));
  page.on("console", (message) => {
    if (message.type() === "error") problems.push(`console: ${message.text()}`);
  });
  page.problems = problems;
  await page.goto(query ? `./${query}` : "./");
  await page.waitForSelector("body[data-ready=true]", { timeout: 20000 });
  return page;
}

export const item = (page, id) => page.locator(`li[role=treeitem][data-id="${id.replace(/["\\]/g, "\\$&")}"]`);
export const childIds = (page, id) =>
  item(page, id).locator(":scope > ul > li[role=treeitem]").evaluateAll((lis) => lis.map((li) => li.dataset.id));
export const rootIds = (page) =>
  page.locator("#tree > li[role=treeitem]").evaluateAll((lis) => lis.map((li) => li.dataset.id));

export async function screenshot(page, name) {
  await page.screenshot({ path: join(artifacts, `${name}.png`), fullPage: true });
}
