// The frame around the views: navigation, addresses, themes, narrow screens, the keyboard.

import assert from "node:assert/strict";

import {until} from "../lib/fixture.mjs";
import {DARK, imitated, NARROW} from "./page.mjs";
import {expectFocus, expectGone, expectText, VIEWS} from "./views.mjs";

imitated("every view is reached by the navigation, has its heading, its title and its address", async ({page, go}) => {
    await go("/overview");
    for (const {name, path} of VIEWS) {
        const link = page.getByRole("navigation", {name: "Views"}).getByRole("link", {name, exact: true});
        await link.click();
        await page.getByRole("heading", {level: 1, name}).waitFor();
        assert.equal(new URL(page.url()).hash, `#${path}`);
        assert.equal(await link.getAttribute("aria-current"), "page");
        await until("the title", async () => new RegExp(`^${name} . NAS1$`).test(await page.title()));
    }
});

imitated("the back button goes through the views, and forward again", async ({page, go}) => {
    await go("/overview");
    for (const name of ["Options", "Events"]) {
        await page.getByRole("link", {name, exact: true}).click();
        await page.getByRole("heading", {level: 1, name}).waitFor();
    }
    await page.goBack();
    await page.getByRole("heading", {level: 1, name: "Options"}).waitFor();
    await page.goBack();
    await page.getByRole("heading", {level: 1, name: "Overview"}).waitFor();
    await page.goForward();
    await page.getByRole("heading", {level: 1, name: "Options"}).waitFor();
});

imitated("an address that is none says so and leads back", async ({page, go, accessible}) => {
    await go("/nothing/here?a=b");
    await expectText(page, "There is no such view");
    await accessible();
    await page.getByRole("link", {name: "Go to the overview"}).click();
    await page.getByRole("heading", {level: 1, name: "Overview"}).waitFor();
});

imitated("a view takes the focus to its heading when it was navigated to", async ({page, go}) => {
    await go("/overview");
    await page.getByRole("link", {name: "Options", exact: true}).click();
    await expectFocus(page.getByRole("heading", {level: 1, name: "Options"}));
});

imitated("the first key leads past the navigation", async ({page, go}) => {
    await go("/overview");
    await page.keyboard.press("Tab");
    await expectFocus(page.getByRole("link", {name: "Skip to content"}));
    await page.keyboard.press("Enter");
    await expectFocus(page.getByRole("main"));
    assert.equal(new URL(page.url()).hash, "#/overview");
});

imitated("on a narrow screen the navigation is folded away, and closes after a choice", {context: NARROW},
    async ({page, go, accessible}) => {
        await go("/overview");
        const link = page.getByRole("link", {name: "Options", exact: true});
        await expectGone(link);
        await page.getByRole("button", {name: "Show or hide the views"}).click();
        await link.waitFor();
        await accessible();
        await link.click();
        await page.getByRole("heading", {level: 1, name: "Options"}).waitFor();
        await expectGone(link);
    });

// By the heading, whose letters are light on dark and dark on light.
const isDark = (page) => page.getByRole("heading", {level: 1}).evaluate((heading) => {
    const [red, green, blue] = getComputedStyle(heading).color.match(/[\d.]+/g).map(Number);
    return (red + green + blue) / 3 > 128;
});

async function chooseTheme(page, name) {
    await page.getByRole("button", {name: "Menu of admin"}).click();
    await page.getByRole("menuitem", {name}).or(page.getByRole("option", {name})).click();
}

imitated("the theme is the system's until another is chosen, which lasts", {context: DARK}, async ({page, go}) => {
    await go("/overview");
    assert.equal(await isDark(page), true);
    await chooseTheme(page, "Light");
    assert.equal(await isDark(page), false);
    await page.reload();
    await page.getByRole("heading", {level: 1}).waitFor();
    assert.equal(await isDark(page), false);
    await chooseTheme(page, "As the system");
    assert.equal(await isDark(page), true);
    await page.emulateMedia({colorScheme: "light"});
    assert.equal(await isDark(page), false);
});

imitated("log-out asks the appliance once and shows the log-in", async ({page, go, imitation}) => {
    await go("/overview");
    await page.getByRole("button", {name: "Menu of admin"}).click();
    await page.getByRole("menuitem", {name: "Log out"}).click();
    await page.getByLabel("User name").waitFor();
    assert.equal(imitation.callsOf("logout").length, 1);
});

// Spinners excepted: they say that something goes on.
const movements = (page) => page.evaluate(() => document.getAnimations()
    .filter((one) => one.playState === "running" && !one.effect.target?.closest("[class*=spinner]"))
    .filter((one) => one.effect.getComputedTiming().duration > 50)
    .map((one) => `${one.animationName ?? one.transitionProperty} ${one.effect.target?.className}`));

imitated("who wants less motion gets none", {context: {reducedMotion: "reduce", viewport: {width: 900, height: 900}}},
    async ({page, go}) => {
        await go("/overview");
        for (const act of [
            () => page.getByRole("button", {name: "Show or hide the views"}).click(),
            () => page.getByRole("button", {name: "Show or hide the views"}).click(),
            () => page.getByRole("button", {name: "Menu of admin"}).click(),
            () => page.keyboard.press("Escape"),
            () => page.getByRole("button", {name: "Join again or another domain"}).click(),
            () => page.getByRole("button", {name: /^Advanced options/}).click(),
        ]) {
            await act();
            assert.deepEqual(await movements(page), []);
        }
    });
