// Every view in every state that can be seen: what the appliance is like, what is clicked before.

import {endRefresh, firstState, manyDomains, manyEntries, memberState, SOME_TIME} from "../lib/imitated_state.mjs";
import {expectError, expectText, VIEWS} from "./views.mjs";

const OUT = {loggedIn: false};
const UNITS = {
    domains: [["--", "", "LAB"], ["Storage", "Storage", "Storage"], ["Büro Süd", "Büro Süd", "Büro Süd"]],
};
const NO_TRUST = () => {
    const state = memberState(UNITS);
    state.member.manage_mode = 1;
    return state;
};

async function fillJoin(page) {
    const dialog = page.getByRole("dialog");
    await dialog.getByRole("textbox", {name: "Domain", exact: true}).fill("lab.example.com");
    await dialog.getByRole("textbox", {name: "Account", exact: true}).fill("Administrator");
    await dialog.getByLabel(/^Password/).fill("secret");
    return dialog;
}

const slowSteps = (state) => Object.assign(state, {
    stepGate: (name) => (name === "join" ? new Promise((done) => setTimeout(done, 60_000).unref()) : undefined),
});

function refreshing(imitation, state) {
    state.task = {id: "DomainUpdate_1", wanted: "", end: null};
    state.refresh = {
        running: true, kind: "user", domain: "LAB", count: 4711, domains_done: 0, domains: 2,
        started: imitation.now() - 20, updated: imitation.now(), finished: null, errors: [],
    };
}

