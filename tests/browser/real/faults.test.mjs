// The appliance's servers end and start while the page is open; a refresh that is stopped; two windows.

import assert from "node:assert/strict";

import {expectGone, expectText} from "../imitated/views.mjs";
import {ADMINISTRATOR, HOST, joinByCall, lab, real, renew, startHttpd, until} from "./page.mjs";

const LOST = "The appliance does not answer.";
const BACK = "The appliance answers again.";

const renewAndJoin = () => renew().then(joinByCall);

real("vornd killed and started: the page says so, recovers, and the session goes on", {seconds: 90, before: renew},
    async ({page, logIn, picture}) => {
        await logIn();
        await lab.must(["vornd", HOST, "kill"]);
        await page.getByRole("link", {name: "Events", exact: true}).click();
        await expectText(page.getByRole("alert"), LOST);
        await picture("vornd-lost");
        await lab.must(["vornd", HOST, "start"]);
        await expectText(page, BACK, 35_000);
        await expectText(page, "No events yet");
        await page.getByRole("button", {name: "Menu of admin"}).waitFor();
    });

real("vorn-httpd stopped and started: the page says so, recovers, and the session goes on",
    {seconds: 90, before: renew}, async ({page, logIn, watch}) => {
        await logIn();
        watch.expectServerGone();
        await lab.must(["httpd", HOST, "stop"]);
        await page.getByRole("link", {name: "Events", exact: true}).click();
        // A view that was never open is a file of its own, which can't be had now either.
        await expectText(page, /does not answer|This view failed/);
        await startHttpd();
        await expectText(page, BACK, 35_000);
        await page.getByRole("link", {name: "Options", exact: true}).click();
        await page.getByLabel("Depth of groups within groups").waitFor();
    });

real("vornd killed during a join: the page follows the join to its end", {seconds: 150, before: renew},
    async ({page, logIn}) => {
        await logIn("/join");
        const dialog = page.getByRole("dialog");
        await dialog.getByRole("textbox", {name: "Domain", exact: true}).fill("lab.test");
        await dialog.getByRole("textbox", {name: "Account", exact: true}).fill(ADMINISTRATOR.user);
        await dialog.getByLabel(/^Password/).fill(ADMINISTRATOR.password);
        await dialog.getByRole("button", {name: "Join", exact: true}).click();
        await expectText(dialog.getByRole("list"), "Find a domain controller");
        await lab.must(["vornd", HOST, "kill"]);
        await lab.must(["vornd", HOST, "start"]);
        await expectText(dialog, /The appliance is a member of/, 90_000);
        await dialog.getByRole("button", {name: "Close"}).last().click();
        await expectText(page, "Member of LAB");
    });

real("a refresh is stopped, and the lists of before stay", {seconds: 120, before: renewAndJoin},
    async ({page, logIn}) => {
        await logIn("/users");
        await page.getByRole("button", {name: "Refresh all domains"}).click();
        await expectText(page, "The refresh is done", 90_000);
        await expectText(page, "Alice Ångström");
        // The controller answers nothing from here on, so that the refresh lasts.
        await lab.must(["fault", "ldap-drop", "dc1"]);
        try {
            await page.getByRole("button", {name: "Refresh all domains"}).click();
            await page.getByRole("button", {name: "Stop the refresh"}).click();
            await expectText(page, "The refresh was stopped");
            await expectText(page, "Alice Ångström");
        } finally {
            await lab.must(["fault", "none", "dc1"]);
        }
    });

real("a second window sees the leave of the first", {seconds: 120, before: renewAndJoin},
    async ({page, logIn, context}) => {
        await logIn();
        await expectText(page, "Member of LAB");
        const other = await context.newPage();
        await other.goto("/#/overview");
        await expectText(other, "Member of LAB");
        await other.getByRole("button", {name: "Leave domain"}).click();
        const dialog = other.getByRole("dialog");
        await dialog.getByLabel(/Type LAB to confirm/).fill("LAB");
        await dialog.getByRole("button", {name: "Leave domain"}).click();
        await expectText(dialog, "The appliance left LAB.", 60_000);
        await page.bringToFront();
        await expectText(page, "Not a member of a domain", 40_000);
    });

real("log-out ends the session in the other window, and its cookie is worth nothing", {seconds: 60, before: renew},
    async ({page, logIn, context}) => {
        await logIn();
        const other = await context.newPage();
        await other.goto("/#/options");
        await other.getByLabel("Depth of groups within groups").waitFor();
        const cookies = await context.cookies();
        await page.getByRole("button", {name: "Menu of admin"}).click();
        await page.getByRole("menuitem", {name: "Log out"}).click();
        await page.getByRole("textbox", {name: "User name"}).waitFor();
        await context.addCookies(cookies);
        await other.getByRole("link", {name: "Events", exact: true}).click();
        await expectText(other, "Your session ended. Log in to go on where you were.");
    });

real("wrong passwords again and again: the page says how long to wait", {seconds: 120, before: renew},
    async ({page, picture}) => {
        await page.goto("/");
        const submit = page.getByRole("button", {name: "Log in"});
        await page.getByRole("textbox", {name: "User name"}).fill("admin");
        let tries = 0;
        await until("the pause", async () => {
            tries++;
            await page.getByLabel(/^Password/).fill("wrong");
            await submit.click();
            await expectText(page, /Code 22[23]/);
            await expectGone(page.getByRole("button", {name: "Logging in…"}));
            return page.getByText("Code 223").isVisible();
        }, 90_000);
        assert.ok(tries <= 7, `${tries} tries`);
        await expectText(page, /You can try again in \d+ seconds\./);
        await picture("too-many-attempts");
        assert.equal(await submit.isEnabled(), false);
    });
