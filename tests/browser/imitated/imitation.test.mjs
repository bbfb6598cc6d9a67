// The imitation itself: it answers what the catalogue of methods says, with the shape of the catalogue's examples.

import assert from "node:assert/strict";
import {test} from "node:test";

import {METHODS} from "../lib/catalogue.mjs";
import {entry, memberState} from "../lib/imitated_state.mjs";
import {failure, Imitation, nameOf} from "../lib/imitation.mjs";

// What an answer's data look like: names and types, of lists their first element.
function shape(value) {
    if (Array.isArray(value)) {
        return value.length > 0 ? [shape(value[0])] : [];
    }
    if (value !== null && typeof value === "object") {
        return Object.fromEntries(Object.keys(value).sort().map((key) => [key, shape(value[key])]));
    }
    return value === null ? "null" : typeof value;
}

// The shape that is shown, but for values that are there in one of the two and not in the other, and empty lists.
function alike(shown, given) {
    const isEmpty = (value) => value === "null" || value?.length === 0;
    if (isEmpty(shown) || isEmpty(given)) {
        return given;
    }
    if (typeof shown !== "object" || typeof given !== "object") {
        return shown;
    }
    const entries = Object.entries(shown).map(([key, value]) => [key, key in given ? alike(value, given[key]) : value]);
    return Array.isArray(shown) ? entries.map(([, value]) => value) : Object.fromEntries(entries);
}

// What an example shows of a refresh, a test or a join is there only after one.
const BEFORE = {
    update_status: "update_start",
    refresh_progress: "update_start",
    overview: "update_start",
    join_steps: "set",
};

async function ask(imitation, name, version, parameters) {
    let answered;
    const described = METHODS.find((one) => nameOf(one.api, one.method) === name && one.version === version);
    await imitation.serve({
        request: () => ({
            url: () => `http://page/webapi/${described.api}/${version}/${described.method}`,
            method: () => "POST",
            headers: () => ({"content-type": "application/json", "x-csrf-token": imitation.state.session?.csrf}),
            postData: () => JSON.stringify(parameters),
        }),
        fulfill: async (answer) => (answered = {status: answer.status, ...JSON.parse(answer.body)}),
        abort: async () => (answered = "aborted"),
    });
    return answered;
}

function member() {
    const imitation = new Imitation(memberState({stepMs: 1, joinSteps: ["discover"]}));
    imitation.logIn();
    return imitation;
}

for (const {api, version, method, example_request: request, example_answer: example} of METHODS) {
    const name = nameOf(api, method);
    test(`the imitation answers ${name}, version ${version}, as the catalogue shows it`, async () => {
        const imitation = member();
        const before = METHODS.find((one) => one.method === BEFORE[method]);
        if (before) {
            await ask(imitation, before.method, before.version, before.example_request);
        }
        const parameters = method === "update_status" ? {task_id: imitation.state.task.id}
            : name === "leave" ? {...request, password: "right"} : request;
        imitation.state.entries.user.LAB.push(entry("anna", 1, "Anna"));
        const answer = await ask(imitation, name, version, parameters);
        assert.deepEqual(imitation.complaints, []);
        assert.equal(answer.success, true, JSON.stringify(answer));
        const [given, shown] = [shape(answer.data), shape(example.data)];
        assert.deepEqual(given, alike(shown, given));
    });
}

test("the imitation complains about a parameter that is unknown, missing or of another type", async () => {
    const imitation = member();
    await ask(imitation, "update_status", 1, {});
    await ask(imitation, "users", 1, {offset: "3", colour: "red"});
    assert.deepEqual(imitation.complaints, [
        "update_status: \"task_id\" is missing",
        "users: \"offset\" is no integer: \"3\"",
        "users: there is no parameter \"colour\"",
    ]);
    assert.throws(() => imitation.judge(), /task_id/);
});

test("the imitation answers nobody without a session, and no call without the token", async () => {
    const imitation = member();
    imitation.state.session.csrf = undefined;
    imitation.endSession();
    const answer = await ask(imitation, "get", 1, {});
    assert.deepEqual([answer.status, answer.error.code], [401, 220]);
});

test("the imitation fails, holds and loses calls as it is told", async () => {
    const imitation = member();
    imitation.fail("get", 2617, {errors: "why"});
    assert.deepEqual(await ask(imitation, "get", 1, {}),
        {status: 200, success: false, error: {code: 2617, errors: "why"}});
    imitation.mend("get");
    const release = imitation.hold("get");
    const waiting = ask(imitation, "get", 1, {});
    assert.equal(await Promise.race([waiting, new Promise((done) => setTimeout(done, 50, "waits"))]), "waits");
    release();
    assert.equal((await waiting).success, true);
    imitation.down();
    assert.equal(await ask(imitation, "get", 1, {}), "aborted");
    assert.throws(() => failure(1), /no code 1/);
});
