// The whole life of a membership on the page, against real domains.

import assert from "node:assert/strict";

import {expectError, expectGone, expectText} from "../imitated/views.mjs";
import {ADMIN, ADMINISTRATOR, GUEST, HOST, lab, oneTimeLink, real, renew} from "./page.mjs";

async function fillLogIn(page, user, password) {
    await page.getByRole("textbox", {name: "User name"}).fill(user);
    await page.getByLabel(/^Password/).fill(password);
    await page.getByRole("button", {name: "Log in"}).click();
}

const view = (page, name) => page.getByRole("link", {name, exact: true}).click()
    .then(() => page.getByRole("heading", {level: 1, name}).waitFor());

real("from the first log-in to the log-out", {seconds: 240, before: renew},
    async ({page, picture, accessible, context}) => {
        await page.goto("/");
        // A wrong password, an account that is no administrator, then the right one.
        await fillLogIn(page, ADMIN.user, "wrong");
        await expectError(page, 222);
        await fillLogIn(page, GUEST.user, GUEST.password);
        await expectError(page, 222);
        await fillLogIn(page, ADMIN.user, ADMIN.password);
        await expectText(page, "Not a member of a domain");
        await picture("overview-workgroup");

        // The session's cookie can be neither read nor sent elsewhere.
        const [cookie] = await context.cookies();
        assert.deepEqual([cookie.name, cookie.httpOnly, cookie.secure, cookie.sameSite, cookie.path],
            ["__Host-vorn", true, true, "Strict", "/"]);
        assert.equal(await page.evaluate(() => document.cookie), "");

        // A join with a wrong password: the cause is read, and corrected.
        await page.getByRole("button", {name: "Join domain"}).click();
        const dialog = page.getByRole("dialog");
        await dialog.getByRole("textbox", {name: "Domain", exact: true}).fill("lab.test");
        await dialog.getByRole("textbox", {name: "Account", exact: true}).fill(ADMINISTRATOR.user);
        await dialog.getByLabel(/^Password/).fill("wrong");
        await dialog.getByRole("button", {name: "Join", exact: true}).click();
        await expectError(dialog, 2607, 60_000);
        await dialog.getByRole("button", {name: "Details"}).click();
        await expectText(dialog, "Log in with the account");
        await expectText(dialog, "The appliance is as it was before.");
        await picture("join-wrong-password");
        await accessible();
        await dialog.getByLabel(/^Password/).fill(ADMINISTRATOR.password);
        await dialog.getByRole("button", {name: "Try again"}).click();
        await expectText(dialog, "Joining lab.test…");
        // Steps show while it runs.
        await expectText(dialog.getByRole("list"), "Find a domain controller");
        await picture("join-steps");
        await expectText(dialog, /The appliance is a member of/, 90_000);
        await dialog.getByRole("button", {name: "Close"}).last().click();
        await expectText(page, "Member of LAB");
        await expectText(page, "Active Directory");
        await picture("overview-member");
        const joined = await lab.exec(HOST, ["net", "--configfile=/usr/vorn/etc/smb.conf", "ads", "testjoin", "-P"]);
        assert.match(joined.text, /Join is OK/);

        await page.getByRole("button", {name: "Test now"}).click();
        await expectText(page, "The membership works", 30_000);

        await view(page, "Domains");
        await expectText(page.getByRole("row"), "OTHER", 30_000);
        await expectText(page.getByRole("row"), "lab.test");
        await picture("domains");

        // Refresh, stop, refresh to the end, search.
        await view(page, "Users");
        await expectText(page, "The users of LAB have not been fetched yet");
        await page.getByRole("button", {name: "Refresh all domains"}).click();
        await page.getByRole("button", {name: "Stop the refresh"}).or(page.getByText("The refresh is done.")).first()
            .waitFor();
        await expectText(page, /The refresh is done/, 90_000);
        await expectText(page, "Alice Ångström");
        await page.getByRole("searchbox").fill("MÜLLER");
        await expectText(page, "1 to 1 of 1 match");
        await expectText(page.getByRole("row"), "jörg");
        await picture("users-found");
        await view(page, "Groups");
        await page.getByRole("searchbox").fill("büro");
        await expectText(page.getByRole("row"), /büro süd leute/i);
        await page.getByLabel("Domain", {exact: true}).selectOption("OTHER");
        await expectText(page.getByRole("row"), "zgroup");

        await view(page, "Options");
        await page.getByRole("checkbox", {name: "Sign connections when the client asks for it"}).check();
        await page.getByLabel("Depth of groups within groups").fill("5");
        await page.getByRole("button", {name: "Save"}).click();
        await expectText(page, "Saved.", 30_000);
        const depth = await lab.mustExec(HOST, ["testparm", "-s", "--parameter-name=winbind expand groups",
            "/usr/vorn/etc/smb.conf"]);
        assert.equal(depth.out.trim(), "5");

        await view(page, "Schedule");
        await page.getByRole("radio", {name: "On days of the week"}).check();
        for (const day of ["Monday", "Tuesday", "Wednesday", "Thursday", "Friday", "Saturday"]) {
            await page.getByRole("checkbox", {name: day}).uncheck();
        }
        await page.getByRole("checkbox", {name: "Sunday"}).check();
        await page.getByLabel("Hour").selectOption("03");
        await page.getByLabel("Minute").selectOption("30");
        await expectText(page, "Every Sunday at 03:30.");
        await page.getByRole("button", {name: "Save"}).click();
        await expectText(page, "Saved.");
        const cron = await lab.mustExec(HOST, ["sh", "-c", "cat /etc/cron.d/vorn"]);
        assert.match(cron.out, /^30 3 \* \* (0|7|sun)\b.*vornwin -updateDomain/im);

        await view(page, "Events");
        await expectText(page.getByRole("row"), /joined the domain LAB/);
        await picture("events");

        // Leave, with the computer account.
        await view(page, "Overview");
        await page.getByRole("button", {name: "Leave domain"}).click();
        await dialog.getByRole("checkbox", {name: /Delete the computer account NAS1\$/}).check();
        await dialog.getByRole("textbox", {name: "Account", exact: true}).fill(ADMINISTRATOR.user);
        await dialog.getByLabel(/^Password/).fill(ADMINISTRATOR.password);
        await dialog.getByLabel(/Type LAB to confirm/).fill("LAB");
        await dialog.getByRole("button", {name: "Leave domain"}).click();
        await expectText(dialog, "The appliance left LAB.", 90_000);
        await picture("leave-done");
        await dialog.getByRole("button", {name: "Close"}).last().click();
        await expectText(page, "Not a member of a domain");
        const found = await lab.mustExec("dc1", ["ldbsearch", "-H", "/var/lib/samba/private/sam.ldb",
            "(sAMAccountName=NAS1$)", "dn"]);
        assert.doesNotMatch(found.out, /^dn: /m);

        await page.getByRole("button", {name: "Menu of admin"}).click();
        await page.getByRole("menuitem", {name: "Log out"}).click();
        await page.getByRole("textbox", {name: "User name"}).waitFor();
        await expectGone(page.getByRole("navigation", {name: "Views"}));
        assert.deepEqual(await context.cookies(), []);
        // What the cookie was is worth nothing now.
        const status = await page.evaluate(() => fetch("/session").then((answer) => answer.status));
        assert.equal(status, 401);
    });

real("a one-time link logs in once, and never again", {seconds: 60, before: renew}, async ({page, context}) => {
    const link = await oneTimeLink();
    await page.goto(`/${link}`);
    await expectText(page, "Not a member of a domain");
    assert.equal(new URL(page.url()).hash, "#/overview");
    await context.clearCookies();
    const again = await context.newPage();
    await again.goto(`/${link}`);
    await expectText(again, /The one-time link did not log you in/);
    await expectText(again, "Code 224");
    await fillLogIn(again, ADMIN.user, ADMIN.password);
    await expectText(again, "Not a member of a domain");
});
