"""The page's files, and the headers of every answer: nothing outside of the page's folder is ever read."""

import contextlib
import gzip
import http.client
import json

import pytest

from client import DOMAIN
from door import Door, Visitor
from raw_door import GET, exchange, fields, post

POLICY = {
    "default-src": "'none'", "script-src": "'self'", "style-src": "'self'", "img-src": "'self' data:",
    "font-src": "'self'", "connect-src": "'self'", "manifest-src": "'self'", "form-action": "'none'",
    "base-uri": "'none'", "frame-ancestors": "'none'",
}
ALWAYS = {
    "X-Content-Type-Options": "nosniff", "X-Frame-Options": "DENY", "Referrer-Policy": "no-referrer",
    "Cross-Origin-Opener-Policy": "same-origin", "Cross-Origin-Resource-Policy": "same-origin",
}
SECRET = "outside-of-the-page"
MAKE = f"""set -e
mkdir -p /srv/page/assets/inner /srv/outside
echo {SECRET} >/srv/outside/secret.txt
cd /srv/page
printf '<!doctype html><title>page</title>' >index.html
printf 'console.log("page, page, page, page, page, page")' >assets/app-1a2b.js
gzip -k9 assets/app-1a2b.js
printf 'not really brotli' >assets/app-1a2b.js.br
printf 'a{{}}' >assets/plain.css
printf inner >assets/inner/x.txt
printf upper >assets/UPPER.TXT
printf hidden >.hidden
mkdir .git && printf {SECRET} >.git/config
printf x >'with blank.txt'
ln -s /srv/outside/secret.txt link.txt
ln -s /etc/passwd assets/passwd
ln -s /srv/outside folder
ln -s ../../outside assets/folder
mkfifo pipe
printf {SECRET} >unreadable.txt
chmod -R a+rX /srv && chmod 600 unreadable.txt
"""


@pytest.fixture(scope="module")
def door(shared_door):
    machine = shared_door.appliance
    shared_door.stop()
    machine.must("sh", "-c", MAKE)
    entrance = Door(machine)
    entrance.start("--page", "/srv/page")
    yield entrance
    entrance.stop()
    shared_door.start()


@pytest.fixture(scope="module")
def visitor(door):
    return door.login()


@pytest.fixture
def kept(door, visitor):
    """The same on one connection."""
    one = Visitor(door, keep=True)
    one.cookie, one.csrf = visitor.cookie, visitor.csrf
    return one


def check_headers(reply, what):
    for name, value in ALWAYS.items():
        assert reply.headers.get_all(name) == [value], (what, name, reply.headers.items())
    policy = reply.headers.get_all("Content-Security-Policy")
    assert len(policy) == 1, what
    parts = dict(part.strip().split(" ", 1) for part in policy[0].split(";"))
    assert parts == POLICY, what
    assert "camera=()" in reply.headers["Permissions-Policy"], what
    assert not {"Server", "X-Powered-By", "Via"} & set(reply.headers.keys()), what
    assert "Date" in reply.headers


def test_the_headers_of_every_answer(door, visitor):
    stranger = door.visitor()
    replies = {
        "page": visitor.request("GET", "/"), "asset": visitor.request("GET", "/assets/app-1a2b.js"),
        "health": stranger.request("GET", "/healthz"), "figures": stranger.request("GET", "/metrics"),
        "call": visitor.request("POST", GET), "apis": visitor.request("GET", "/webapi"),
        "description": visitor.request("GET", "/webapi/openapi.json"), "session": visitor.request("GET", "/session"),
        "refused call": visitor.request("POST", "/webapi/x/1/y"), "no session": stranger.request("POST", GET),
        "no token": visitor.request("POST", GET, headers={"X-CSRF-Token": None}),
        "other site": visitor.request("POST", GET, headers={"Origin": "https://evil.test"}),
        "other type": visitor.request("POST", GET, headers={"Content-Type": "text/plain"}),
        "verb": visitor.request("PUT", "/"), "nothing": visitor.request("GET", "/nothing"),
        "no JSON": visitor.request("POST", GET, b"x"), "head": visitor.request("HEAD", "/"),
        "link": stranger.login_with("x"),
    }
    tag = replies["page"].headers["ETag"]
    replies["unchanged"] = visitor.request("GET", "/", headers={"If-None-Match": tag})
    expected = {"page": 200, "asset": 200, "health": 200, "figures": 200, "call": 200, "apis": 200, "description": 200,
                "session": 200, "refused call": 404, "no session": 401, "no token": 403, "other site": 403,
                "other type": 415, "verb": 405, "nothing": 404, "no JSON": 400, "head": 200, "link": 401,
                "unchanged": 304}
    assert {name: reply.status for name, reply in replies.items()} == expected
    for name, reply in replies.items():
        check_headers(reply, name)
        if name not in ("page", "asset", "head", "unchanged"):
            assert reply.headers["Cache-Control"] == "no-store", name
        if name not in ("page", "asset", "head", "unchanged", "figures"):
            assert reply.headers["Content-Type"] == "application/json", name
            assert isinstance(reply.json, dict), name
    for data, status in ((b"nonsense\r\n\r\n", 400), (b"GET / HTTP/1.1\r\nX: " + b"a" * 9000, 413),
                         (post(door, visitor, "Content-Length: 70000"), 413)):
        answers, _ = exchange(door, data)
        assert answers[0].status == status
        check_headers(answers[0], data[:20])


