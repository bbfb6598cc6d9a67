// Overview, join and leave.

import assert from "node:assert/strict";

import {pause, until} from "../lib/fixture.mjs";
import {firstState, memberState} from "../lib/imitated_state.mjs";
import {cut, failure} from "../lib/imitation.mjs";
import {imitated} from "./page.mjs";
import {expectError, expectFocus, expectGone, expectText} from "./views.mjs";

const WORKGROUP = {state: firstState()};

// Everything of the dialog that tests touch.
function joinDialog(page) {
    const dialog = page.getByRole("dialog");
    return {
        dialog,
        field: (name) => dialog.getByRole("textbox", {name, exact: true}),
        password: dialog.getByLabel(/^Password/),
        submit: dialog.getByRole("button", {name: /^(Join|Try again)$/}),
        async fill(password = "secret") {
            await this.field("Domain").fill("lab.example.com");
            await this.field("Account").fill("Administrator");
            await this.password.fill(password);
        },
    };
}

// Steps are let through one by one: gate.pass() ends the one that runs.
function stepGate(imitation) {
    let open;
    imitation.state.stepGate = () => new Promise((done) => (open = done));
    return {pass: async () => (await until("a step", () => open), open(), (open = undefined))};
}

imitated("the overview shows the membership, its kind, trust, servers, account, addresses and the last test",
    async ({page, go}) => {
        await go("/overview");
        for (const text of ["Member of LAB", "lab.example.com", "Active Directory", "Used", /10\.0\.0\.1, ?10\.0\.0\.2/,
            "NAS1$", "The membership works", "212 ms", /10\.0\.0\.5/, "11 users, 3 groups"]) {
            await expectText(page.getByRole("main"), text);
        }
    });

imitated("a test shows that it runs, and its result; a double click tests once", async ({page, go, imitation}) => {
    await go("/overview");
    const release = imitation.hold("test_dc");
    imitation.state.trustWorks = false;
    await page.getByRole("button", {name: "Test now"}).dblclick();
    await expectText(page, "Asking the domain controller…");
    await until("the call", () => imitation.callsOf("test_dc").length > 0);
    await pause(100);
    assert.equal(imitation.callsOf("test_dc").length, 1);
    release();
    await expectText(page, "The membership does not work");
    imitation.state.trustWorks = true;
    await page.getByRole("button", {name: "Test now"}).click();
    await expectText(page, "The membership works");
});

imitated("a change by another shows by itself", {seconds: 40}, async ({page, go, imitation}) => {
    await page.clock.install();
    await go("/overview");
    await expectText(page, "Member of LAB");
    imitation.state.member.domain_name = "NEWLAB";
    imitation.state.lastTest.success = false;
    await page.clock.runFor(60_000);
    await expectText(page, "Member of NEWLAB");
    await expectText(page, "The membership does not work");
});

imitated("a join: steps live, the result, and the overview is of the member", WORKGROUP,
    async ({page, go, imitation}) => {
        const gate = stepGate(imitation);
        await go("/overview");
        await page.getByRole("button", {name: "Join domain"}).click();
        const join = joinDialog(page);
        await expectFocus(join.field("Domain"));
        await join.fill();
        await join.field("DNS servers").fill("10.0.0.1, 10.0.0.2");
        await join.submit.click();
        await expectText(join.dialog, "Joining lab.example.com…");
        for (const step of ["Find a domain controller", "Try the controller’s ports", "Ask for the domain’s names",
            "Log in with the account", "Join", "Start winbind and look up the domain", "Test the trust"]) {
            await expectText(join.dialog.getByRole("list"), step);
            await gate.pass();
        }
        await expectText(join.dialog, /The appliance is a member of/);
        await join.dialog.getByRole("button", {name: "Close"}).last().click();
        await expectGone(join.dialog);
        await expectText(page, "Member of LAB");
        const [call] = imitation.callsOf("set");
        assert.deepEqual({...call.parameters, dns: call.parameters.dns.replaceAll(" ", "")}, {
            enable_domain: true, domain_name: "lab.example.com", username: "Administrator", password: "secret",
            dns: "10.0.0.1,10.0.0.2", manage_mode: 0,
        });
        assert.equal(imitation.callsOf("set").length, 1);
    });

