// What the imitated appliance is at first, and how it answers each call when nothing else was said.

import {cut, failure} from "./imitation.mjs";

// 2026-11-22 02:00:00 UTC, for times that show on pictures.
export const SOME_TIME = 1_795_312_800;

export function firstState() {
    return {
        accounts: [{user: "admin", password: "right"}],
        links: new Set(["a-good-link-token"]),
        session: null,
        delay: 0,
        member: null,
        hostName: "NAS1",
        interfaces: [
            {name: "eth0", addresses: ["10.0.0.5", "2001:db8::5"]},
            {name: "eth1", addresses: ["10.1.0.5"]},
        ],
        dns: "10.0.0.1",
        lastTest: null,
        trustWorks: true,
        domains: [],
        lists: [],
        entries: {user: {}, group: {}},
        options: {
            enable_sync_time: false,
            enable_server_signing: false,
            enable_rpc_enum_usergroup: false,
            domain_nested_group: 1,
            disable_domain_admins: false,
        },
        // Of the browser, so that both clocks show the same.
        utcOffset: new Date().getTimezoneOffset() * -60,
        schedule: {date_type: 2},
        events: [],
        steps: null,
        busy: null,
        refresh: null,
        task: null,
        joinSteps: ["discover", "ports", "workgroup", "credentials", "join", "winbind", "trust"],
        stepMs: 30,
    };
}

// A member of LAB with a trusted domain, lists of users and groups, options, a schedule, events.
export function memberState(changes = {}) {
    const users = ["Administrator", "anna", "ben", "carla", "dieter", "elif", "farid", "guest", "hanna", "ivo"];
    return {
        member: {
            domain_name: "LAB",
            domain_type: "AD",
            manage_mode: 0,
            advance_domain_conf: {
                enable_advance_option: false,
                kdc: "",
                netbios_name: "LAB",
                fqdn_name: "LAB.EXAMPLE.COM",
                register_nics: ["all"],
            },
        },
        dns: "10.0.0.1,10.0.0.2",
        lastTest: {time: SOME_TIME, success: true, milliseconds: 212},
        domains: [["LAB", "LAB", "lab.example.com"], ["OTHER", "OTHER", "other.example.com"]],
        entries: {
            user: {
                LAB: users.map((name, index) => entry(name, 1_000_500 + index, `${name} of the laboratory`)),
                OTHER: [entry("zoe", 2_000_500, "Zoe Other")],
            },
            group: {
                LAB: [entry("domain admins", 1_000_512, "Domain Admins"), entry("staff", 1_000_700, "Staff")],
                OTHER: [entry("visitors", 2_000_700, "Visitors")],
            },
        },
        lists: ["LAB", "OTHER"].flatMap((domain) => ["user", "group"].map((kind) => ({domain, kind, fetched: SOME_TIME}))),
        schedule: {date: "", date_type: 0, hour: 3, last_work_hour: 0, min: 30, repeat: 0, repeat_hour: 0, week_name: "0,3"},
        events: [
            {time: SOME_TIME, kind: 2, level: 1, code: 293602308, text: "The appliance joined the domain LAB."},
            {time: SOME_TIME - 90, kind: 2, level: 1, code: 293602309, text: "The appliance left the domain OLD."},
        ],
        ...changes,
    };
}

export const entry = (name, id, display) => ({name, id, display});

// COUNT users in the order of their names.
export function manyEntries(count) {
    return Array.from({length: count}, (nothing, index) => {
        const number = String(index).padStart(6, "0");
        return entry(`user${number}`, 1_100_000 + index, `Person ${number}`);
    });
}

export const manyDomains = (count) => Array.from({length: count}, (nothing, index) => {
    const number = String(index).padStart(4, "0");
    return [`DOMAIN${number}`, `DOMAIN${number}`, `domain${number}.example.com`];
});

const sleep = (ms) => new Promise((done) => setTimeout(done, ms));