OUTSIDE = [
    "/../../etc/passwd", "/..", "/../", "/.", "/./index.html", "/assets/../index.html",
    "/assets/../../outside/secret.txt", "/%2e%2e/outside/secret.txt", "/%2E%2E/%2E%2E/etc/passwd",
    "/..%2foutside/secret.txt", "/assets%2fplain.css", "/assets/%2e%2e/index.html", "/.%2e/outside/secret.txt",
    "/%252e%252e/outside/secret.txt", "/..%c0%afoutside/secret.txt", "/..%5coutside%5csecret.txt",
    "/..\\outside\\secret.txt", "\\..\\outside\\secret.txt", "/assets\\plain.css", "//etc/passwd", "//index.html",
    "///index.html", "/assets//plain.css", "/etc/passwd", "/srv/outside/secret.txt", "/srv/page/index.html",
    "/proc/self/environ", "/index.html/", "/index.html/..", "/index.html%00", "/index.html%00.js", "/index.html.",
    "/index.html;x", "/index.html:x", "/INDEX.HTML", "/index", "/assets", "/assets/", "/assets/inner/",
    "/assets/upper.txt", "/link.txt", "/assets/passwd", "/folder/secret.txt", "/folder/", "/assets/folder/secret.txt",
    "/.hidden", "/.git/config", "/with%20blank.txt", "/with+blank.txt", "/pipe", "/unreadable.txt",
    "/assets/app-1a2b.js.gz", "/assets/app-1a2b.js.br", "/~root", "/" + "a/" * 2000, "/" + "../" * 1500 + "etc/passwd",
    "/%", "/%2", "/%zz", "/*", "*", "/healthz/", "/healthz/../index.html", "/metrics/x", "/session/..",
    "/webapi/../index.html", "/session/../index.html", "/run/vorn/sessions.json", "file:///etc/passwd",
    "/?/../index.htm/../../etc/passwd/x",
]


@pytest.mark.parametrize("path", OUTSIDE, ids=lambda path: path[:40])
def test_no_path_leads_out_of_the_page(door, visitor, path):
    if path.startswith("/?"):
        return check_index(door, path)
    data = "\r\n".join([f"GET {path} HTTP/1.1", *fields(door, visitor)]).encode() + b"\r\n\r\n"
    answers, _ = exchange(door, data)
    assert len(answers) == 1 and answers[0].status in (400, 404, 405), answers
    for text in (SECRET, "root:", "page</title>", "upper", "inner", "PATH="):
        assert text.encode() not in answers[0].body
    assert json.loads(answers[0].body)["success"] is False


def check_index(door, path):
    """What is behind a question mark is no path."""
    assert door.get(path).body == b"<!doctype html><title>page</title>"


def test_a_link_put_there_later_leads_nowhere_either(door):
    machine = door.appliance
    machine.must("sh", "-c", "ln -sf /srv/outside/secret.txt /srv/page/later.txt; echo new >/srv/page/new.txt; "
                             "mv /srv/page/assets/plain.css /srv/page/assets/plain.kept; "
                             "ln -s /srv/outside/secret.txt /srv/page/assets/plain.css")
    try:
        assert door.get("/later.txt").status == door.get("/new.txt").status == 404
        assert door.get("/assets/plain.css").body == b"a{}"
    finally:
        machine.must("mv", "-T", "/srv/page/assets/plain.kept", "/srv/page/assets/plain.css")


