// Turns the events of node's test runner into lines to read and a JUnit file to count.

import path from "node:path";

const XML = {"&": "&amp;", "<": "&lt;", ">": "&gt;", "\"": "&quot;"};
// XML has no way to hold most control bytes.
const COLOURS = /\x1b\[[0-9;]*m/g;
const escape = (text) => text.replaceAll(/[\0-\x08\x0B\x0C\x0E-\x1F]/g, "?").replaceAll(/[&<>"]/g, (found) => XML[found]);

const textOf = (error) => `${error?.stack ?? error?.message ?? error ?? "failed"}`.replaceAll(COLOURS, "");

export class Report {
    constructor(say) {
        this.say = say;
        this.cases = [];
    }

    // Events of tests; those of a whole file count only when the file itself could not be run.
    take(type, data) {
        const isFile = path.isAbsolute(data.name) || data.name.endsWith(".test.mjs");
        const error = data.details?.error;
        if (isFile && (type === "test:pass" || error?.failureType === "subtestsFailed")) {
            return;
        }
        const seconds = (data.details?.duration_ms ?? 0) / 1000;
        const one = {
            file: path.basename(data.file ?? ""),
            name: isFile ? path.basename(data.name) : data.name,
            seconds,
            error: type === "test:fail" ? textOf(error.cause ?? error) : "",
            skipped: data.skip !== undefined || data.todo !== undefined,
        };
        this.cases.push(one);
        const word = one.error ? "FAILED" : one.skipped ? "skipped" : "ok";
        this.say(`${word.padEnd(8)}${seconds.toFixed(1).padStart(6)} s  ${one.name}`);
        if (one.error) {
            this.say(one.error.split("\n").slice(0, 25).map((line) => `    | ${line}`).join("\n"));
        }
    }

    get failed() {
        return this.cases.filter((one) => one.error).length;
    }

    get skipped() {
        return this.cases.filter((one) => !one.error && one.skipped).length;
    }

    xml(name) {
        const body = this.cases.map((one) => {
            const head = `<testcase classname="${escape(one.file)}" name="${escape(one.name)}" time="${one.seconds}"`;
            if (one.error) {
                return `${head}><failure message="failed">${escape(one.error)}</failure></testcase>`;
            }
            return one.skipped ? `${head}><skipped/></testcase>` : `${head}/>`;
        });
        const counts = `errors="0" failures="${this.failed}" skipped="${this.skipped}" tests="${this.cases.length}"`;
        return `<?xml version="1.0" encoding="utf-8"?>\n<testsuites><testsuite name="${escape(name)}" ${counts}>\n` +
            `${body.join("\n")}\n</testsuite></testsuites>\n`;
    }
}
