// A test with a page of its own: a context for each test, a deadline, a watch on the console and the network. A test
// that fails leaves a picture of its page and the console's text in the output's folder "failed".

import {promises as fs} from "node:fs";
import path from "node:path";
import {test} from "node:test";

import {closeBrowser, theBrowser} from "./browser.mjs";
import {OUTPUT} from "./places.mjs";
import {Watch} from "./watch.mjs";

const TEST_SECONDS = 120;
// How long one step of a test waits for the page, unless it says otherwise.
const STEP_MS = 30_000;

// One sleep for all: browser tests wait for what the page shows, and use this only to see that nothing happens.
export const pause = (ms) => new Promise((done) => setTimeout(done, ms));

// Waits until the condition holds and answers its value.
export async function until(what, condition, ms = STEP_MS) {
    const end = Date.now() + ms;
    for (;;) {
        const value = await condition();
        if (value) {
            return value;
        }
        if (Date.now() > end) {
            throw new Error(`${what}: not within ${ms} ms`);
        }
        await pause(20);
    }
}

// makeTest({base, prepare, finish}) answers a function test(name, [options], body). "base" answers the page's address and
// gets the test's options; "prepare" may add to what the body gets; "finish" may throw when something is wrong at the end.
// options: seconds (deadline), context (options of the browser's context).
export function makeTest({base, prepare, finish}) {
    return (name, ...rest) => {
        const body = rest.pop();
        const {seconds = TEST_SECONDS, context: contextOptions = {}, ...others} = rest.pop() ?? {};
        test(name, {timeout: (seconds + 60) * 1000}, async () => {
            const address = await base(others);
            const browser = await theBrowser();
            const context = await browser.newContext({
                baseURL: address,
                viewport: {width: 1280, height: 900},
                locale: "en-GB",
                timezoneId: "UTC",
                reducedMotion: "reduce",
                ignoreHTTPSErrors: true,
                ...contextOptions,
            });
            context.setDefaultTimeout(STEP_MS);
            const watch = new Watch(address);
            try {
                await watch.attach(context);
                const given = {name, base: address, context, watch, options: others};
                Object.assign(given, await prepare?.(given));
                given.page = await context.newPage();
                await within(seconds, name, body(given));
                watch.judge();
                await finish?.(given);
            } catch (error) {
                await leaveTraces(name, context, watch, error);
                throw error;
            } finally {
                await context.close();
            }
        });
    };
}

async function within(seconds, name, work) {
    let timer;
    const late = new Promise((resolve, reject) => {
        timer = setTimeout(() => reject(new Error(`"${name}" did not end within ${seconds} s`)), seconds * 1000);
    });
    try {
        return await Promise.race([work, late]);
    } finally {
        clearTimeout(timer);
        // What still runs after the deadline fails when its context is closed; nobody waits for that.
        work.catch(() => {});
    }
}

async function leaveTraces(name, context, watch, error) {
    const folder = path.join(OUTPUT, "failed");
    const stem = path.join(folder, name.replaceAll(/[^A-Za-z0-9]+/g, "_").slice(0, 100));
    await fs.mkdir(folder, {recursive: true});
    await fs.writeFile(`${stem}.txt`, `${error.stack ?? error}\n\nConsole:\n${watch.lines.join("\n")}\n`);
    for (const [index, page] of context.pages().entries()) {
        await page.screenshot({path: `${stem}${index || ""}.png`, timeout: 5000}).catch(() => {});
    }
}

// To be called once by each file, after its tests: a browser that is open would keep the process.
export async function closeAll(...others) {
    await closeBrowser();
    for (const other of others) {
        await other();
    }
}
