// An appliance behind the page's back: answers every call of the web API and of sessions from a state that a test sets,
// records each call, and fails, delays or holds those that a test names. Works through the browser's own routing, so the
// page's code is the real one, down to its fetch().

import {complaintsAbout, errorOf, methodOf} from "./catalogue.mjs";
import {answers, firstState} from "./imitated_state.mjs";

const STATUS_OF_SERVER = {220: 401, 221: 403, 222: 401, 223: 429, 224: 401, 225: 503, 250: 503, 251: 403};
// Longer than any test, so that a call that a test forgot to let go does not outlive it.
const LONGEST_HOLD_MS = 200_000;

export class Imitation {
    constructor(changes = {}) {
        this.state = {...firstState(), ...changes};
        this.calls = [];
        this.complaints = [];
        this.overrides = new Map();
        this.delays = new Map();
        this.holds = new Map();
        this.isDown = false;
    }

    async install(context) {
        await context.route((url) => /^\/(session|webapi)(\/|$)/.test(url.pathname), (route) => this.serve(route));
    }

    // What tests say beforehand. NAME is a method such as "users" or "Conf.get" (see nameOf), or "login", "link",
    // "session", "logout".

    // The answer comes from here: answer(parameters, call) gives data, or throws what failure() makes.
    on(name, answer) {
        this.overrides.set(name, answer);
    }

    fail(name, code, more = {}) {
        this.on(name, () => {
            throw failure(code, more);
        });
    }

    // As if on() and fail() had never been called for it.
    mend(name) {
        this.overrides.delete(name);
    }

    delay(name, ms) {
        this.delays.set(name, ms);
    }

    // No call of this name is answered until the function that this answers is called.
    hold(name) {
        let release;
        const gate = new Promise((resolve) => {
            release = resolve;
            setTimeout(resolve, LONGEST_HOLD_MS).unref();
        });
        this.holds.set(name, gate);
        return () => {
            this.holds.delete(name);
            release();
        };
    }

    // The server is gone: connections are refused.
    down() {
        this.isDown = true;
    }

    up() {
        this.isDown = false;
    }

    endSession() {
        this.state.session = null;
    }

    logIn(user = this.state.accounts[0].user) {
        this.state.session = {user, csrf: "csrf-of-the-imitation", idle_seconds: 900, expires: this.now() + 43_200};
        return this.state.session;
    }

    now() {
        return Math.floor(Date.now() / 1000);
    }

    // What tests ask afterwards.

    callsOf(name) {
        return this.calls.filter((call) => call.name === name);
    }

    // Answering.

    async serve(route) {
        const request = route.request();
        const call = describe(request);
        this.calls.push(call);
        if (this.isDown) {
            await route.abort("connectionrefused").catch(() => {});
            return;
        }
        let answer;
        try {
            answer = await this.answer(call);
        } catch (error) {
            answer = error.answer ?? {status: 500, body: {success: false, error: {code: 230, errors: `${error}`}}};
            if (!error.answer) {
                this.complaints.push(`${call.name}: ${error.stack}`);
            }
        }
        const wait = this.delays.get(call.name) ?? this.state.delay;
        if (wait > 0) {
            await new Promise((done) => setTimeout(done, wait));
        }
        await this.holds.get(call.name);
        if (this.isDown || answer.cut) {
            await route.abort("connectionreset").catch(() => {});
            return;
        }
        call.answered = Date.now();
        call.answer = answer.body;
        // The page that asked may be gone by now.
        await route.fulfill({
            status: answer.status,
            headers: {"cache-control": "no-store", ...answer.headers},
            contentType: "application/json",
            body: answer.text ?? JSON.stringify(answer.body),
        }).catch(() => {});
    }

    async answer(call) {
        this.check(call);
        const override = this.overrides.get(call.name);
        const given = override ?? answers[`${call.name}@${call.usedVersion}`] ?? answers[call.name];
        if (!given) {
            throw failure(call.described ? 230 : 210);
        }
        const data = await given.call(this, call.parameters, call);
        return {status: 200, body: {success: true, data: data ?? null}};
    }

    // The door's checks, and that the page never sends what the appliance does not know.
    check(call) {
        const {path, verb, headers, parameters} = call;
        if (verb === "POST" && !/^application\/json\b/.test(headers["content-type"] ?? "")) {
            this.complaints.push(`${path}: sent as ${headers["content-type"]}`);
        }
        if (verb === "POST" && parameters === undefined) {
            this.complaints.push(`${path}: the body is no object: ${call.body}`);
        }
        if (["login", "link"].includes(call.name) && verb === "POST") {
            return;
        }
        const {session} = this.state;
        if (!session) {
            throw failure(220);
        }
        if (verb === "POST" && headers["x-csrf-token"] !== session.csrf) {
            this.complaints.push(`${path}: the token against forgery is ${headers["x-csrf-token"]}`);
            throw failure(221);
        }
        if (path.startsWith("/webapi/")) {
            if (!call.described) {
                this.complaints.push(`${path}: no such method`);
                throw failure(211);
            }
            this.complaints.push(...complaintsAbout(call.described, parameters ?? {}));
        }
    }

    judge() {
        if (this.complaints.length > 0) {
            throw new Error(`the page called what it never may:\n  ${[...new Set(this.complaints)].join("\n  ")}`);
        }
    }
}

// What an answer throws to fail with a code. more: status, errors (the text beside the code), headers.
export function failure(code, {status, errors, headers} = {}) {
    if (!errorOf(code)) {
        throw new Error(`there is no code ${code}`);
    }
    const error = new Error(`code ${code}`);
    error.answer = {
        status: status ?? STATUS_OF_SERVER[code] ?? (code >= 200 && code < 300 ? 400 : 200),
        headers,
        body: {success: false, error: {code, ...(errors === undefined ? {} : {errors})}},
    };
    return error;
}

// What an answer throws to cut the connection in the middle of the call.
export function cut() {
    const error = new Error("cut");
    error.answer = {cut: true};
    return error;
}

// What an answer throws to give something that is none: any status and text.
export function nonsense(status, text) {
    const error = new Error("nonsense");
    error.answer = {status, text, body: null};
    return error;
}

// The name of a method in tests: that of the catalogue, behind the last part of its API's name where two APIs have it.
export function nameOf(api, method) {
    const last = api.split(".").pop();
    return ["Conf", "Schedule"].includes(last) ? `${last}.${method}` : method;
}

function describe(request) {
    const url = new URL(request.url());
    const call = {
        verb: request.method(),
        path: url.pathname,
        headers: request.headers(),
        body: request.postData() ?? "",
        begin: Date.now(),
    };
    call.background = call.headers["x-background"] === "1";
    const [, first, ...rest] = url.pathname.split("/");
    if (first === "session") {
        call.name = rest[0] ?? "session";
        call.usedVersion = 1;
    } else {
        const [api, version, method] = rest;
        call.name = nameOf(api ?? "", method ?? "");
        call.described = methodOf(api, Number(version), method);
        call.usedVersion = call.described?.version;
    }
    try {
        const parsed = call.body === "" ? {} : JSON.parse(call.body);
        call.parameters = parsed !== null && typeof parsed === "object" && !Array.isArray(parsed) ? parsed : undefined;
    } catch {
        call.parameters = undefined;
    }
    return call;
}
