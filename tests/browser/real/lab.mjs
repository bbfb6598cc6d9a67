// The lab as an object: brings it up and down, runs commands in its hosts, makes faults. Every wait has a deadline.

import {spawn} from "node:child_process";
import {once} from "node:events";
import {readFileSync} from "node:fs";
import {promises as fs} from "node:fs";
import path from "node:path";

import {PROJECT} from "../lib/places.mjs";

const COMMAND = path.join(PROJECT, "lab/lab");
const ACCOUNTS = path.join(PROJECT, "lab/accounts.conf");

// Runs a command in a group of processes of its own, which ends as a whole at the deadline. Answers code, out, err,
// seconds.
export async function run(words, {deadline = 60, input = "", env = {}} = {}) {
    const begin = Date.now();
    const child = spawn(words[0], words.slice(1).map(String), {
        env: {...process.env, ...env}, detached: true, stdio: ["pipe", "pipe", "pipe"],
    });
    const out = [];
    const err = [];
    child.stdout.on("data", (data) => out.push(data));
    child.stderr.on("data", (data) => err.push(data));
    child.stdin.on("error", () => {});
    child.stdin.end(input);
    let late = false;
    const timer = setTimeout(() => {
        late = true;
        try {
            process.kill(-child.pid, "SIGKILL");
        } catch {
            // It has just ended by itself.
        }
    }, deadline * 1000);
    let code;
    try {
        [code] = await once(child, "close");
    } finally {
        clearTimeout(timer);
    }
    const result = {
        command: words.join(" "), code: late ? "deadline" : code, seconds: (Date.now() - begin) / 1000,
        out: Buffer.concat(out).toString(), err: Buffer.concat(err).toString(),
    };
    result.text = result.out + result.err;
    return result;
}

// DOMAIN: NetBIOS name, or "local" for an account of each appliance itself.
export function password(domain, name) {
    for (const line of readFileSync(ACCOUNTS, "utf8").split("\n")) {
        const [kind, ...fields] = line.split("|").map((field) => field.trim());
        const [where, who, secret] = kind === "local" ? [kind, ...fields] : fields;
        if (["user", "local"].includes(kind) && where === domain && who === name) {
            return secret;
        }
    }
    throw new Error(`accounts.conf has no ${name} of ${domain}`);
}

export class Lab {
    constructor(folder) {
        this.folder = folder;
    }

    // Any command of the lab; how it ended is the caller's to judge.
    command(words, options = {}) {
        return run([COMMAND, ...words], {...options, env: {LAB_DIR: this.folder, ...options.env}});
    }

    async must(words, options = {}) {
        const result = await this.command(words, options);
        if (result.code !== 0) {
            throw new Error(`${result.command} ended with ${result.code}\n${result.text}`);
        }
        return result;
    }

    // The lab ends with this process, however that ends.
    up(...options) {
        return this.must(["up", "--with-pid", process.pid, ...options], {deadline: 600});
    }

    down() {
        return this.must(["down"], {deadline: 60});
    }

    exec(host, words, options = {}) {
        return this.command(["exec", host, ...words], options);
    }

    async mustExec(host, words, options = {}) {
        return this.must(["exec", host, ...words], options);
    }

    // The host's files, as seen from this machine.
    async root(host) {
        const [pid] = (await fs.readFile(path.join(this.folder, "hosts", host, "init"), "utf8")).split(/\s/);
        return `/proc/${pid}/root`;
    }
}
