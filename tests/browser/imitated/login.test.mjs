// Log-in, one-time links, sessions that end, two tabs.

import assert from "node:assert/strict";

import {pause} from "../lib/fixture.mjs";
import {firstState} from "../lib/imitated_state.mjs";
import {cut, failure} from "../lib/imitation.mjs";
import {imitated} from "./page.mjs";
import {expectError, expectFocus, expectGone, expectText} from "./views.mjs";

const OUT = {loggedIn: false};
const field = (page, name) => page.getByRole("textbox", {name, exact: true});
const passwordField = (page) => page.getByLabel(/^Password/);
const button = (page) => page.getByRole("button", {name: "Log in"});

async function logIn(page, user = "admin", password = "right") {
    await field(page, "User name").fill(user);
    await passwordField(page).fill(password);
    await button(page).click();
}

imitated("who is not logged in is asked to, and is then where the address says", OUT, async ({page, go, imitation}) => {
    await go("/options");
    await expectFocus(field(page, "User name"));
    await logIn(page);
    await page.getByRole("heading", {level: 1, name: "Options"}).waitFor();
    assert.deepEqual(imitation.callsOf("login").map((call) => call.parameters), [{user: "admin", password: "right"}]);
});

imitated("log-in works with the keyboard alone", OUT, async ({page, go}) => {
    await go("/overview");
    await expectFocus(field(page, "User name"));
    await page.keyboard.type("admin");
    await page.keyboard.press("Tab");
    await page.keyboard.type("right");
    await page.keyboard.press("Enter");
    await page.getByRole("heading", {level: 1, name: "Overview"}).waitFor();
});

imitated("a wrong password says so, is not kept, and can be corrected", OUT,
    async ({page, go, imitation, accessible, picture}) => {
        await go("/overview");
        await logIn(page, "admin", "wrong");
        await expectError(page, 222);
        assert.equal(await field(page, "User name").inputValue(), "admin");
        assert.equal(await passwordField(page).inputValue(), "");
        await expectFocus(passwordField(page));
        await accessible();
        await picture("login-wrong-password");
        await page.keyboard.type("right");
        await page.keyboard.press("Enter");
        await page.getByRole("heading", {level: 1, name: "Overview"}).waitFor();
        assert.equal(imitation.callsOf("login").length, 2);
    });

imitated("nothing is sent without a name or a password", OUT, async ({page, go, imitation, accessible}) => {
    await go("/overview");
    await button(page).click();
    await expectText(page, "Enter your user name.");
    await expectFocus(field(page, "User name"));
    await accessible();
    await field(page, "User name").fill("admin");
    await button(page).click();
    await expectText(page, "Enter your password.");
    assert.equal(imitation.callsOf("login").length, 0);
});

imitated("the password can be looked at, and is hidden first", OUT, async ({page, go}) => {
    await go("/overview");
    await passwordField(page).fill("right");
    assert.equal(await passwordField(page).getAttribute("type"), "password");
    await page.getByRole("button", {name: "Show the password"}).click();
    assert.equal(await passwordField(page).getAttribute("type"), "text");
    await page.getByRole("button", {name: "Hide the password"}).click();
    assert.equal(await passwordField(page).getAttribute("type"), "password");
});

imitated("password managers find what they need", OUT, async ({page, go}) => {
    await go("/overview");
    assert.equal(await field(page, "User name").getAttribute("autocomplete"), "username");
    assert.equal(await passwordField(page).getAttribute("autocomplete"), "current-password");
});

imitated("a double click logs in once", OUT, async ({page, go, imitation}) => {
    await go("/overview");
    const release = imitation.hold("login");
    await field(page, "User name").fill("admin");
    await passwordField(page).fill("right");
    await button(page).dblclick();
    await passwordField(page).press("Enter").catch(() => {});
    await pause(200);
    assert.equal(imitation.callsOf("login").length, 1);
    release();
    await page.getByRole("heading", {level: 1, name: "Overview"}).waitFor();
});

imitated("after too many attempts it says how long to wait, and lets nobody try before", OUT,
    async ({page, go, imitation, accessible, picture}) => {
        await page.clock.install();
        await go("/overview");
        imitation.fail("login", 223, {headers: {"retry-after": "30"}});
        await logIn(page, "admin", "wrong");
        await expectError(page, 223);
        await expectText(page, /You can try again in (30|2\d) seconds\./);
        await accessible();
        await picture("login-too-many-attempts");
        await passwordField(page).fill("right");
        assert.equal(await button(page).isEnabled(), false);
        await passwordField(page).press("Enter");
        assert.equal(imitation.callsOf("login").length, 1);
        imitation.mend("login");
        await page.clock.runFor(31_000);
        await expectText(page, "You can try again now.");
        await button(page).click();
        await page.getByRole("heading", {level: 1, name: "Overview"}).waitFor();
    });

imitated("log-in that is not possible now says so", OUT, async ({page, go, imitation}) => {
    await go("/overview");
    imitation.fail("login", 225);
    await logIn(page);
    await expectError(page, 225);
});

imitated("the server going away during log-in is said, and the form is there again afterwards", OUT,
    async ({page, go, imitation}) => {
        await go("/overview");
        imitation.on("login", () => {
            throw cut();
        });
        await logIn(page);
        await expectText(page.getByRole("alert"), "The appliance does not answer.");
        imitation.mend("login");
        await expectText(page, "The appliance answers again.");
        await logIn(page);
        await page.getByRole("heading", {level: 1, name: "Overview"}).waitFor();
    });

