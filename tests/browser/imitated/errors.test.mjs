// Each error code of the catalogue shows its own text, wherever it comes from.

import assert from "node:assert/strict";

import {ERRORS, METHODS} from "../lib/catalogue.mjs";
import {nameOf} from "../lib/imitation.mjs";
import {firstState, memberState} from "../lib/imitated_state.mjs";
import {imitated} from "./page.mjs";
import {expectError, expectGone, expectText} from "./views.mjs";

// These don't show as an error of a view, but as the log-in or as the server being lost.
const OTHERWISE = [220, 250];

imitated("each code of the catalogue shows its meaning, cause, remedy and number", {seconds: 120},
    async ({page, go, imitation}) => {
        imitation.fail("list", ERRORS[0].code);
        await go("/events");
        let shown = 0;
        for (const {code} of ERRORS.filter((entry) => !OTHERWISE.includes(entry.code))) {
            imitation.fail("list", code);
            // A token that is refused is asked for again once, which is no fault here.
            if (shown > 0) {
                await page.getByRole("button", {name: "Try again"}).click();
            }
            await expectError(page, code);
            shown++;
        }
        assert.ok(shown > 50, `${shown} codes`);
    });

imitated("a code that the page does not know is shown with its number", async ({page, go, imitation, accessible}) => {
    imitation.on("list", () => {
        const error = new Error("unknown");
        error.answer = {status: 200, body: {success: false, error: {code: 4711}}};
        throw error;
    });
    await go("/events");
    await expectText(page.getByRole("alert"), "Code 4711");
    await expectText(page.getByRole("alert"), /a code that this page does not know/);
    await accessible();
});

imitated("what the appliance adds to a code stands in the details, as text and not as markup",
    async ({page, go, imitation}) => {
        imitation.fail("list", 2618, {errors: "<img src=x onerror=alert(1)> reason"});
        await go("/events");
        await page.getByRole("button", {name: "Details"}).click();
        await expectText(page, /<img src=x onerror=alert\(1\)> reason/);
    });

// The codes that a join can end with, from the description of "set".
const JOIN_CODES = METHODS.find((method) => nameOf(method.api, method.method) === "set").codes;

imitated("each code of a join shows in the dialog, which stays usable with its values but the password",
    {state: firstState(), seconds: 120}, async ({page, go, imitation}) => {
        imitation.state.stepMs = 1;
        imitation.state.joinSteps = ["discover", "join"];
        await go("/join");
        const dialog = page.getByRole("dialog");
        await dialog.getByRole("textbox", {name: "Domain", exact: true}).fill("lab.example.com");
        await dialog.getByRole("textbox", {name: "Account", exact: true}).fill("Administrator");
        for (const code of JOIN_CODES) {
            imitation.state.failing = {step: "join", code, message: "the join tool's word"};
            await dialog.getByLabel(/^Password/).fill("secret");
            await dialog.getByRole("button", {name: /^(Join|Try again)$/}).click();
            await expectError(dialog, code);
            assert.equal(await dialog.getByLabel(/^Password/).inputValue(), "");
            assert.equal(await dialog.getByRole("textbox", {name: "Domain", exact: true}).inputValue(), "lab.example.com");
            assert.equal(await dialog.getByRole("textbox", {name: "Account", exact: true}).inputValue(), "Administrator");
        }
        assert.equal(imitation.callsOf("set").length, JOIN_CODES.length);
    });

imitated("each code of a leave shows in its dialog", {state: memberState({stepMs: 1}), seconds: 60},
    async ({page, go, imitation}) => {
        const {codes} = METHODS.find((method) => nameOf(method.api, method.method) === "leave");
        await go("/leave");
        const dialog = page.getByRole("dialog");
        for (const code of codes) {
            imitation.fail("leave", code);
            await dialog.getByLabel(/Type LAB to confirm/).fill("LAB");
            await dialog.getByRole("button", {name: "Leave domain"}).click();
            await expectError(dialog, code);
        }
        imitation.mend("leave");
        await dialog.getByRole("button", {name: "Cancel"}).click();
        await expectGone(dialog);
    });
