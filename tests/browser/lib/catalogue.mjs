// The appliance's catalogues of methods and error codes, and whether a request is one that the catalogue allows.

import {readFileSync} from "node:fs";
import path from "node:path";

import {CATALOGUE} from "./places.mjs";

const read = (name) => JSON.parse(readFileSync(path.join(CATALOGUE, name), "utf8"));

export const METHODS = read("methods.json");
export const ERRORS = read("error-codes.json").codes;

export const errorOf = (code) => ERRORS.find((entry) => entry.code === code);

const FITS = {
    boolean: (value) => typeof value === "boolean",
    integer: (value) => Number.isInteger(value) && Math.abs(value) < 2 ** 31,
    string: (value) => typeof value === "string",
    array: (value) => Array.isArray(value),
    object: (value) => value !== null && typeof value === "object" && !Array.isArray(value),
};

// The description of a method, of the highest version that is not above the one asked for.
export function methodOf(api, version, method) {
    return METHODS.filter((entry) => entry.api === api && entry.method === method && entry.version <= version)
        .sort((one, other) => other.version - one.version)[0];
}

// What is wrong with the parameters; empty when nothing is.
export function complaintsAbout(described, parameters, where = described.method) {
    const complaints = [];
    for (const [name, value] of Object.entries(parameters)) {
        const parameter = described.parameters.find((entry) => entry.name === name);
        if (!parameter) {
            complaints.push(`${where}: there is no parameter "${name}"`);
        } else if (!FITS[parameter.type](value)) {
            complaints.push(`${where}: "${name}" is no ${parameter.type}: ${JSON.stringify(value)}`);
        } else if (parameter.type === "array" && !value.every(FITS[parameter.items])) {
            complaints.push(`${where}: "${name}" holds something else than ${parameter.items}`);
        } else if (parameter.type === "object") {
            const inner = parameter.members ?? parameter.parameters;
            complaints.push(...complaintsAbout({parameters: inner}, value, `${where}.${name}`));
        }
    }
    for (const parameter of described.parameters) {
        if (parameter.required && !(parameter.name in parameters)) {
            complaints.push(`${where}: "${parameter.name}" is missing`);
        }
    }
    return complaints;
}