def test_a_file_that_is_cut_short_ends_nothing(door):
    """As by an update that writes into files that are there."""
    machine = door.appliance
    pid = door.pid
    machine.must("sh", "-c", "cp -p /srv/page/index.html /srv/kept.html && : >/srv/page/index.html")
    try:
        with contextlib.suppress(OSError, http.client.HTTPException):
            door.get("/")
        assert door.running and door.pid == pid, "the door has ended"
        assert door.get("/assets/plain.css").status == 200
    finally:
        machine.must("sh", "-c", "cat /srv/kept.html >/srv/page/index.html")
        if not door.running:
            door.start("--page", "/srv/page")


def test_verbs(door, kept):
    for verb in ("PUT", "DELETE", "PATCH", "OPTIONS", "TRACE", "PROPFIND", "GETX", "get", "POST", "X" * 500):
        for path, allow in (("/", "GET, HEAD"), ("/assets/plain.css", "GET, HEAD"), ("/healthz", "GET, HEAD"),
                            ("/metrics", "GET")):
            reply = kept.request(verb, path, headers={"X-Canary": "echoed"})
            assert (reply.status, reply.code) == (405, 214), (verb, path)
            assert reply.headers["Allow"] == allow and b"echoed" not in reply.body
        reply = kept.request(verb, "/nothing")
        assert reply.status == 404, verb
        if verb != "POST":
            for path, allow in ((GET, "POST"), ("/session/login", "POST"), ("/session", "GET"), ("/webapi", "GET")):
                reply = kept.request(verb, path)
                assert (reply.status, reply.headers["Allow"]) == (405, allow), (verb, path)
    answers, _ = exchange(door, b"CONNECT other.test:443 HTTP/1.1\r\nHost: other.test:443\r\n\r\n")
    assert [answer.status for answer in answers] in ([404], [405], [400])
    assert kept.call(DOMAIN, 1, "get").ok


def test_head_is_get_without_the_content(door):
    for path in ("/", "/assets/app-1a2b.js", "/healthz", "/nothing"):
        get, head = door.get(path), door.request("HEAD", path)
        assert head.status == (get.status if path != "/nothing" else 404) and head.body == b""
        drop = {"date"}
        assert [item for item in head.headers.items() if item[0].lower() not in drop] == [
            item for item in get.headers.items() if item[0].lower() not in drop], path


def test_caching(door):
    page = door.get("/")
    assert page.headers["Cache-Control"] == "no-cache" and page.headers["Content-Type"] == "text/html; charset=utf-8"
    assert door.get("/index.html").body == page.body
    asset = door.get("/assets/app-1a2b.js")
    assert asset.headers["Cache-Control"] == "public, max-age=31536000, immutable"
    assert asset.headers["Content-Type"] == "text/javascript; charset=utf-8"
    for path, reply in (("/", page), ("/assets/app-1a2b.js", asset)):
        tag = reply.headers["ETag"]
        for value in (tag, f"W/{tag}", f'"other", {tag}', "*"):
            again = door.get(path, headers={"If-None-Match": value})
            assert (again.status, again.body, again.headers["ETag"]) == (304, b"", tag), value
            assert again.headers["Cache-Control"] == reply.headers["Cache-Control"]
        for value in ('"other"', tag[:-1], tag.strip('"')):
            assert door.get(path, headers={"If-None-Match": value}).status == 200, value
    assert page.headers["ETag"] != asset.headers["ETag"]


def test_compressed_forms(door):
    plain = b'console.log("page, page, page, page, page, page")'
    tags = set()
    for accepted, coding in (("gzip", "gzip"), ("br", "br"), ("gzip, br", "br"), ("gzip, deflate, br;q=0.9", "br"),
                             ("br;q=0, gzip", "gzip"), ("gzip;q=0", None), ("identity", None), ("", None),
                             ("GZIP", "gzip"), ("x-gzip-y", None), ("gzip;q=0.000, br;q=0.0", None)):
        reply = door.get("/assets/app-1a2b.js", headers={"Accept-Encoding": accepted})
        assert (reply.status, reply.headers["Content-Encoding"]) == (200, coding), accepted
        assert reply.headers["Vary"] == "Accept-Encoding"
        content = {"gzip": gzip.decompress, "br": lambda body: plain if body == b"not really brotli" else body,
                   None: bytes}[coding](reply.body)
        assert content == plain, accepted
        tags.add((coding, reply.headers["ETag"]))
    assert len(tags) == len({tag for _, tag in tags}) == 3
    reply = door.get("/", headers={"Accept-Encoding": "gzip, br"})
    assert reply.headers["Content-Encoding"] is None and reply.headers["Vary"] is None