imitated("a double click and Enter join once", WORKGROUP, async ({page, go, imitation}) => {
    await go("/join");
    const join = joinDialog(page);
    await join.fill();
    const release = imitation.hold("set");
    await join.submit.dblclick();
    await until("the call", () => imitation.callsOf("set").length > 0);
    await pause(200);
    assert.equal(imitation.callsOf("set").length, 1);
    release();
    await expectText(join.dialog, /The appliance is a member of/);
});

imitated("a wrong password: the cause, the steps, then corrected", WORKGROUP, async ({page, go, imitation}) => {
    imitation.state.failing = {step: "credentials", code: 2607, message: "x", detail: "preauthentication failed"};
    await go("/join");
    const join = joinDialog(page);
    await join.fill("wrong");
    await join.submit.click();
    await expectError(join.dialog, 2607);
    await expectText(join.dialog, "The appliance is as it was before.");
    await join.dialog.getByRole("button", {name: "Details"}).click();
    await expectText(join.dialog, "preauthentication failed");
    assert.equal(await join.password.inputValue(), "");
    assert.equal(await join.field("Domain").inputValue(), "lab.example.com");
    imitation.state.failing = undefined;
    await join.password.fill("right");
    await join.submit.click();
    await expectText(join.dialog, /The appliance is a member of/);
    assert.deepEqual(imitation.callsOf("set").map((call) => call.parameters.password), ["wrong", "right"]);
});

imitated("what could not be put back is named", WORKGROUP, async ({page, go, imitation}) => {
    imitation.on("set", () => {
        imitation.state.steps = {
            id: "own", action: "join", domain: "lab", started: 1, finished: 2, success: false, message: "", steps: [],
            leftovers: ["the computer account NAS1$ on dc1"],
        };
        throw failure(2615);
    });
    await go("/join");
    const join = joinDialog(page);
    await join.fill();
    await join.submit.click();
    await expectError(join.dialog, 2615);
    await expectText(join.dialog, "the computer account NAS1$ on dc1");
    await expectGone(join.dialog.getByText("The appliance is as it was before."));
});

imitated("a join that runs can be left alone, is seen on the overview, and ends there", WORKGROUP,
    async ({page, go, imitation}) => {
        const gate = stepGate(imitation);
        await go("/join");
        const join = joinDialog(page);
        await join.fill();
        await join.submit.click();
        await expectText(join.dialog, "Find a domain controller");
        await join.dialog.getByRole("button", {name: "Close, the join goes on"}).click();
        await expectGone(join.dialog);
        await expectText(page, /Joining lab\.example\.com/);
        for (let step = 0; step < 7; step++) {
            await gate.pass();
        }
        await expectText(page, /The appliance joined lab\.example\.com\./);
        await expectText(page, "Member of LAB");
    });

imitated("another tab sees the join that runs, and its end", WORKGROUP, async ({page, go, imitation, context}) => {
    const gate = stepGate(imitation);
    await go("/join");
    const join = joinDialog(page);
    await join.fill();
    await join.submit.click();
    await expectText(join.dialog, "Find a domain controller");
    const other = await context.newPage();
    await go("/overview", other);
    await expectText(other, /Joining lab\.example\.com/);
    assert.equal(await other.getByRole("button", {name: "Join domain"}).isEnabled(), false);
    for (let step = 0; step < 7; step++) {
        await gate.pass();
    }
    await expectText(join.dialog, /The appliance is a member of/);
    await other.bringToFront();
    await expectText(other, "Member of LAB");
});

imitated("a connection that breaks during the join: its steps are watched to their end", {...WORKGROUP, seconds: 60},
    async ({page, go, imitation}) => {
        await go("/join");
        const join = joinDialog(page);
        await join.fill();
        imitation.on("set", () => {
            imitation.state.busy = "join";
            imitation.state.steps = {
                id: "cut-off", action: "join", domain: "lab.example.com", started: imitation.now(), finished: null,
                success: null, message: "", leftovers: [],
                steps: [{name: "join", server: "dc1", outcome: "running", detail: "", milliseconds: 0}],
            };
            throw cut();
        });
        await join.submit.click();
        await expectText(join.dialog, /The answer was cut off, but the join goes on/);
        Object.assign(imitation.state, memberState({
            busy: null, steps: {...imitation.state.steps, finished: imitation.now(), success: true},
        }));
        await expectText(join.dialog, /The appliance is a member of/);
    });

