// axe-core (web/package.json) in a page of the browser tests: put into the page by the test only (the
// page never loads it), run over the whole document in the light scheme and, for the contrast of
// every text, in the dark one.
import assert from "node:assert/strict";
import { readFileSync } from "node:fs";
import { screenshot } from "./harness.js";

const AXE = readFileSync(new URL("../../node_modules/axe-core/axe.min.js", import.meta.url), "utf8");

// The serious and critical violations on the page as it is now, each with up to five of its elements.
async function violations(page, options) {
  if (!(await page.evaluate(() => typeof window.axe === "object"))) await page.evaluate(AXE);
  const found = await page.evaluate(async (runOptions) => {
    const result = await window.axe.run(document, runOptions);
    return result.violations.map((v) => ({ id: v.id, impact: v.impact, help: v.help,
      nodes: v.nodes.slice(0, 5).map((n) => `${n.target.join(" ")}: ${n.failureSummary}`) }));
  }, { resultTypes: ["violations"], ...options });
  return found.filter((v) => v.impact === "serious" || v.impact === "critical");
}

// Checks the view: every rule in the light scheme, the contrast of every text in the dark one; the
// page is left in the light scheme.
export async function expectAccessible(page, view) {
  for (const [scheme, options] of [["dark", { runOnly: { type: "rule", values: ["color-contrast"] } }], ["light", {}]]) {
    await page.emulateMedia({ colorScheme: scheme });
    const found = await violations(page, options);
    if (found.length > 0) await screenshot(page, `a11y-${view}-${scheme}`);
    assert.deepEqual(found, [], `${view} (${scheme}): ${JSON.stringify(found, null, 1)}`);
  }
}
