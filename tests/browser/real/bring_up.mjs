// The lab of the tests: two domains that trust each other, and the appliance whose page is looked at.

import {promises as fs} from "node:fs";
import os from "node:os";
import path from "node:path";

import {STAGE} from "../lib/places.mjs";
import {Lab} from "./lab.mjs";

export const HOST = "nas1";

// Answers the lab and how to take it down.
export async function bringUp() {
    const folder = await fs.mkdtemp(path.join(os.tmpdir(), "vorn-browser-"));
    const lab = new Lab(path.join(folder, "lab"));
    try {
        await lab.up("--trust", "--appliances", HOST, "--stage", STAGE);
    } catch (error) {
        await fs.rm(folder, {recursive: true, force: true});
        throw error;
    }
    return {
        lab,
        down: async () => {
            await lab.down();
            await fs.rm(folder, {recursive: true, force: true});
        },
    };
}