// name: of the picture; view; state and loggedIn as the fixture takes them; before(imitation): prior to the page's
// loading; then({page, imitation}): afterwards, waits for what is to be looked at.
export const STATES = [
    {name: "login", view: "/overview", ...OUT, then: ({page}) => page.getByRole("textbox", {name: "User name"}).waitFor()},
    {name: "overview-member", view: "/overview", then: ({page}) => expectText(page, "Member of LAB")},
    {
        name: "overview-workgroup", view: "/overview", state: firstState(),
        then: ({page}) => expectText(page, "Not a member of a domain"),
    },
    {
        name: "overview-test-fails", view: "/overview",
        state: memberState({lastTest: {time: SOME_TIME, success: false, milliseconds: 4012}}),
        then: ({page}) => expectText(page, "The membership does not work"),
    },
    {
        name: "overview-refresh-runs", view: "/overview", before: (imitation) => refreshing(imitation, imitation.state),
        then: ({page}) => expectText(page, "A refresh is running"),
    },
    {
        name: "overview-refresh-failed", view: "/overview",
        before: (imitation) => {
            refreshing(imitation, imitation.state);
            endRefresh(imitation, 2623, [{domain: "OTHER", kind: "user", reason: "the controller does not answer"}]);
        },
        then: ({page}) => expectText(page, /The last refresh failed for 1 list/),
    },
    {
        name: "overview-fails", view: "/overview",
        before: (imitation) => ["get", "overview"].forEach((name) => imitation.fail(name, 2617)),
        then: ({page}) => expectText(page, "Code 2617"),
    },
    {name: "join", view: "/join", state: firstState(), then: ({page}) => page.getByRole("dialog").waitFor()},
    {
        name: "join-advanced", view: "/join", state: firstState(),
        then: async ({page}) => {
            await page.getByRole("button", {name: /^Advanced options/}).click();
            await page.getByRole("radio", {name: "Only those of"}).check();
            await page.getByRole("checkbox", {name: "eth0"}).check();
        },
    },
    {
        name: "join-wrong-fields", view: "/join", state: firstState(),
        then: async ({page}) => {
            const dialog = page.getByRole("dialog");
            await dialog.getByRole("textbox", {name: "Domain", exact: true}).fill("10.0.0.1");
            await dialog.getByRole("button", {name: "Join", exact: true}).click();
            await expectText(dialog, /^This is an address/);
        },
    },
    {
        name: "join-running", view: "/join", state: () => slowSteps(firstState()),
        then: async ({page}) => {
            const dialog = await fillJoin(page);
            await dialog.getByRole("button", {name: "Join", exact: true}).click();
            await expectText(dialog, "Log in with the account");
        },
    },
    {
        name: "join-failed", view: "/join",
        state: {...firstState(), failing: {step: "credentials", code: 2607, message: "wrong", detail: "KDC said no"}},
        then: async ({page}) => {
            const dialog = await fillJoin(page);
            await dialog.getByRole("button", {name: "Join", exact: true}).click();
            await expectError(dialog, 2607);
            await dialog.getByRole("button", {name: "Details"}).click();
            await expectText(dialog, "KDC said no");
        },
    },
    {
        name: "join-done", view: "/join", state: firstState(),
        then: async ({page}) => {
            const dialog = await fillJoin(page);
            await dialog.getByRole("button", {name: "Join", exact: true}).click();
            await expectText(dialog, /The appliance is a member of/);
        },
    },
    {name: "leave", view: "/leave", then: ({page}) => page.getByRole("dialog").waitFor()},
    {
        name: "leave-with-account", view: "/leave",
        then: async ({page}) => {
            const dialog = page.getByRole("dialog");
            await dialog.getByRole("checkbox", {name: /Delete the computer account/}).check();
            await dialog.getByLabel(/^Password/).waitFor();
        },
    },
    {
        name: "leave-failed", view: "/leave",
        before: (imitation) => imitation.fail("leave", 2614),
        then: async ({page}) => {
            const dialog = page.getByRole("dialog");
            await dialog.getByLabel(/Type LAB to confirm/).fill("LAB");
            await dialog.getByRole("button", {name: "Leave domain"}).click();
            await expectError(dialog, 2614);
        },
    },
    {
        name: "leave-done", view: "/leave",
        then: async ({page}) => {
            const dialog = page.getByRole("dialog");
            await dialog.getByLabel(/Type LAB to confirm/).fill("LAB");
            await dialog.getByRole("button", {name: "Leave domain"}).click();
            await expectText(dialog, /The appliance left LAB/);
        },
    },
    {name: "domains", view: "/domains", then: ({page}) => expectText(page, "other.example.com")},
    {name: "domains-units", view: "/domains", state: NO_TRUST, then: ({page}) => expectText(page, "Storage")},
    {
        name: "domains-5000", view: "/domains", state: () => memberState({domains: manyDomains(5000)}),
        then: ({page}) => expectText(page, "DOMAIN0007"),
    },
    {
        name: "domains-nothing-found", view: "/domains",
        then: async ({page}) => {
            await page.getByRole("searchbox").fill("nowhere");
            await expectText(page, "Nothing matches");
        },
    },
    {name: "domains-workgroup", view: "/domains", state: firstState(), then: ({page}) => expectText(page, "No member of a domain")},
    {name: "users", view: "/users", then: ({page}) => expectText(page, "hanna")},
    {
        name: "users-100000", view: "/users",
        state: () => {
            const state = memberState();
            state.entries.user.LAB = manyEntries(100_000);
            return state;
        },
        then: ({page}) => expectText(page, "user000007"),
    },
    {
        name: "users-refresh-runs", view: "/users", before: (imitation) => refreshing(imitation, imitation.state),
        then: ({page}) => expectText(page, /4,711/),
    },
    {
        name: "users-never-fetched", view: "/users", state: memberState({lists: []}),
        then: ({page}) => page.getByRole("button", {name: /Refresh/}).first().waitFor(),
    },
    {
        name: "users-nothing-found", view: "/users",
        then: async ({page}) => {
            await page.getByRole("searchbox").fill("nobody-like-this");
            await expectText(page, "Nothing matches");
        },
    },
    {
        name: "users-fail", view: "/users", before: (imitation) => imitation.fail("users", 2617),
        then: ({page}) => expectText(page, "Code 2617"),
    },
    {name: "users-workgroup", view: "/users", state: firstState(), then: ({page}) => expectText(page, "No member of a domain")},
    {name: "groups", view: "/groups", then: ({page}) => expectText(page, "Domain Admins")},
    {name: "options", view: "/options", then: ({page}) => expectText(page, "Depth of groups within groups")},
    {
        name: "options-changed", view: "/options",
        then: async ({page}) => {
            await page.getByRole("checkbox").first().check();
            await page.getByLabel("Depth of groups within groups").fill("0");
            await expectText(page, /Enter a whole number from 1 to 99/);
        },
    },
    {
        name: "options-saved", view: "/options",
        then: async ({page}) => {
            await page.getByRole("checkbox").first().check();
            await page.getByRole("button", {name: "Save"}).click();
            await expectText(page, "Saved.");
        },
    },
    {name: "schedule", view: "/schedule", then: ({page}) => expectText(page, /Every Sunday and Wednesday at 03:30/)},
    {
        name: "schedule-date", view: "/schedule",
        then: async ({page}) => {
            await page.getByRole("radio", {name: "From a date on"}).check();
            await page.getByLabel("First day").fill("2026-12-31");
            await page.getByLabel("Repeat").selectOption({label: "Every month"});
            await page.getByLabel("Again on the same day").selectOption({label: "Every 2 hours"});
            await expectText(page, /Every month/);
        },
    },
    {
        name: "schedule-never", view: "/schedule", state: memberState({schedule: {date_type: 2}}),
        then: ({page}) => expectText(page, /There is no schedule/),
    },
    {name: "schedule-workgroup", view: "/schedule", state: firstState(), then: ({page}) => expectText(page, "No member of a domain")},
    {name: "events", view: "/events", then: ({page}) => expectText(page, "The appliance joined the domain LAB.")},
    {
        name: "events-none", view: "/events", state: memberState({events: []}),
        then: ({page}) => expectText(page, "No events yet"),
    },
    ...VIEWS.map(({name, path}) => ({
        name: `loading-${name.toLowerCase()}`, view: path,
        before: (imitation) => ["get", "overview", "get_domain_list", "users", "groups", "domains", "Conf.get",
            "Schedule.get", "list", "refresh_progress"].forEach((method) => imitation.hold(method)),
        then: ({page}) => expectText(page.getByRole("main").getByRole("status"), /Loading|…/),
    })),
    {
        name: "menu", view: "/overview",
        then: async ({page}) => {
            await page.getByRole("button", {name: "Menu of admin"}).click();
            await page.getByRole("menuitem", {name: "Log out"}).waitFor();
        },
    },
];
