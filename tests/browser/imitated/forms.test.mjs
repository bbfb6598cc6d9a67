// Options and schedule: what is stored, what is changed, saved once, two tabs.

import assert from "node:assert/strict";

import {pause, until} from "../lib/fixture.mjs";
import {memberState} from "../lib/imitated_state.mjs";
import {imitated} from "./page.mjs";
import {expectError, expectGone, expectText} from "./views.mjs";

const depth = (page) => page.getByLabel("Depth of groups within groups");
const save = (page) => page.getByRole("button", {name: "Save"});
const SIGN = "Sign connections when the client asks for it";

imitated("options: what is changed is marked, and only that is sent, once", async ({page, go, imitation}) => {
    await go("/options");
    await page.getByRole("checkbox", {name: SIGN}).check();
    await expectText(page, "Stored: Off");
    await expectText(page, "1 change is not saved.");
    await depth(page).fill("7");
    await expectText(page, "2 changes are not saved.");
    const release = imitation.hold("Conf.set");
    await save(page).dblclick();
    await until("the call", () => imitation.callsOf("Conf.set").length > 0);
    await pause(200);
    assert.equal(imitation.callsOf("Conf.set").length, 1);
    release();
    await expectText(page, "Saved.");
    assert.deepEqual(imitation.callsOf("Conf.set")[0].parameters, {enable_server_signing: true, domain_nested_group: 7});
    await expectText(page, "Nothing is changed.");
    await page.reload();
    await depth(page).waitFor();
    assert.equal(await depth(page).inputValue(), "7");
    assert.equal(await page.getByRole("checkbox", {name: SIGN}).isChecked(), true);
});

imitated("options: a depth that would count as 1 is not sent", async ({page, go, imitation}) => {
    await go("/options");
    for (const text of ["0", "100", "-1", "1.5", "", "abc", "٣", "1e1"]) {
        await depth(page).fill(text);
        await expectText(page, "Enter a whole number from 1 to 99. Anything else would count as 1.");
        await depth(page).press("Enter");
    }
    await pause(200);
    assert.equal(imitation.callsOf("Conf.set").length, 0);
    await depth(page).fill("99");
    await save(page).click();
    await expectText(page, "Saved.");
});

imitated("options: a failure keeps what was entered", async ({page, go, imitation}) => {
    await go("/options");
    await depth(page).fill("5");
    imitation.fail("Conf.set", 2617);
    await save(page).click();
    await expectError(page, 2617);
    assert.equal(await depth(page).inputValue(), "5");
    imitation.mend("Conf.set");
    await save(page).click();
    await expectText(page, "Saved.");
});

imitated("options: two tabs that change different things lose nothing", async ({page, go, context, imitation}) => {
    await go("/options");
    const other = await context.newPage();
    await go("/options", other);
    await other.getByRole("checkbox", {name: SIGN}).check();
    await save(other).click();
    await expectText(other, "Saved.");
    await page.bringToFront();
    await depth(page).fill("3");
    await save(page).click();
    await expectText(page, "Saved.");
    assert.equal(imitation.state.options.enable_server_signing, true);
    assert.equal(imitation.state.options.domain_nested_group, 3);
});

imitated("options: two tabs that change the same are asked what shall hold", async ({page, go, context, imitation}) => {
    await go("/options");
    const other = await context.newPage();
    await go("/options", other);
    await depth(page).fill("3");
    await depth(other).fill("4");
    await save(other).click();
    await expectText(other, "Saved.");
    await page.bringToFront();
    await save(page).click();
    await expectText(page, "Something else was stored meanwhile");
    assert.equal(imitation.state.options.domain_nested_group, 4);
    await page.getByRole("button", {name: "Keep what is entered here"}).click();
    await save(page).click();
    await expectText(page, "Saved.");
    assert.equal(imitation.state.options.domain_nested_group, 3);
});

for (const [how, goAway] of [
    ["a link", (page) => page.getByRole("link", {name: "Events", exact: true}).click()],
    ["the back button", (page) => page.goBack()],
]) {
    imitated(`options: leaving with changes by ${how} asks`, async ({page, go, accessible}) => {
        await go("/events");
        await page.getByRole("link", {name: "Options", exact: true}).click();
        await depth(page).fill("9");
        await goAway(page);
        const dialog = page.getByRole("dialog");
        await expectText(dialog, "Leave without saving?");
        await accessible();
        await dialog.getByRole("button", {name: "Stay here"}).click();
        await expectGone(dialog);
        assert.equal(await depth(page).inputValue(), "9");
        assert.equal(new URL(page.url()).hash, "#/options");
        await page.getByRole("link", {name: "Events", exact: true}).click();
        await dialog.getByRole("button", {name: "Leave and discard the changes"}).click();
        await page.getByRole("heading", {level: 1, name: "Events"}).waitFor();
    });
}

imitated("options: discard brings back what is stored", async ({page, go}) => {
    await go("/options");
    await depth(page).fill("9");
    await page.getByRole("button", {name: "Discard changes"}).click();
    assert.equal(await depth(page).inputValue(), "1");
    await expectText(page, "Nothing is changed.");
});

