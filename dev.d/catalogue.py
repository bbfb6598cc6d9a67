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

## Who may call

The server, `vornd`, listens on the unix socket `/run/vorn/vornd.sock`. Who may call is decided by the peer's
credentials: root may. `vornctl call API VERSION METHOD [JSON]` calls any method from the command line.

From the network the same paths are reached through `vorn-httpd`, by TLS and in a session of an administrator who has
logged in. The account that it runs as, `vorn-httpd`, may by itself do nothing on the socket but log in; all other
accounts may only `GET /metrics`.

## Sessions

| Request | Answer's data |
|---|---|
| `POST /session/login` `{"user", "password"}` | "csrf", "user", "idle_seconds", "expires" |
| `POST /session/link` `{"token"}` | the same |
| `GET /session` | the same, of the session that the request is in |
| `POST /session/logout` | null |
| `POST /session/new-link` | "token", "expires"; on the socket, of root alone |

A log-in is checked by PAM (service `vorn`); the user must also be in the machine's group `administrators`. The link of
`vornctl link` logs in once, as root, within 10 minutes after it was made and until the server is started anew.

The session is in a cookie that scripts can't read. Each request that is not a GET carries the "csrf" of its session as
the header `X-CSRF-Token`. A session ends 15 minutes after the last request that is not marked with `X-Background: 1`,
12 hours after the log-in ("expires", in seconds since 1970), or when it is logged out; a call that runs keeps it from
ending for want of use. When a session ends while a call of it runs, the call goes on to its end, but its answer is
withheld: 401 with code 220. There are at most 64 sessions; one more ends the one that is unused for the longest time.
They outlive a restart of the server, but not one of the machine.

After five failures within 15 minutes, of one user or from one address (of IPv6: one network of 64 bits), the next
attempt has to wait 30 seconds, and twice as long after each further failure, up to 15 minutes: until then it is
answered with 429 and the header `Retry-After`. A refused password is answered after 2 seconds, or a multiple of them,
whatever is wrong with it. Two passwords are checked at a time and eight attempts wait.

On the socket the session is named by headers instead: `vorn-httpd` sets `Vorn-Session` and `Vorn-Csrf`, `Vorn-Client`
(the browser's address, for the throttle and the log) and `Vorn-Background: 1`. The data of a log-in hold "session"
there, the token: the server keeps only its SHA-256.

## Figures

`GET /metrics` answers in the text form of Prometheus: requests by API, method and code, how long they took, calls that
run and wait, connections, sessions, background tasks, the state of the membership and its last test, number, size and
age of the lists of users and groups. No name of a domain, a user or a host is in it.

## Answers

A success is `{"success": true, "data": ...}`, a failure `{"success": false, "error": {"code": 2618, "errors": ...}}`.
Every answer of a module has the HTTP status 200, whether a success or not. The server's own refusals have the same
shape with codes of their own and the reason in "errors":

| Status | When |
|---|---|
| 400 | no HTTP; a body that is no JSON or no object, has more than 10 levels or a key twice; a log-in's parameter is missing |
| 401 | the caller is not allowed, is in no session, or what it logs in with is wrong |
| 403 | the session's CSRF token is missing or wrong, or a page of another address sent the request |
| 404 | no such API, method, version or path |
| 405 | another verb than POST for a call, or GET for a description |
| 408 | the request was not complete in time |
| 413 | the header or the body is too large |
| 415 | the body is not `application/json` |
| 429 | too many log-ins have failed; `Retry-After` says how many seconds to wait |
| 500 | the module failed or gave no answer |
| 503 | too many calls or connections; passwords can't be checked; the server is about to end or does not answer |

[error-codes.md](error-codes.md) says what each code means and what to do.

## Limits

Header 8 KiB; body 64 KiB; 10 levels of JSON, no key twice in an object; 15 seconds from a request's first byte to its
last; 256 connections, of which the oldest idle one makes room for a newcomer and 192 at most are of `vorn-httpd`; 64
waiting calls. When the server is told to end, calls that wait are refused and those that run go on to their end.

Over the network, besides: 10 seconds for the handshake of TLS, 60 between two requests, 60 to take an answer in, of which
15 at most without a byte.

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
