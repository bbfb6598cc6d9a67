// Debian's Chromium. The runner starts one and names it in VORN_BROWSER; a file that is run alone starts its own.

import {chromium} from "playwright-core";

const OPTIONS = {
    executablePath: process.env.VORN_CHROMIUM ?? "/usr/bin/chromium",
    timeout: 30_000,
    args: [
        // Root has no sandbox to give; what is opened here is the project's own page.
        ...(process.getuid() === 0 ? ["--no-sandbox"] : []),
        // The shared memory of containers is small.
        "--disable-dev-shm-usage",
        // Nothing is looked up in any DNS, whatever a page asks for.
        "--host-resolver-rules=MAP * ~NOTFOUND, EXCLUDE 127.0.0.1, EXCLUDE localhost",
        "--disable-background-networking",
    ],
};

export function launchServer() {
    return chromium.launchServer({...OPTIONS, handleSIGINT: false, handleSIGTERM: false, handleSIGHUP: false});
}

let browser;

export async function theBrowser() {
    if (!browser?.isConnected()) {
        const address = process.env.VORN_BROWSER;
        browser = address ? await chromium.connect(address, {timeout: 30_000}) : await chromium.launch(OPTIONS);
    }
    return browser;
}

export async function closeBrowser() {
    await browser?.close();
    browser = undefined;
}
