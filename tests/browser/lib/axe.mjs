// axe-core on a page: whatever it finds is a failure.

import axe from "axe-core";
import assert from "node:assert/strict";

// WCAG 2.2 to level AA and axe's own good practice.
const TAGS = ["wcag2a", "wcag2aa", "wcag21a", "wcag21aa", "wcag22aa", "best-practice"];

export async function checkAccessibility(page) {
    await page.evaluate(() => Promise.all(document.getAnimations().map((one) => one.finished.catch(() => {}))));
    if (!(await page.evaluate(() => "axe" in window))) {
        await page.evaluate(axe.source);
    }
    const {violations, passes} = await page.evaluate(
        (values) => window.axe.run(document, {runOnly: {type: "tag", values}, resultTypes: ["violations"]}), TAGS);
    // A page on which nothing could be looked at proves nothing.
    assert.ok(passes.length > 5, `axe looked at next to nothing: ${passes.map((rule) => rule.id)}`);
    const found = violations.map((rule) => `${rule.id} (${rule.impact}): ${rule.help}\n` +
        rule.nodes.map((node) => `    ${node.target.join(" ")}: ${node.failureSummary?.replaceAll("\n", " ")}`).join("\n"));
    assert.equal(found.length, 0, `axe finds at ${page.url()}:\n  ${found.join("\n  ")}`);
}