imitated("wrong entries are told after a pause, and nothing is sent that the appliance would refuse", WORKGROUP,
    async ({page, go, imitation}) => {
        await go("/join");
        const join = joinDialog(page);
        await join.field("Domain").pressSequentially("10.0.0.1");
        await expectText(join.dialog, /^This is an address\. Enter the domain’s name/);
        for (const address of ["::1", "fe80::1", "1.2.3.4"]) {
            await join.field("Domain").fill(address);
            await expectText(join.dialog, /^This is an address/);
        }
        await join.field("Domain").fill("lab.example.com");
        await expectGone(join.dialog.getByText(/^This is an address/));
        await join.field("DNS servers").fill("10.0.0.1, nonsense!");
        await expectText(join.dialog, /is no address of a DNS server/);
        await join.submit.click();
        await expectText(join.dialog, /fields need a correction/);
        await expectFocus(join.field("Account"));
        assert.equal(imitation.callsOf("set").length, 0);
    });

imitated("the advanced options are sent only when some are set", WORKGROUP, async ({page, go, imitation}) => {
    await go("/join");
    const join = joinDialog(page);
    await join.fill();
    await join.dialog.getByRole("button", {name: /^Advanced options/}).click();
    await join.field("Domain controller (KDC)").fill("dc1.lab.example.com");
    await join.dialog.getByRole("radio", {name: "Only those of"}).check();
    await join.dialog.getByRole("checkbox", {name: "eth1"}).check();
    await join.dialog.getByText("Use trusted domains").click();
    assert.equal(await join.dialog.getByRole("switch", {name: "Use trusted domains"}).isChecked(), false);
    await join.submit.click();
    await expectText(join.dialog, /The appliance is a member of/);
    const {manage_mode: mode, advance_domain_conf: advanced} = imitation.callsOf("set")[0].parameters;
    assert.notEqual(mode, 0);
    assert.equal(advanced.enable_advance_option, true);
    assert.equal(advanced.kdc, "dc1.lab.example.com");
    assert.deepEqual(advanced.register_nics, ["eth1"]);
});

imitated("join with the keyboard alone", WORKGROUP, async ({page, go, imitation}) => {
    await go("/overview");
    await tabTo(page, page.getByRole("button", {name: "Join domain"}));
    await page.keyboard.press("Enter");
    const join = joinDialog(page);
    await join.dialog.waitFor();
    await expectFocus(join.field("Domain"));
    await page.keyboard.type("lab.example.com");
    await page.keyboard.press("Tab");
    await page.keyboard.type("Administrator");
    await page.keyboard.press("Tab");
    await page.keyboard.type("secret");
    await page.keyboard.press("Enter");
    await expectText(join.dialog, /The appliance is a member of/);
    await page.keyboard.press("Escape");
    await expectGone(join.dialog);
    assert.equal(imitation.callsOf("set").length, 1);
});

imitated("the focus stays within the dialog, and comes back to where it was", WORKGROUP, async ({page, go}) => {
    await go("/overview");
    const open = page.getByRole("button", {name: "Join domain"});
    await tabTo(page, open);
    await page.keyboard.press("Enter");
    const isInside = () => page.evaluate(() => Boolean(document.activeElement.closest("[role=dialog]")));
    await until("the focus is inside", isInside);
    for (let press = 0; press < 20; press++) {
        await page.keyboard.press("Tab");
        assert.equal(await isInside(), true);
    }
    await page.keyboard.press("Escape");
    await expectGone(page.getByRole("dialog"));
    await expectFocus(open);
});

imitated("the back button closes the dialog", WORKGROUP, async ({page, go}) => {
    await go("/overview");
    await page.getByRole("button", {name: "Join domain"}).click();
    await page.getByRole("dialog").waitFor();
    await page.goBack();
    await expectGone(page.getByRole("dialog"));
    assert.equal(new URL(page.url()).hash, "#/overview");
});

