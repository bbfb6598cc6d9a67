// The page's files over clear text on loopback: by vorn-httpd where it was built (VORN_HTTPD), else by a small server
// with the same headers.

import {spawn} from "node:child_process";
import {once} from "node:events";
import {promises as fs} from "node:fs";
import http from "node:http";
import net from "node:net";
import os from "node:os";
import path from "node:path";

import {PAGE_FOLDER} from "./places.mjs";

const NOBODY = 65534;
const START_SECONDS = 15;
const POLICY = ["default-src 'none'", "script-src 'self'", "style-src 'self'", "img-src 'self' data:",
    "font-src 'self'", "connect-src 'self'", "manifest-src 'self'", "form-action 'none'", "base-uri 'none'",
    "frame-ancestors 'none'"].join("; ");
const TYPES = {
    ".html": "text/html; charset=utf-8",
    ".js": "text/javascript; charset=utf-8",
    ".css": "text/css; charset=utf-8",
    ".json": "application/json",
    ".svg": "image/svg+xml",
    ".woff2": "font/woff2",
    ".webmanifest": "application/manifest+json",
    ".png": "image/png",
    ".ico": "image/x-icon",
};

let server;

// Answers the page's address, such as http://127.0.0.1:40123.
export async function pageServer() {
    server ??= process.env.VORN_HTTPD ? startHttpd(process.env.VORN_HTTPD) : startSmall();
    return (await server).base;
}

export async function stopPageServer() {
    await (await server)?.stop();
    server = undefined;
}

async function filesOf(folder, prefix = "/") {
    const files = new Map();
    for (const entry of await fs.readdir(folder, {withFileTypes: true})) {
        const file = path.join(folder, entry.name);
        if (entry.isDirectory()) {
            for (const [name, content] of await filesOf(file, `${prefix}${entry.name}/`)) {
                files.set(name, content);
            }
        } else {
            files.set(prefix + entry.name, await fs.readFile(file));
        }
    }
    return files;
}

async function startSmall() {
    const files = await filesOf(PAGE_FOLDER);
    files.set("/", files.get("/index.html"));
    const small = http.createServer((request, response) => {
        const name = new URL(request.url, "http://page").pathname;
        const content = files.get(name);
        const packed = files.get(`${name === "/" ? "/index.html" : name}.gz`);
        response.setHeader("Content-Security-Policy", POLICY);
        response.setHeader("X-Content-Type-Options", "nosniff");
        response.setHeader("Referrer-Policy", "no-referrer");
        if (!content) {
            response.writeHead(404).end();
            return;
        }
        response.setHeader("Content-Type", TYPES[path.extname(name === "/" ? ".html" : name)] ?? TYPES[".html"]);
        response.setHeader("Cache-Control",
            name.startsWith("/assets/") ? "public, max-age=31536000, immutable" : "no-cache");
        if (packed) {
            response.setHeader("Content-Encoding", "gzip");
        }
        response.end(packed ?? content);
    });
    small.listen(0, "127.0.0.1");
    await once(small, "listening");
    return {
        base: `http://127.0.0.1:${small.address().port}`,
        stop: () => new Promise((done) => {
            small.close(done);
            small.closeAllConnections();
        }),
    };
}

export async function freePort() {
    const probe = net.createServer().listen(0, "127.0.0.1");
    await once(probe, "listening");
    const {port} = probe.address();
    probe.close();
    await once(probe, "close");
    return port;
}

// As root it would not start, so it gets the ids of nobody, and copies of its files, which may lie where nobody can't go.
async function startHttpd(given) {
    const port = await freePort();
    const folder = await fs.mkdtemp(path.join(os.tmpdir(), "vorn-page-"));
    await fs.chmod(folder, 0o755);
    const [program, page] = [path.join(folder, "vorn-httpd"), path.join(folder, "page")];
    await fs.copyFile(given, program);
    await fs.cp(PAGE_FOLDER, page, {recursive: true});
    const words = ["--foreground", "--clear-text", "--listen", `127.0.0.1:${port}`, "--page", page];
    const ids = process.getuid() === 0 ? {uid: NOBODY, gid: NOBODY} : {};
    const child = spawn(program, words, {...ids, cwd: "/", stdio: ["ignore", "pipe", "pipe"]});
    let output = "";
    child.stdout.on("data", (data) => (output += data));
    child.stderr.on("data", (data) => (output += data));
    const ended = once(child, "exit");
    const base = `http://127.0.0.1:${port}`;
    const end = Date.now() + START_SECONDS * 1000;
    while (!(await fetch(base).then((answer) => answer.ok, () => false))) {
        if (child.exitCode !== null || Date.now() > end) {
            child.kill("SIGKILL");
            await fs.rm(folder, {recursive: true, force: true});
            throw new Error(`${program} ${words.join(" ")} does not serve the page:\n${output}`);
        }
        await new Promise((done) => setTimeout(done, 50));
    }
    return {
        base,
        stop: async () => {
            child.kill("SIGTERM");
            const late = setTimeout(() => child.kill("SIGKILL"), 5000);
            await ended;
            clearTimeout(late);
            await fs.rm(folder, {recursive: true, force: true});
        },
    };
}
