#!/usr/bin/python3
"""Writes docs/error-codes.md and docs/web-api.md from appliance/catalogue/; --check tells whether they are stale."""

import argparse
import difflib
import json
import pathlib
import sys

ROOT = pathlib.Path(__file__).resolve().parent.parent
CATALOGUE = ROOT / "appliance" / "catalogue"
WIDTH = 120

CODES_HEAD = """\
# Error codes

A call that fails answers `{"success": false, "error": {"code": N, "errors": ...}}`. The code is what a module says to a
client; "errors" is null or adds to it. What happened in detail stands in the system log: of the domain module at
priority "err" under `domain.cpp` or `domain_schedule.cpp`, of the server under `vornd`.

When several things went wrong in one call, the code of the first one is answered. On the appliance
`vornctl explain CODE` says the same as this page.

This page is made from [error-codes.json](../appliance/catalogue/error-codes.json): change it there, then run
`python3 dev.d/catalogue.py`.
"""

API_HEAD = """\
# The web API

Every method is a POST request:

    POST /webapi/<API name>/<version>/<method>
    Content-Type: application/json

    {"parameter": value, ...}

The body is one JSON object of parameters; without parameters it may be empty. The version is a whole number from 1 on:
the highest version of the method that is not above it answers. `GET /webapi` lists what is loaded and
`GET /webapi/openapi.json` describes it as OpenAPI.

The server, `vornd`, listens on the unix socket `/run/vorn/vornd.sock`. Who may call is decided by the peer's
credentials: root may. `vornctl call API VERSION METHOD [JSON]` calls any method from the command line.

## Answers

A success is `{"success": true, "data": ...}`, a failure `{"success": false, "error": {"code": 2618, "errors": ...}}`.
Every answer of a module has the HTTP status 200, whether a success or not. The server's own refusals have the same
shape with codes of their own and the reason in "errors":

| Status | When |
|---|---|
| 400 | the request is no HTTP, its body no JSON, nested deeper than 10 levels, no object, or it names a key twice |
| 401 | the caller is not allowed |
| 404 | no such API, method, version or path |
| 405 | another verb than POST for a call, or GET for a description |
| 408 | the request was not complete in time |
| 413 | the header or the body is too large |
| 415 | the body is not `application/json` |
| 500 | the module failed or gave no answer |
| 503 | too many calls wait, too many connections are open, or the server is about to end |

[error-codes.md](error-codes.md) says what each code means and what to do.

## Limits

Header 8 KiB; body 64 KiB; 10 levels of JSON, no key twice in an object; 15 seconds from a request's first byte to its
last; 256 connections, of which the oldest idle one makes room for a newcomer; 64 waiting calls. When the server is told
to end, calls that wait are refused and those that run go on to their end.

Parameters are not converted: a number is no text, and a text is no switch. A method that gets a wrong one answers 2618.
A parameter that a method does not know is passed over.

This page is made from [methods.json](../appliance/catalogue/methods.json): change it there, then run
`python3 dev.d/catalogue.py`.
"""


def load(name):
    return json.loads((CATALOGUE / name).read_text(encoding="utf-8"))


def cell(text):
    return text.replace("|", "\\|")


def error_codes():
    catalogue = load("error-codes.json")
    lines = [CODES_HEAD]
    for group in catalogue["groups"]:
        codes = [entry for entry in catalogue["codes"] if entry["group"] == group["key"]]
        lines += [f"## {group['title']}", "", "| Code | Meaning | Likely cause | What to do |", "|---|---|---|---|"]
        lines += [
            f"| {entry['code']} | {cell(entry['meaning'])} | {cell(entry['cause'])} | {cell(entry['action'])} |"
            for entry in codes
        ]
        lines.append("")
    unused = ", ".join(str(code) for code in catalogue["unused"])
    lines += [f"{unused} is not used and stays so.", ""]
    return "\n".join(lines)


def pretty(value, indent=0):
    """JSON on one line where it fits, else a member a line."""
    flat = json.dumps(value, ensure_ascii=False)
    if len(flat) + indent + 4 <= WIDTH or not isinstance(value, (dict, list)):
        return flat
    blanks = " " * (indent + 4)
    if isinstance(value, dict):
        inner = [f"{blanks}{json.dumps(key)}: {pretty(item, indent + 4)}" for key, item in value.items()]
        return "{\n" + ",\n".join(inner) + "\n" + " " * indent + "}"
    inner = [blanks + pretty(item, indent + 4) for item in value]
    return "[\n" + ",\n".join(inner) + "\n" + " " * indent + "]"


def parameter_rows(parameters, prefix=""):
    for parameter in parameters:
        kind = parameter["type"] + (f" of {parameter['items']}s" if "items" in parameter else "")
        required = "yes" if parameter["required"] else "no"
        yield f"| `{prefix}{parameter['name']}` | {kind} | {required} | {cell(parameter['description'])} |"
        yield from parameter_rows(parameter.get("members", []), prefix + parameter["name"] + ".")


def indented(text):
    return "\n".join("    " + line for line in text.split("\n"))


def method_section(method):
    lines = [f"### {method['method']}, version {method['version']}", "", method["summary"]]
    if method["description"]:
        lines += ["", method["description"]]
    lines.append("")
    if method["parameters"]:
        lines += ["| Parameter | Type | Required | Meaning |", "|---|---|---|---|"]
        lines += parameter_rows(method["parameters"])
    else:
        lines.append("No parameters.")
    lines += [
        "",
        "Request:",
        "",
        f"    POST /webapi/{method['api']}/{method['version']}/{method['method']}",
        "",
        indented(pretty(method["example_request"])),
        "",
        "Answer:",
        "",
        indented(pretty(method["example_answer"])),
        "",
    ]
    if method["codes"]:
        lines += ["Codes: " + ", ".join(str(code) for code in method["codes"]) + ".", ""]
    return lines


def web_api():
    lines = [API_HEAD]
    api = ""
    for method in load("methods.json"):
        if method["api"] != api:
            api = method["api"]
            lines += [f"## {api}", ""]
        lines += method_section(method)
    return "\n".join(lines)


PAGES = {"docs/error-codes.md": error_codes, "docs/web-api.md": web_api}


def check(path, text):
    """Whether the page is as it should be; prints the difference."""
    target = ROOT / path
    old = target.read_text(encoding="utf-8") if target.exists() else ""
    if old == text:
        return True
    print(f"{path} is stale; \"python3 dev.d/catalogue.py\" writes it anew:")
    difference = difflib.unified_diff(old.splitlines(), text.splitlines(), "is", "should be", lineterm="", n=0)
    print("\n".join(list(difference)[:20]))
    return False


def main():
    parser = argparse.ArgumentParser(description=__doc__)
    parser.add_argument("--check", action="store_true", help="write nothing; end with 1 when a page is stale")
    check_only = parser.parse_args().check
    fresh = True
    for path, make in PAGES.items():
        text = make()
        if check_only:
            fresh = check(path, text) and fresh
        else:
            (ROOT / path).write_text(text, encoding="utf-8")
    sys.exit(0 if fresh else 1)


if __name__ == "__main__":
    main()
