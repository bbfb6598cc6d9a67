// Tests of the page as an appliance of the lab serves it: through TLS, with real sessions and real domains behind it.
// One lab for all files. The runner brings it up and names its folder in VORN_LAB; a file that is run alone has its own.

import {promises as fs} from "node:fs";
import path from "node:path";
import {after, before} from "node:test";

import {checkAccessibility} from "../lib/axe.mjs";
import {closeAll, makeTest, until} from "../lib/fixture.mjs";
import {freePort} from "../lib/page_server.mjs";
import {takePicture} from "../lib/pictures.mjs";
import {OUTPUT} from "../lib/places.mjs";
import {bringUp, HOST} from "./bring_up.mjs";
import {Lab, password} from "./lab.mjs";

export const ADMINISTRATOR = {user: "Administrator", password: password("LAB", "Administrator")};
// The appliance's own administrator, as the lab makes one.
export const ADMIN = {user: "admin", password: password("local", "admin")};
export const GUEST = {user: "guest", password: password("local", "guest")};

let own;
export let lab;
// The page's address.
export let base;

before(async () => {
    if (process.env.VORN_LAB) {
        lab = new Lab(process.env.VORN_LAB);
    } else {
        own = await bringUp();
        lab = own.lab;
    }
});

after(() => closeAll(async () => own?.down()));

// The appliance as it is before its first start, its servers running; no account of it is left in the domain.
export async function renew() {
    await lab.must(["renew", HOST]);
    await lab.exec("dc1", ["sh", "-c", `ldbsearch -H /var/lib/samba/private/sam.ldb "(sAMAccountName=$1$)" dn |
        sed -n "s/^dn: //p" | while read -r dn; do ldbdel -r -H /var/lib/samba/private/sam.ldb "$dn"; done`, "remove",
        HOST.toUpperCase()]);
    await lab.must(["vornd", HOST, "start"]);
    base = `https://127.0.0.1:${await freePort()}`;
    await startHttpd();
}

// At the address that it had before: pages that are open go on with it.
export const startHttpd = () => lab.must(["httpd", HOST, "start", "--listen", new URL(base).host]);

export async function oneTimeLink() {
    const {out} = await lab.mustExec(HOST, ["/usr/vorn/bin/vornctl", "link"]);
    return out.match(/#\/link\/[A-Za-z0-9_-]+/)[0];
}

// A call past the page, by the appliance's command line; answers the data.
export async function call(api, version, method, parameters = {}) {
    const {out} = await lab.mustExec(HOST, ["/usr/vorn/bin/vornctl", "call", api, version, method, "-"],
        {deadline: 300, input: JSON.stringify(parameters)});
    return JSON.parse(out);
}

export const joinByCall = () => call("VORN.Core.Directory.Domain", 1, "set", {
    enable_domain: true, domain_name: "lab.test", username: ADMINISTRATOR.user, password: ADMINISTRATOR.password,
});

// options: before (what makes the appliance ready, such as renew), and those of makeTest.
// What a body gets: page, context; logIn(); accessible() and picture(name).
export const real = makeTest({
    base: async (options) => {
        await options.before?.();
        return base;
    },
    prepare: (given) => ({
        logIn: async (view = "/overview", page = given.page) => {
            await page.goto(`/#${view}`);
            await page.getByRole("textbox", {name: "User name"}).fill(ADMIN.user);
            await page.getByLabel(/^Password/).fill(ADMIN.password);
            await page.getByRole("button", {name: "Log in"}).click();
            // A dialog that the view opens at once hides all else from who looks for roles.
            await page.getByRole("button", {name: /^Menu of/, includeHidden: true}).waitFor();
        },
        accessible: (page = given.page) => checkAccessibility(page),
        picture: (name, page = given.page) => takePicture(page, `real-${name}`),
    }),
});

// Adds figures to the file that is kept with the results.
export async function keepFigures(figures) {
    const file = path.join(OUTPUT, "figures.json");
    let before = {};
    try {
        before = JSON.parse(await fs.readFile(file, "utf8"));
    } catch {
        // The first ones.
    }
    await fs.mkdir(OUTPUT, {recursive: true});
    await fs.writeFile(file, `${JSON.stringify({...before, ...figures}, null, 4)}\n`);
}

export {HOST, until};
