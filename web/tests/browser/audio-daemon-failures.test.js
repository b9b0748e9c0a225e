// A stopped and a hung audio daemon on the running system: a media server search says which and
// keeps the servers it listed; a media server's node says so too.
import { test, before, after } from "node:test";
import assert from "node:assert/strict";
import { stopService, startService, hangService } from "./services.js";
import { launch, close, openTree, item, childIds, screenshot } from "./harness.js";
import { select, expectFailedPane, expectStatus, noPageErrors, findLocalServer } from "./failure-checks.js";

let browser;
before(async () => { browser = await launch(); });
after(async () => { await close(browser); });

test("a stopped audio daemon: searching for media servers says so and keeps the list; the server's node says so too", async () => {
  const page = await openTree(browser, "demo");
  const server = await findLocalServer(page);
  await stopService("vanuaudiod");
  try {
    await item(page, "mediaserver_refresh").locator(".row").click();
    await expectStatus(page, "audio_daemon_down");
    assert.notEqual(await page.locator("#status").textContent(), "Updated.");
    assert.ok((await childIds(page, "mediaserver_root")).includes(server));
    await select(page, server);
    await expectFailedPane(page, "audio_daemon_down");
    await screenshot(page, "failures-audio-daemon-stopped");
  } finally {
    await startService("vanuaudiod");
  }
  assert.equal(await findLocalServer(page), server);
  assert.equal(await page.locator("#status").textContent(), "Updated.");
  noPageErrors(page);
});

test("a hung audio daemon: searching for media servers says it did not answer in time and keeps the list", async () => {
  const page = await openTree(browser, "demo");
  const server = await findLocalServer(page);
  const resume = hangService("vanuaudiod");
  try {
    await item(page, "mediaserver_refresh").locator(".row").click();
    await expectStatus(page, "audio_daemon_timeout");
    assert.ok((await childIds(page, "mediaserver_root")).includes(server));
    await select(page, server);
    await expectFailedPane(page, "audio_daemon_timeout");
  } finally {
    resume();
  }
  assert.equal(await findLocalServer(page), server);
  noPageErrors(page);
});