imitated("leave says what will happen and can't be hit by accident", async ({page, go, imitation}) => {
    await go("/overview");
    await page.getByRole("button", {name: "Leave domain"}).click();
    const dialog = page.getByRole("dialog");
    await expectText(dialog, "What will happen");
    await expectText(dialog, /The computer account NAS1\$ stays in the domain/);
    const submit = dialog.getByRole("button", {name: "Leave domain"});
    assert.equal(await submit.isEnabled(), false);
    await page.keyboard.press("Enter");
    await dialog.getByLabel(/Type LAB to confirm/).fill("LABX");
    await page.keyboard.press("Enter");
    await pause(200);
    assert.equal(imitation.callsOf("leave").length, 0);
    await dialog.getByLabel(/Type LAB to confirm/).fill("LAB");
    const release = imitation.hold("leave");
    await submit.dblclick();
    await until("the call", () => imitation.callsOf("leave").length > 0);
    await pause(200);
    assert.equal(imitation.callsOf("leave").length, 1);
    assert.deepEqual(imitation.callsOf("leave")[0].parameters, {delete_account: false});
    release();
    await expectText(dialog, "The appliance left LAB.");
    await expectText(dialog, /The computer account NAS1\$ is still in the domain/);
    await dialog.getByRole("button", {name: "Close"}).last().click();
    await expectText(page, "Not a member of a domain");
});

imitated("leave with the computer account: refused, corrected, and the password is not kept",
    async ({page, go, imitation}) => {
        await go("/leave");
        const dialog = page.getByRole("dialog");
        await dialog.getByRole("checkbox", {name: /Delete the computer account NAS1\$/}).check();
        await dialog.getByRole("textbox", {name: "Account", exact: true}).fill("Administrator");
        await dialog.getByLabel(/^Password/).fill("wrong");
        await dialog.getByLabel(/Type LAB to confirm/).fill("lab");
        await dialog.getByRole("button", {name: "Leave domain"}).click();
        await expectError(dialog, 2607);
        assert.equal(await dialog.getByLabel(/^Password/).inputValue(), "");
        await dialog.getByLabel(/^Password/).fill("right");
        await dialog.getByRole("button", {name: "Leave domain"}).click();
        await expectText(dialog, /was deleted on the domain controller/);
        assert.deepEqual(imitation.callsOf("leave").map((call) => call.parameters.password), ["wrong", "right"]);
    });

imitated("leave with the keyboard alone", async ({page, go, imitation}) => {
    await go("/overview");
    await tabTo(page, page.getByRole("button", {name: "Leave domain"}));
    await page.keyboard.press("Enter");
    const dialog = page.getByRole("dialog");
    await dialog.waitFor();
    await tabTo(page, dialog.getByLabel(/Type LAB to confirm/));
    await page.keyboard.type("LAB");
    await page.keyboard.press("Enter");
    await expectText(dialog, "The appliance left LAB.");
    await page.keyboard.press("Escape");
    await expectGone(dialog);
    await expectText(page, "Not a member of a domain");
    assert.equal(imitation.callsOf("leave").length, 1);
});

imitated("secrets are nowhere on the page or in its storage after a join", WORKGROUP, async ({page, go, imitation}) => {
    imitation.state.failing = {step: "join", code: 2615};
    await go("/join");
    const join = joinDialog(page);
    await join.fill("c4nary-secret");
    await join.submit.click();
    await expectError(join.dialog, 2615);
    const where = await page.evaluate(() => ({
        markup: document.documentElement.outerHTML.includes("c4nary"),
        values: [...document.querySelectorAll("input")].some((input) => input.value.includes("c4nary")),
        storage: JSON.stringify([{...localStorage}, {...sessionStorage}]).includes("c4nary"),
        address: location.href.includes("c4nary"),
    }));
    assert.deepEqual(where, {markup: false, values: false, storage: false, address: false});
});

async function tabTo(page, locator) {
    await locator.waitFor();
    for (let press = 0; press < 40; press++) {
        if (await locator.evaluate((element) => element === document.activeElement)) {
            return;
        }
        await page.keyboard.press("Tab");
    }
    throw new Error(`Tab does not lead to ${locator}`);
}
