// The fixture itself: what must never happen on the page is noticed when it happens.

import assert from "node:assert/strict";
import {after, test} from "node:test";

import {closeBrowser, theBrowser} from "../lib/browser.mjs";
import {Watch} from "../lib/watch.mjs";

const BASE = "http://127.0.0.1:9";
const POLICY = "default-src 'none'; script-src 'self'; style-src 'self'; connect-src 'self' http://127.0.0.1:10";

after(closeBrowser);

async function faultsOf(script, html = "", prepare = () => {}) {
    const context = await (await theBrowser()).newContext();
    const watch = new Watch(BASE);
    prepare(watch);
    try {
        await watch.attach(context);
        await context.route("**/*", (route) => {
            const {pathname, port} = new URL(route.request().url());
            if (pathname.startsWith("/session") || port === "10") {
                return route.fulfill({status: 401, body: "{}", headers: {"access-control-allow-origin": "*"}});
            }
            if (pathname.startsWith("/assets/")) {
                return route.abort(pathname.slice("/assets/".length));
            }
            return pathname === "/script.js" ? route.fulfill({contentType: "text/javascript", body: script})
                : route.fulfill({
                    contentType: "text/html",
                    headers: {"content-security-policy": POLICY},
                    body: `<!doctype html><title>x</title>${html}<script src="/script.js"></script><p id="end">end</p>`,
                });
        });
        const page = await context.newPage();
        await page.goto(`${BASE}/`);
        await page.locator("#end").waitFor();
        await page.evaluate(() => new Promise((done) => setTimeout(done, 600)));
        return watch.faults.join("\n");
    } finally {
        await context.close();
    }
}

test("a quiet page has no faults", async () => {
    assert.equal(await faultsOf("console.log('fine');"), "");
});

test("the browser's own line about an answer of 401 to the API is no fault", async () => {
    assert.equal(await faultsOf("fetch('/session');"), "");
});

const LOST_FILES = ["connectionrefused", "connectionreset", "connectionclosed"];
const asking = (reason) => `const tag = document.createElement("script"); tag.src = "/assets/${reason}";
    document.head.append(tag);`;

for (const reason of LOST_FILES) {
    test(`a file that nobody sends (${reason}) is a fault, unless the server may be gone`, async () => {
        assert.match(await faultsOf(asking(reason)), /console: Failed to load resource.*assets/);
        assert.equal(await faultsOf(asking(reason), "", (watch) => watch.expectServerGone()), "");
    });
}

test("a file that fails for another reason is a fault also when the server may be gone", async () => {
    assert.match(await faultsOf(asking("accessdenied"), "", (watch) => watch.expectServerGone()),
        /console: Failed to load resource.*assets/);
});

for (const [what, script, html, pattern] of [
    ["an error in the console", "console.error('broken');", "", /console: broken/],
    ["an exception", "throw new Error('thrown');", "", /exception: .*thrown/],
    ["a rejection that nobody catches", "Promise.reject(new Error('rejected'));", "", /exception: .*rejected/],
    ["a request to another host", "fetch('http://127.0.0.1:10/');", "", /another host: http:\/\/127\.0\.0\.1:10/],
    ["a file that is missing", "", "<link rel=stylesheet href=http://127.0.0.1:9/session.css>",
        /console: Failed to load resource.*session\.css/],
    ["an inline style", "", "<p style='color: red'>text</p>", /violation of the policy: style-src/],
    ["an inline script", "", "<script>window.a = 1;</script>", /violation of the policy: script-src/],
]) {
    test(`${what} is a fault`, async () => {
        assert.match(await faultsOf(script, html), pattern);
    });
}
