#!/usr/bin/env node
// Runs the tests of one part with one browser for all of its files.

import {promises as fs} from "node:fs";
import path from "node:path";
import {run} from "node:test";
import {fileURLToPath} from "node:url";
import {parseArgs} from "node:util";

const HERE = path.dirname(fileURLToPath(import.meta.url));
const USAGE = `usage: run.mjs imitated|real [--page FOLDER] [--httpd PROGRAM] [--stage FOLDER] [--output FOLDER]
              [--jobs N] [FILE...]

  imitated   the page with an imitated appliance behind it
  real       the page served by an appliance of a lab of its own; needs root, and the staged tree

  --page     the built page (console/dist)
  --httpd    vorn-httpd, to serve the page for "imitated"; else a small server of the tests does
  --stage    the staged tree of the project, put into the appliance (build/stage)
  --output   where pictures, figures and results go (build/browser)
  --jobs     how many files run beside each other: 2 for "imitated", always 1 for "real"
  FILE       only these, named as in the folder, such as login

Results: OUTPUT/PART.xml in JUnit's form. The code is 0 when tests ran and none failed, 2 for wrong usage, else 1.
`;
const FILE_SECONDS = {imitated: 1200, real: 1200};

function wrongUsage(text) {
    process.stderr.write(`${text}\n\n${USAGE}`);
    process.exit(2);
}

function readArguments() {
    const text = {type: "string"};
    let parsed;
    try {
        parsed = parseArgs({
            options: {page: text, httpd: text, stage: text, output: text, jobs: text, help: {type: "boolean", short: "h"}},
            allowPositionals: true,
        });
    } catch (error) {
        wrongUsage(error.message);
    }
    const {values, positionals: [part, ...names]} = parsed;
    if (values.help) {
        process.stdout.write(USAGE);
        process.exit(0);
    }
    if (!(part in FILE_SECONDS)) {
        wrongUsage("Name a part: imitated or real.");
    }
    if (values.jobs !== undefined && !/^[1-9]\d?$/.test(values.jobs)) {
        wrongUsage("--jobs takes a number from 1 to 99.");
    }
    return {...values, part, names};
}

async function filesOf({part, names}) {
    const folder = path.join(HERE, part);
    const all = (await fs.readdir(folder)).filter((name) => name.endsWith(".test.mjs")).sort();
    const unknown = names.filter((name) => !all.includes(`${name}.test.mjs`));
    if (unknown.length > 0) {
        wrongUsage(`There is no ${unknown[0]} in ${folder}.`);
    }
    const chosen = names.length > 0 ? names.map((name) => `${name}.test.mjs`) : all;
    return chosen.map((name) => path.join(folder, name));
}

// The files of the tests run as processes of their own, and know what was said here by their environment.
function passOn({page, httpd, stage, output}) {
    const given = {VORN_PAGE: page, VORN_HTTPD: httpd, VORN_STAGE: stage, VORN_BROWSER_OUTPUT: output};
    for (const [name, value] of Object.entries(given)) {
        if (value !== undefined) {
            process.env[name] = path.resolve(value);
        }
    }
}

async function main() {
    const wanted = readArguments();
    const files = await filesOf(wanted);
    passOn(wanted);
    const {OUTPUT} = await import("./lib/places.mjs");
    const {Report} = await import("./lib/report.mjs");
    const {launchServer} = await import("./lib/browser.mjs");
    await fs.mkdir(OUTPUT, {recursive: true});
    const results = path.join(OUTPUT, `${wanted.part}.xml`);
    await fs.rm(results, {force: true});
    const report = new Report((text) => process.stdout.write(`${text}\n`));
    const browser = await launchServer();
    process.env.VORN_BROWSER = browser.wsEndpoint();
    let lab;
    const end = (signal) => {
        Promise.allSettled([browser.kill(), lab?.down()]).then(() => process.exit(signal === "SIGINT" ? 130 : 143));
    };
    process.once("SIGINT", end);
    process.once("SIGTERM", end);
    try {
        if (wanted.part === "real") {
            lab = await (await import("./real/bring_up.mjs")).bringUp();
            process.env.VORN_LAB = lab.lab.folder;
        }
        const concurrency = wanted.part === "real" ? 1 : Number(wanted.jobs ?? 2);
        const stream = run({files, concurrency, timeout: FILE_SECONDS[wanted.part] * 1000});
        for (const type of ["test:pass", "test:fail"]) {
            stream.on(type, (data) => report.take(type, data));
        }
        stream.on("test:stderr", (data) => process.stderr.write(data.message));
        stream.on("test:stdout", (data) => process.stdout.write(data.message));
        stream.resume();
        await new Promise((resolve) => stream.once("end", resolve));
    } finally {
        await browser.close();
        await lab?.down();
    }
    await fs.writeFile(results, report.xml(wanted.part));
    const {length} = report.cases;
    process.stdout.write(`${length} tests, ${report.failed} failed, ${report.skipped} skipped\n`);
    process.exit(length > 0 && report.failed + report.skipped === 0 ? 0 : 1);
}

await main();