imitated("a one-time link logs in once and leaves the address at once", OUT, async ({page, imitation}) => {
    await page.goto("/#/link/a-good-link-token");
    await page.getByRole("heading", {level: 1, name: "Overview"}).waitFor();
    assert.deepEqual(imitation.callsOf("link").map((call) => call.parameters), [{token: "a-good-link-token"}]);
    assert.equal(new URL(page.url()).hash, "#/overview");
    await page.goBack().catch(() => {});
    assert.doesNotMatch(page.url(), /token/);
});

imitated("a link that is used up says so, and leaves the log-in", OUT, async ({page, accessible, picture}) => {
    await page.goto("/#/link/used");
    await expectText(page, /The one-time link did not log you in/);
    await expectText(page, "Code 224");
    await accessible();
    await picture("login-link-used");
    await logIn(page);
    await page.getByRole("heading", {level: 1, name: "Overview"}).waitFor();
});

imitated("the token of a link is nowhere but in its own call", OUT, async ({page, imitation, watch}) => {
    await page.goto("/#/link/a-good-link-token");
    await page.getByRole("heading", {level: 1, name: "Overview"}).waitFor();
    const elsewhere = watch.requests.filter((request) => !request.url().endsWith("/session/link"))
        .filter((request) => JSON.stringify([request.url(), request.headers(), request.postData()]).includes("good-link"));
    assert.equal(elsewhere.length, 0);
    assert.equal(imitation.callsOf("link").length, 1);
    assert.equal(await page.evaluate(() => JSON.stringify([{...localStorage}, {...sessionStorage}]).includes("good-link")), false);
});

imitated("a session that ended is said, and log-in leads back to the view", async ({page, go, imitation, accessible, picture}) => {
    await go("/options");
    await page.getByRole("checkbox").first().waitFor();
    imitation.endSession();
    await page.getByRole("link", {name: "Events", exact: true}).click();
    await expectText(page, "Your session ended. Log in to go on where you were.");
    await accessible();
    await picture("login-session-ended");
    await logIn(page);
    await page.getByRole("heading", {level: 1, name: "Events"}).waitFor();
    await expectText(page, "The appliance joined the domain LAB.");
});

imitated("after log-out the back button shows nothing of before", async ({page, go}) => {
    await go("/options");
    await page.getByRole("link", {name: "Events", exact: true}).click();
    await expectText(page, "The appliance joined the domain LAB.");
    await page.getByRole("button", {name: "Menu of admin"}).click();
    await page.getByRole("menuitem", {name: "Log out"}).click();
    await field(page, "User name").waitFor();
    await expectGone(page.getByText("Your session ended"));
    await page.goBack();
    await pause(200);
    assert.equal(await field(page, "User name").isVisible(), true);
    await expectGone(page.getByText("The appliance joined the domain LAB."));
});

imitated("log-out when the session is gone already leads to the log-in, too", async ({page, go, imitation}) => {
    await go("/options");
    await page.getByRole("button", {name: "Menu of admin"}).click();
    // Ends as the log-out comes in: any call before would lead to the log-in by itself.
    imitation.on("logout", () => {
        imitation.endSession();
        throw failure(220);
    });
    await page.getByRole("menuitem", {name: "Log out"}).click();
    await field(page, "User name").waitFor();
    assert.equal(imitation.callsOf("logout").length, 1);
});

imitated("log-out in one tab ends the other one's session at its next call", async ({page, go, context}) => {
    await go("/options");
    const other = await context.newPage();
    await go("/events", other);
    await expectText(other, "The appliance joined the domain LAB.");
    await page.getByRole("button", {name: "Menu of admin"}).click();
    await page.getByRole("menuitem", {name: "Log out"}).click();
    await field(page, "User name").waitFor();
    await other.getByRole("link", {name: "Options", exact: true}).click();
    await expectText(other, "Your session ended. Log in to go on where you were.");
    // And logging in in one of them is enough for the other, as soon as it is loaded anew.
    await logIn(page);
    await page.getByRole("heading", {level: 1}).waitFor();
    await other.reload();
    await other.getByRole("heading", {level: 1, name: "Options"}).waitFor();
});

imitated("a new session of another tab renews the token against forgery of this one", async ({page, go, imitation}) => {
    await go("/options");
    const complaints = imitation.complaints;
    imitation.state.session = {...imitation.state.session, csrf: "another-token"};
    await page.getByRole("link", {name: "Events", exact: true}).click();
    await expectText(page, "The appliance joined the domain LAB.");
    // That the first call went out with the old token is the point here.
    assert.ok(complaints.every((text) => text.includes("the token against forgery")), `${complaints}`);
    complaints.length = 0;
});

imitated("what the page asks by itself does not keep the session alive", async ({page, go, imitation}) => {
    await page.clock.install();
    await go("/overview");
    await expectText(page, "Member of LAB");
    for (let minute = 0; minute < 3; minute++) {
        await page.clock.runFor(60_000);
        await pause(100);
    }
    assert.ok(imitation.calls.filter((call) => call.background).length > 0, "the overview never looks again");
    // What the view asked as it was opened counts as the user's, once.
    const others = imitation.calls.filter((call) => !call.background).map((call) => call.name);
    assert.deepEqual(others, [...new Set(others)]);
});