imitated("schedule: stored in words, changed in words, saved once", async ({page, go, imitation}) => {
    await go("/schedule");
    await expectText(page, "Every Sunday and Wednesday at 03:30.");
    await page.getByRole("checkbox", {name: "Wednesday"}).uncheck();
    await page.getByLabel("Hour").selectOption("04");
    await expectText(page, "Every Sunday at 04:30.");
    const release = imitation.hold("Schedule.set");
    await save(page).dblclick();
    await until("the call", () => imitation.callsOf("Schedule.set").length > 0);
    await pause(200);
    assert.equal(imitation.callsOf("Schedule.set").length, 1);
    release();
    await expectText(page, "Saved.");
    const {parameters} = imitation.callsOf("Schedule.set")[0];
    assert.deepEqual([parameters.date_type, parameters.week_name, parameters.hour, parameters.min], [0, "0", 4, 30]);
});

imitated("schedule: from a date on, several times a day", async ({page, go, imitation}) => {
    await go("/schedule");
    await page.getByRole("radio", {name: "From a date on"}).check();
    await page.getByLabel("First day").fill("2026-11-29");
    await page.getByLabel("Repeat").selectOption({label: "Every seventh day"});
    await page.getByLabel("Again on the same day").selectOption({label: "Every 2 hours"});
    await page.getByLabel("Not later than").selectOption({label: "09:30"});
    await expectText(page, /Every seventh day from .*2026.* on, at 03:30 and every 2 hours from then to 09:30\./);
    await save(page).click();
    await expectText(page, "Saved.");
    const {parameters} = imitation.callsOf("Schedule.set")[0];
    assert.equal(parameters.date_type, 1);
    assert.match(parameters.date, /^2026\/11\/29$/);
    assert.deepEqual([parameters.repeat, parameters.repeat_hour, parameters.last_work_hour], [2, 2, 9]);
});

imitated("schedule: the next runs are those of the appliance's clock", async ({page, go, imitation, picture}) => {
    // Noon of the next day, far from any midnight.
    imitation.state.utcOffset = 36 * 3600 - (imitation.now() % 86_400);
    const there = new Date((imitation.now() + imitation.state.utcOffset) * 1000);
    imitation.state.schedule = {date: "", date_type: 0, hour: 23, last_work_hour: 0, min: 59, repeat: 0, repeat_hour: 0,
        week_name: "0,1,2,3,4,5,6"};
    await go("/schedule");
    const day = there.toLocaleDateString("en", {dateStyle: "full", timeZone: "UTC"});
    await expectText(page.getByRole("listitem").filter({hasText: "23:59"}).first(), day);
    await expectText(page, /its own clock, which shows .* at 12:0[0-9]\.$/);
    await picture("schedule-clock");
});

imitated("schedule: no day, or a day that is none, is not sent", async ({page, go, imitation}) => {
    await go("/schedule");
    await page.getByRole("checkbox", {name: "Sunday"}).uncheck();
    await page.getByRole("checkbox", {name: "Wednesday"}).uncheck();
    await expectText(page, "Choose at least one day.");
    await save(page).click({force: true});
    await page.getByRole("radio", {name: "From a date on"}).check();
    await page.getByLabel("First day").fill("");
    await expectText(page, "Choose a day that exists, from 1970 on.");
    await save(page).click({force: true});
    await pause(200);
    assert.equal(imitation.callsOf("Schedule.set").length, 0);
});

imitated("schedule: removed", async ({page, go, imitation}) => {
    await go("/schedule");
    await page.getByRole("radio", {name: "By hand only"}).check();
    await expectText(page, "Saving removes the schedule that is stored.");
    await save(page).click();
    await expectText(page, "Saved.");
    assert.deepEqual(imitation.callsOf("Schedule.set")[0].parameters, {date_type: 2});
    await expectText(page, "There is no schedule: users and groups are refreshed by hand only.");
});

imitated("schedule: every stored kind is shown in words", {state: memberState()}, async ({page, go, imitation}) => {
    const none = {date: "", date_type: 0, hour: 0, last_work_hour: 0, min: 0, repeat: 0, repeat_hour: 0, week_name: ""};
    for (const [stored, words] of [
        [{week_name: "0,1,2,3,4,5,6", hour: 3, min: 30}, "Every day at 03:30."],
        [{week_name: "1", hour: 0, min: 5, repeat_hour: 1, last_work_hour: 6}, "Every Monday at 00:05 and every hour from then to 06:05."],
        [{date_type: 1, date: "2026/12/24", repeat: 0, hour: 20}, /Once, on .*24.*2026.*, at 20:00\./],
        [{date_type: 1, date: "2026/12/31", repeat: 3, hour: 1}, /Every month on day 31, or its last one, from 2026\/12\/31 on, at 01:00\./],
    ]) {
        imitation.state.schedule = {...none, ...stored};
        await go("/schedule");
        await page.reload();
        await expectText(page, words);
    }
});

imitated("schedule: leaving the domain elsewhere meanwhile is told", async ({page, go, imitation}) => {
    await go("/schedule");
    await page.getByLabel("Hour").selectOption("05");
    imitation.state.member = null;
    await save(page).click();
    await expectText(page, "Without a domain there is nothing to schedule.");
    await expectGone(save(page));
    assert.equal(imitation.callsOf("Schedule.set").filter((call) => call.answer?.success).length, 0);
});
