// Pictures of views, kept with the results.

import {promises as fs} from "node:fs";
import path from "node:path";

import {OUTPUT} from "./places.mjs";

export const PICTURES = path.join(OUTPUT, "screenshots");

export async function takePicture(page, name) {
    await fs.mkdir(PICTURES, {recursive: true});
    await page.evaluate(() => document.fonts.ready);
    await page.screenshot({path: path.join(PICTURES, `${name}.png`), animations: "disabled", caret: "hide"});
}
