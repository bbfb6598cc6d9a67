// Where things are: the project's folders, and what the runner was told.

import {fileURLToPath} from "node:url";
import path from "node:path";

export const PROJECT = path.resolve(path.dirname(fileURLToPath(import.meta.url)), "../../..");
export const OUTPUT = process.env.VORN_BROWSER_OUTPUT ?? path.join(PROJECT, "build/browser");
export const PAGE_FOLDER = process.env.VORN_PAGE ?? path.join(PROJECT, "console/dist");
export const STAGE = process.env.VORN_STAGE ?? path.join(PROJECT, "build/stage");
export const CATALOGUE = path.join(PROJECT, "appliance/catalogue");
