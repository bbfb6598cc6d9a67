// What was entered when the session ended is there again after the log-in, for the same user and without the password.

import assert from "node:assert/strict";

import {firstState} from "../lib/imitated_state.mjs";
import {failure} from "../lib/imitation.mjs";
import {imitated} from "./page.mjs";
import {expectGone, expectText} from "./views.mjs";

const WORKGROUP = {state: firstState()};
const RESTORED = "Your session had ended. What you had not saved is here again.";
const RESTORED_JOIN = "Your session had ended. What you had entered is here again, but for the password.";
const SIGN = "Sign connections when the client asks for it";

const depth = (page) => page.getByLabel("Depth of groups within groups");
const save = (page) => page.getByRole("button", {name: "Save"});

async function logInAgain(page, user = "admin") {
    await expectText(page, "Your session ended. Log in to go on where you were.");
    await page.getByRole("textbox", {name: "User name", exact: true}).fill(user);
    await page.getByLabel(/^Password/).fill("right");
    await page.getByRole("button", {name: "Log in"}).click();
}

function joinDialog(page) {
    const dialog = page.getByRole("dialog", {name: "Join a domain"});
    return {
        dialog,
        field: (name) => dialog.getByRole("textbox", {name, exact: true}),
        password: dialog.getByLabel(/^Password/),
        submit: dialog.getByRole("button", {name: "Join", exact: true}),
    };
}

async function fillJoin(page) {
    const {dialog, field, password} = joinDialog(page);
    await field("Domain").fill("lab.example.com");
    await field("Account").fill("Administrator");
    await field("DNS servers").fill("10.0.0.1");
    await dialog.getByRole("button", {name: "Advanced options"}).click();
    await field("Domain controller (KDC)").fill("dc2.lab.example.com");
    await password.fill("secret");
}

async function expectJoinRestored(page) {
    const {dialog, field, password} = joinDialog(page);
    await expectText(dialog, RESTORED_JOIN);
    assert.equal(await field("Domain").inputValue(), "lab.example.com");
    assert.equal(await field("Account").inputValue(), "Administrator");
    assert.equal(await field("DNS servers").inputValue(), "10.0.0.1");
    assert.equal(await field("Domain controller (KDC)").inputValue(), "dc2.lab.example.com");
    assert.equal(await password.inputValue(), "");
}

imitated("the options: what was changed is marked as before, and saved", async ({page, go, imitation, accessible, picture}) => {
    await go("/options");
    await page.getByRole("checkbox", {name: SIGN}).check();
    await depth(page).fill("7");
    imitation.endSession();
    await save(page).click();
    await logInAgain(page);
    await expectText(page, RESTORED);
    await expectText(page, "2 changes are not saved.");
    assert.equal(await depth(page).inputValue(), "7");
    await accessible();
    await picture("options-restored");
    await save(page).click();
    await expectText(page, "Saved.");
    await expectGone(page.getByText(RESTORED));
    assert.deepEqual(imitation.callsOf("Conf.set").map((call) => call.parameters),
        [{enable_server_signing: true, domain_nested_group: 7}]);
    // Once saved it is nobody's draft any more.
    imitation.endSession();
    await page.getByRole("link", {name: "Events", exact: true}).click();
    await logInAgain(page);
    await page.getByRole("link", {name: "Options", exact: true}).click();
    await expectText(page, "Nothing is changed.");
    await expectGone(page.getByText(RESTORED));
});

imitated("the options: what another stored meanwhile is not overwritten", async ({page, go, imitation}) => {
    await go("/options");
    await depth(page).fill("7");
    imitation.endSession();
    await save(page).click();
    await expectText(page, "Your session ended.");
    imitation.state.options = {...imitation.state.options, domain_nested_group: 20};
    await logInAgain(page);
    await expectText(page, /stored elsewhere is 20, entered here is 7/);
    assert.equal(imitation.callsOf("Conf.set").length, 0);
});

imitated("the schedule: what was entered is there again", async ({page, go, imitation, accessible}) => {
    await go("/schedule");
    await page.getByRole("checkbox", {name: "Friday"}).check();
    const words = await page.getByRole("region", {name: "The schedule in words"}).getByRole("status").textContent();
    imitation.endSession();
    await save(page).click();
    await logInAgain(page);
    await expectText(page, RESTORED);
    await accessible();
    assert.equal(await page.getByRole("checkbox", {name: "Friday"}).isChecked(), true);
    await expectText(page.getByRole("region", {name: "The schedule in words"}), words);
    await save(page).click();
    await expectText(page, "Saved.");
});

imitated("a join: the fields are there again, the password is not, and it can be sent", WORKGROUP,
    async ({page, go, imitation, accessible, picture}) => {
        await go("/join");
        await fillJoin(page);
        imitation.endSession();
        await joinDialog(page).submit.click();
        await logInAgain(page);
        await expectJoinRestored(page);
        await accessible();
        await picture("join-restored");
        const {dialog, password, submit} = joinDialog(page);
        await password.fill("secret");
        await submit.click();
        await expectText(dialog, "The appliance is a member of lab.example.com.");
        await dialog.getByRole("button", {name: "Close"}).last().click();
        assert.equal(imitation.callsOf("set").length, 1);
        assert.equal(imitation.callsOf("set")[0].parameters.username, "Administrator");
    });

imitated("a join: also when the session ends by itself, or while the call is on its way", WORKGROUP,
    async ({page, go, imitation}) => {
        await go("/join");
        await fillJoin(page);
        imitation.on("set", () => {
            imitation.endSession();
            throw failure(220);
        });
        await joinDialog(page).submit.click();
        await logInAgain(page);
        await expectJoinRestored(page);
        // A dialog that was closed has nothing to be restored.
        await page.getByRole("dialog").getByRole("button", {name: "Cancel"}).click();
        imitation.endSession();
        await page.getByRole("link", {name: "Events", exact: true}).click();
        await logInAgain(page);
        await go("/join");
        assert.equal(await joinDialog(page).field("Domain").inputValue(), "");
    });

imitated("another user finds nothing of it", WORKGROUP, async ({page, go, imitation}) => {
    imitation.state.accounts.push({user: "operator", password: "right"});
    await go("/join");
    await fillJoin(page);
    imitation.endSession();
    await joinDialog(page).submit.click();
    await logInAgain(page, "operator");
    assert.equal(await joinDialog(page).field("Domain").inputValue(), "");
    await expectGone(page.getByText(RESTORED_JOIN));
});