// "this" is the imitation.
export const answers = {
    login(parameters) {
        const {accounts} = this.state;
        if (!accounts.some(({user, password}) => user === parameters.user && password === parameters.password)) {
            throw failure(222);
        }
        return this.logIn(parameters.user);
    },

    link(parameters) {
        if (!this.state.links.delete(parameters.token)) {
            throw failure(224);
        }
        return this.logIn();
    },

    session() {
        return this.state.session;
    },

    logout() {
        this.state.session = null;
    },

    get() {
        const {member, dns} = this.state;
        return member ? {enable_domain: true, dns, ...member} : {enable_domain: false};
    },

    async set(parameters) {
        if (!parameters.enable_domain) {
            await runSteps(this, "leave", this.state.member?.domain_name ?? "");
            this.state.member = null;
            return;
        }
        const advanced = parameters.advance_domain_conf ?? {enable_advance_option: false};
        await runSteps(this, "join", parameters.domain_name);
        const name = parameters.domain_name.split(".")[0].toUpperCase();
        Object.assign(this.state, memberState({dns: parameters.dns || this.state.dns}));
        this.state.member = {
            ...this.state.member,
            domain_name: name,
            manage_mode: parameters.manage_mode ?? 0,
            advance_domain_conf: {...this.state.member.advance_domain_conf, ...advanced},
        };
        this.state.lastTest = null;
    },

    test_dc() {
        const {member, trustWorks} = this.state;
        const success = Boolean(member) && trustWorks;
        this.state.lastTest = {time: this.now(), success, milliseconds: 187};
        return {test_join_success: success};
    },

    "get_domain_list@1"() {
        return {domain_list: this.state.member ? this.state.domains.map(([name]) => name) : []};
    },

    "get_domain_list@2"() {
        return {domain_list: this.state.member ? this.state.domains : []};
    },

    update_start(parameters) {
        const {state} = this;
        if (!state.member) {
            throw failure(2625);
        }
        state.task = {id: `DomainUpdate_${"0".repeat(31)}${state.taskNumber ?? 1}`, wanted: parameters.domain_name, end: null};
        const domains = state.domains.length;
        state.refresh = {
            running: true, kind: "user", domain: state.domains[0][0], count: 0, domains_done: 0, domains,
            started: this.now(), updated: this.now(), finished: null, errors: [],
        };
        return {task_id: state.task.id};
    },

    update_status(parameters) {
        const {task} = this.state;
        if (!task || task.id !== parameters.task_id) {
            throw failure(117, {errors: 122});
        }
        if (task.end === null) {
            return {status: "updating"};
        }
        if (task.end !== 0) {
            throw failure(task.end);
        }
        return {status: "finish"};
    },

    update_stop() {
        endRefresh(this, 121);
    },

    "Conf.get"() {
        return this.state.options;
    },

    "Conf.set"(parameters) {
        Object.assign(this.state.options, parameters);
    },

    "Schedule.get"() {
        return this.state.schedule;
    },

    "Schedule.set"(parameters) {
        if (!this.state.member) {
            throw failure(2624);
        }
        const none = {date: "", date_type: 0, hour: 0, last_work_hour: 0, min: 0, repeat: 0, repeat_hour: 0, week_name: ""};
        this.state.schedule = parameters.date_type === 2 ? {date_type: 2} : {...none, ...parameters};
    },

    users(parameters) {
        return entriesOf(this.state, "user", parameters);
    },

    groups(parameters) {
        return entriesOf(this.state, "group", parameters);
    },

    domains() {
        const {lists, entries} = this.state;
        return {domains: lists.map((list) => ({...list, count: entries[list.kind][list.domain].length}))};
    },

    refresh_progress() {
        return this.state.refresh;
    },

    join_steps() {
        return this.state.steps;
    },

    async leave(parameters) {
        if (!this.state.member) {
            throw failure(2624);
        }
        if (parameters.delete_account && !this.state.accounts.concat({user: "Administrator", password: "right"})
            .some(({user, password}) => user === parameters.username && password === parameters.password)) {
            throw failure(2607);
        }
        const {hostName, member} = this.state;
        await runSteps(this, "leave", member.domain_name);
        if (!parameters.delete_account) {
            const account = `the computer account ${hostName}$ stays in the domain ${member.domain_name}`;
            this.state.steps.leftovers.push(account);
        }
        this.state.member = null;
    },

    list(parameters) {
        const {offset = 0, limit = 100} = parameters;
        const {events} = this.state;
        return {total: events.length, events: events.slice(offset, offset + limit)};
    },

    overview() {
        const {hostName, member, lastTest, interfaces, refresh, busy} = this.state;
        return {
            host_name: hostName,
            computer_account: member ? `${hostName}$` : null,
            last_test: lastTest,
            interfaces,
            refresh,
            busy,
            clock: {time: this.now(), utc_offset: this.state.utcOffset},
        };
    },
};

// The refresh ends: result 0, or the code that "update_status" answers from then on.
export function endRefresh(imitation, result = 0, errors = []) {
    const {state} = imitation;
    if (state.task && state.task.end === null) {
        state.task.end = result;
        const done = result === 0 ? state.refresh.domains : state.refresh.domains_done;
        const now = imitation.now();
        Object.assign(state.refresh, {running: false, updated: now, finished: now, errors, domains_done: done});
        if (result === 0) {
            state.lists.forEach((list) => (list.fetched = imitation.now()));
        }
    }
}

function entriesOf(state, kind, {domain, offset = 0, limit = 100, search = ""}) {
    const wanted = (domain ?? state.member?.domain_name ?? "").toUpperCase();
    if (!wanted) {
        throw failure(2624);
    }
    const list = state.lists.find((one) => one.kind === kind && one.domain === wanted);
    const text = search.toLowerCase();
    const all = list ? state.entries[kind][wanted] : [];
    const found = text ? all.filter((one) => `${one.name}\n${one.display}`.toLowerCase().includes(text)) : all;
    return {
        total: found.length,
        offset,
        domain: wanted,
        fetched: list?.fetched ?? null,
        entries: found.slice(offset, offset + limit),
    };
}

// state.failing = {step, code, message, detail} lets the join or leave end at that step.
async function runSteps(imitation, action, domain) {
    const {state} = imitation;
    if (state.busy) {
        throw failure(2615);
    }
    const steps = [];
    state.busy = action;
    state.steps = {
        id: `run-${imitation.calls.length}`, action, domain, started: imitation.now(), finished: null, success: null,
        message: "", steps, leftovers: [],
    };
    const names = action === "join" ? state.joinSteps : ["stop services", "leave"];
    try {
        for (const name of names) {
            const step = {name, server: "dc1.lab.example.com", outcome: "running", detail: "", milliseconds: 0};
            steps.push(step);
            await state.stepGate?.(name);
            await sleep(state.stepMs);
            Object.assign(step, {outcome: "ok", milliseconds: state.stepMs});
            if (state.failing?.step === name) {
                const {code, message = "", detail = ""} = state.failing;
                Object.assign(step, {outcome: "failed", detail});
                Object.assign(state.steps, {finished: imitation.now(), success: false, message});
                throw code === null ? cut() : failure(code);
            }
        }
        Object.assign(state.steps, {finished: imitation.now(), success: true});
    } finally {
        state.busy = null;
    }
}
