// The server lost and back, answers that are none, and deadlines: nothing turns for ever.

import assert from "node:assert/strict";

import {pause, until} from "../lib/fixture.mjs";
import {nonsense} from "../lib/imitation.mjs";
import {imitated} from "./page.mjs";
import {expectGone, expectText, VIEWS} from "./views.mjs";

const LOST = "The appliance does not answer.";
const BACK = "The appliance answers again.";
// The longest that a call but a join may take, as the page promises, and some air.
const DEADLINE_MS = 61_000;

imitated("the server is lost, which shows, and is back, which shows, without a key being pressed",
    async ({page, go, imitation, accessible, picture}) => {
        await go("/options");
        imitation.down();
        await page.getByRole("link", {name: "Events", exact: true}).click();
        await expectText(page.getByRole("alert"), LOST);
        await accessible();
        await picture("connection-lost");
        imitation.up();
        await expectText(page.getByRole("status"), BACK);
        await expectGone(page.getByText(LOST));
        await expectText(page, "The appliance joined the domain LAB.");
        await accessible();
        await expectGone(page.getByText(BACK));
    });

imitated("a view that is open when the server goes keeps what it shows, and goes on by itself",
    async ({page, go, imitation}) => {
        await page.clock.install();
        await go("/overview");
        await expectText(page, "LAB");
        imitation.down();
        await page.clock.runFor(60_000);
        await expectText(page.getByRole("alert"), LOST);
        await page.getByText("LAB", {exact: false}).filter({visible: true}).first().waitFor();
        imitation.up();
        // It is asked again after half a minute at the latest. That it is back is shown for some seconds only.
        await until("the news", async () => {
            await page.clock.runFor(1000);
            return page.getByText(BACK).isVisible();
        });
        await expectGone(page.getByText(LOST));
    });

imitated("a view that is opened for the first time while the server is gone comes when it is back",
    async ({page, go, imitation, context, watch}) => {
        let gone = false;
        watch.expectServerGone();
        await context.route("**/assets/**", (route) => (gone ? route.abort("connectionrefused") : route.fallback()));
        await go("/overview");
        await expectText(page, "Member of LAB");
        gone = true;
        imitation.down();
        await page.getByRole("link", {name: "Schedule", exact: true}).click();
        await expectText(page, LOST);
        gone = false;
        imitation.up();
        await expectText(page, "Every Sunday and Wednesday at 03:30.", 35_000);
    });

imitated("the server is asked again at once when that is wanted", async ({page, go, imitation}) => {
    await go("/options");
    imitation.down();
    await page.getByRole("link", {name: "Events", exact: true}).click();
    await expectText(page, LOST);
    // Several tries make the pauses long.
    await until("tries", () => imitation.callsOf("session").length >= 3);
    imitation.up();
    await page.getByRole("button", {name: "Try now"}).click();
    await expectText(page, BACK, 1000);
});

imitated("while the server is gone it is asked less and less often, and never all the time",
    async ({page, go, imitation}) => {
        await page.clock.install();
        await go("/options");
        imitation.down();
        await page.getByRole("link", {name: "Events", exact: true}).click();
        await expectText(page, LOST);
        const before = imitation.calls.length;
        for (let minute = 0; minute < 5; minute++) {
            await page.clock.runFor(60_000);
        }
        const asked = imitation.calls.length - before;
        assert.ok(asked >= 5 && asked <= 30, `asked ${asked} times in five minutes`);
    });

imitated("a page opened while the server is gone says so, and goes on when it is back",
    async ({page, imitation}) => {
        imitation.down();
        await page.goto("/#/overview");
        await expectText(page, LOST);
        imitation.up();
        await page.getByRole("heading", {level: 1, name: "Overview"}).waitFor();
    });

imitated("an answer that vornd is not there counts as lost, and recovers", async ({page, go, imitation}) => {
    await go("/options");
    imitation.fail("list", 250);
    imitation.fail("session", 250);
    await page.getByRole("link", {name: "Events", exact: true}).click();
    await expectText(page, LOST);
    imitation.mend("list");
    imitation.mend("session");
    await expectText(page, BACK);
    await expectText(page, "The appliance joined the domain LAB.");
});

for (const [what, status, text] of [
    ["a proxy's page in place of an answer", 502, "<html><h1>Bad gateway</h1></html>"],
    ["half an answer", 200, "{\"success\": true, \"da"],
    ["an answer without a result", 200, "[1, 2]"],
    ["an answer of nothing", 200, ""],
    ["null", 200, "null"],
]) {
    imitated(`${what} is shown as such, and can be tried again`, async ({page, go, imitation}) => {
        imitation.on("list", () => {
            throw nonsense(status, text);
        });
        await go("/events");
        await expectText(page.getByRole("alert"), "What came is no answer of the appliance.");
        imitation.mend("list");
        await page.getByRole("button", {name: "Try again"}).click();
        await expectText(page, "The appliance joined the domain LAB.");
    });
}

for (const {name, path} of VIEWS) {
    imitated(`nothing turns for ever in ${name}: after the deadline stands what is wrong`,
        async ({page, imitation}) => {
            await page.clock.install();
            const methods = ["get", "overview", "get_domain_list", "users", "groups", "domains", "refresh_progress",
                "Conf.get", "Schedule.get", "list", "join_steps", "update_status"];
            methods.forEach((method) => imitation.hold(method));
            await page.goto(`/#${path}`);
            await page.getByRole("heading", {level: 1, name}).waitFor();
            await expectText(page.getByRole("status"), /./);
            const alert = page.getByRole("alert").getByText(/.* (time|answer)/);
            const turning = page.locator("[role=progressbar], .pf-v6-c-spinner, .pf-v6-c-skeleton").filter({visible: true});
            let ended = false;
            // A part of the view that called later, on a busy machine, has its own deadline later.
            for (let round = 0; round < 4 && !ended; round++) {
                await page.clock.runFor(DEADLINE_MS);
                await pause(200);
                ended = await alert.count() > 0 && await turning.count() === 0;
            }
            assert.ok(ended, "something turns still, or nothing says what is wrong");
        });
}

imitated("the start of the page does not turn for ever either", async ({page, imitation}) => {
    await page.clock.install();
    imitation.hold("session");
    await page.goto("/#/overview");
    await expectText(page.getByRole("status"), "Loading…");
    await page.clock.runFor(31_000);
    await expectText(page.getByRole("alert"), /No answer came in time|does not answer/);
});
