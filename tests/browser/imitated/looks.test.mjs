// Every view in every state, light and dark, wide and narrow: axe-core finds nothing, nothing lies beyond the edge, a
// picture of it is kept.

import assert from "node:assert/strict";

import {DARK, imitated, NARROW} from "./page.mjs";
import {STATES} from "./states.mjs";

const LOOKS = [
    ["wide-light", {}],
    ["wide-dark", DARK],
    ["narrow-light", NARROW],
    ["narrow-dark", {...NARROW, ...DARK}],
];

// What a table of its own scrolls in may be wider; the page may not.
async function nothingBeyond(page) {
    const {shown, whole} = await page.evaluate(() => ({
        shown: document.documentElement.clientWidth, whole: document.documentElement.scrollWidth,
    }));
    assert.ok(whole <= shown, `the page is ${whole} px wide in a window of ${shown}`);
    const cut = await page.evaluate(() => [...document.querySelectorAll("main, [role=dialog]")]
        .filter((part) => part.scrollWidth > part.clientWidth + 1).map((part) => `${part.tagName} ${part.scrollWidth}`));
    assert.deepEqual(cut, []);
}

for (const {name, view, state, loggedIn, before, then} of STATES) {
    imitated(`${name} can be used by everyone`, {state, loggedIn, seconds: 60}, async (given) => {
        const {page, imitation, go, accessible, picture} = given;
        await before?.(imitation);
        await go(view);
        await then(given);
        for (const [look, {viewport, colorScheme}] of LOOKS) {
            await page.setViewportSize(viewport ?? {width: 1280, height: 900});
            await page.emulateMedia({colorScheme: colorScheme ?? "light", reducedMotion: "reduce"});
            await picture(`${name}-${look}`);
            await nothingBeyond(page);
            await accessible();
        }
    });
}
