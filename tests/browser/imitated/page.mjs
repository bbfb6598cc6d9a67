// Tests of the page with an imitated appliance behind it.

import {after} from "node:test";

import {checkAccessibility} from "../lib/axe.mjs";
import {closeAll, makeTest} from "../lib/fixture.mjs";
import {memberState} from "../lib/imitated_state.mjs";
import {Imitation} from "../lib/imitation.mjs";
import {pageServer, stopPageServer} from "../lib/page_server.mjs";
import {takePicture} from "../lib/pictures.mjs";

after(() => closeAll(stopPageServer));

// What a body gets: page, context, imitation; go(view) opens a view and waits for its heading; accessible() and
// picture(name) look at what shows now.
// options: state (of the imitation; a member of LAB when absent), loggedIn (true when absent), and those of makeTest.
export const imitated = makeTest({
    base: pageServer,
    prepare: async (given) => {
        const {state = memberState(), loggedIn = true} = given.options;
        const imitation = new Imitation(typeof state === "function" ? state() : structuredClone(state));
        if (loggedIn) {
            imitation.logIn();
        }
        await imitation.install(given.context);
        return {
            imitation,
            go: async (view = "/overview", page = given.page) => {
                await page.goto(`/#${view}`);
                await page.getByRole("heading", {level: 1}).waitFor();
            },
            accessible: (page = given.page) => checkAccessibility(page),
            picture: (name, page = given.page) => takePicture(page, name),
        };
    },
    finish: ({imitation}) => imitation.judge(),
});

export const NARROW = {viewport: {width: 360, height: 740}};
export const DARK = {colorScheme: "dark"};
