"""docs/web-api.md, docs/error-codes.md and the OpenAPI document say what the server does."""

import contextlib
import copy
import json
import re
import subprocess
import sys

import pytest

from client import CONF, DIRECTORY, DOMAIN, EVENTS, SCHEDULE, Answer, check_documented
from lab import PROJECT, password

METHODS = json.loads((PROJECT / "appliance/catalogue/methods.json").read_text(encoding="utf-8"))
ADMINISTRATOR = {"username": "Administrator", "password": password("LAB", "Administrator")}
NAMES = [f"{row['api'].rsplit('.', maxsplit=1)[-1]}.{row['method']} {row['version']}" for row in METHODS]
VERBS = {"get", "put", "post", "delete", "options", "head", "patch", "trace"}
TYPES = {"string": str, "boolean": bool, "integer": int, "object": dict, "array": list}


def described(api, method, version=1):
    return next(row for row in METHODS if (row["api"], row["method"], row["version"]) == (api, method, version))


def kind(value):
    return type(value).__name__


def differences(shown, real, where="data"):
    """How the answer differs in keys and types from the one that is documented."""
    if kind(shown) != kind(real):
        return [f"{where}: {kind(real)} in place of {kind(shown)}"]
    if isinstance(shown, dict):
        found = [f"{where}.{key}" for key in set(shown) ^ set(real)]
        for key in set(shown) & set(real):
            found += differences(shown[key], real[key], f"{where}.{key}")
        return found
    if isinstance(shown, list) and shown:
        found = [] if real else [f"{where} is empty"]
        for each in real:
            found += differences(shown[0], each, f"{where}[]")
        return found
    return []


def request_of(row, task):
    """The documented request, with this lab's names for the documented ones."""
    request = copy.deepcopy(row["example_request"])
    for key, value in (("domain_name", "lab.test"), ("domain", "LAB"), ("dns", "10.77.0.10"), ("task_id", task)):
        if key in request:
            request[key] = "LAB" if row["method"] == "update_start" else value
    if "password" in request:
        request.update(ADMINISTRATOR)
    if "search" in request:
        request["search"] = "a"
    return request


@pytest.fixture(scope="module")
def document(joined):
    status, body = joined.client.request("GET", "/webapi/openapi.json")
    assert status == 200
    return json.loads(body)


def test_every_documented_call_answers_as_documented(joined):
    client = joined.client
    calls = {}
    task = ""

    def call(api, method, version=1):
        row = described(api, method, version)
        request = request_of(row, task)
        unknown = set(request) - {parameter["name"] for parameter in row["parameters"]}
        assert not unknown, (method, unknown)
        answer = client.call(api, version, method, request)
        assert answer.ok, (api, method, request, answer.body)
        assert set(answer.body) == set(row["example_answer"])
        calls[(api, method, version)] = differences(row["example_answer"]["data"], answer.data)
        return answer.data

    call(DOMAIN, "set")
    call(DOMAIN, "get")
    call(DOMAIN, "test_dc")
    call(DOMAIN, "get_domain_list", 1)
    call(DOMAIN, "get_domain_list", 2)
    task = call(DOMAIN, "update_start")["task_id"]
    assert task.startswith("DomainUpdate_") and re.fullmatch("[0-9a-f]{32}", task.partition("_")[2])
    # Also the first answer, right after the start.
    assert call(DOMAIN, "update_status")["status"] in ("updating", "finish")
    joined.wait_until(lambda: client.refresh_status(task).data["status"] == "finish", 60, "the refresh")
    call(DIRECTORY, "overview")
    call(DIRECTORY, "refresh_progress")
    call(DIRECTORY, "users")
    call(DIRECTORY, "groups")
    call(DIRECTORY, "domains")
    call(DIRECTORY, "join_steps")
    call(EVENTS, "list")
    call(CONF, "set")
    call(CONF, "get")
    call(SCHEDULE, "set")
    call(SCHEDULE, "get")
    call(DOMAIN, "update_stop")
    call(DIRECTORY, "leave")
    assert set(calls) == {(row["api"], row["method"], row["version"]) for row in METHODS}
    assert {name: found for name, found in calls.items() if found} == {}
    assert client.join("lab.test", *ADMINISTRATOR.values()).ok


# The join has conditions of its own, see test_join_failures.py.
@pytest.mark.parametrize("row", [row for row in METHODS if (row["api"], row["method"]) != (DOMAIN, "set")],
                         ids=[name for name in NAMES if name != "Domain.set 1"])
def test_parameters_are_what_is_documented(joined, row):
    """One of another type is refused, with 2618; so is one that is missing but required."""
    required = {parameter["name"] for parameter in row["parameters"] if parameter["required"]}
    good = {"enable_domain": False, "task_id": "none", "date_type": 2, "delete_account": True}
    for parameter in row["parameters"]:
        wrong = 5 if parameter["type"] != "integer" else "5"
        request = {name: good[name] for name in required}
        if row["api"] == SCHEDULE and row["method"] == "set" and parameter["name"] != "date_type":
            request = {"date_type": 1 if parameter["name"] in ("date", "repeat") else 0, "hour": 1, "min": 1,
                       "week_name": "1", "date": "2030/1/1", "repeat": 1}
        answer = joined.client.call(row["api"], row["version"], row["method"], {**request, parameter["name"]: wrong})
        assert answer.code == 2618, (parameter["name"], answer.body)
        assert 2618 in row["codes"]
    for name in required:
        others = {key: good[key] for key in required - {name}}
        answer = joined.client.call(row["api"], row["version"], row["method"], others)
        assert answer.code == 2618, (name, answer.body)


def listed(joined):
    status, body = joined.client.request("GET", "/webapi")
    assert status == 200
    return {(api["api"], row["method"], version)
            for api in json.loads(body)["data"]["apis"] for row in api["methods"] for version in row["versions"]}


def test_all_methods_and_no_others_are_described(joined, document):
    known = {(row["api"], row["method"], row["version"]) for row in METHODS}
    assert listed(joined) == known
    assert set(document["paths"]) == {f"/webapi/{api}/{version}/{method}" for api, method, version in known}
    page = (PROJECT / "docs/web-api.md").read_text(encoding="utf-8")
    assert set(re.findall(r"^    POST (/webapi/VORN\S+)$", page, re.M)) == set(document["paths"])


def resolve(document, reference):
    assert reference.startswith("#/")
    place = document
    for part in reference[2:].split("/"):
        place = place[part]
    return place


def check_schema(document, schema, where):
    known = {"type", "properties", "required", "items", "enum", "oneOf", "description", "nullable", "$ref"}
    assert isinstance(schema, dict) and set(schema) <= known, (where, schema)
    if "$ref" in schema:
        assert set(schema) == {"$ref"}, where
        check_schema(document, resolve(document, schema["$ref"]), where + "/$ref")
        return
    assert schema.get("type", "object") in TYPES, where
    assert ("items" in schema) == (schema.get("type") == "array"), where
    assert isinstance(schema.get("nullable", False), bool)
    assert set(schema.get("required", [])) <= set(schema.get("properties", {})), where
    assert schema.get("required", ["x"]) != [], where
    for name, inner in schema.get("properties", {}).items():
        check_schema(document, inner, f"{where}/{name}")
    for inner in [schema["items"]] if "items" in schema else schema.get("oneOf", []):
        check_schema(document, inner, where)


def fits(document, schema, value):
    """Whether a value is of the schema, as far as this document goes."""
    if "$ref" in schema:
        return fits(document, resolve(document, schema["$ref"]), value)
    if "oneOf" in schema:
        return sum(fits(document, each, value) for each in schema["oneOf"]) == 1
    if value is None:
        return schema.get("nullable") is True or "type" not in schema
    if "enum" in schema and value not in schema["enum"]:
        return False
    if "type" in schema and (kind(value) != TYPES[schema["type"]].__name__):
        return False
    if isinstance(value, dict):
        return set(schema.get("required", [])) <= set(value) and all(
            fits(document, schema.get("properties", {}).get(key, {}), each) for key, each in value.items())
    return not isinstance(value, list) or all(fits(document, schema.get("items", {}), each) for each in value)


def test_the_openapi_document_is_one(document):
    assert document["openapi"] == "3.0.3"
    assert set(document) == {"openapi", "info", "paths", "components"}
    assert document["info"]["title"] and document["info"]["version"]
    for name, schema in document["components"]["schemas"].items():
        check_schema(document, schema, name)
    seen = set()
    for path, item in document["paths"].items():
        assert re.fullmatch(r"/webapi/[A-Za-z.]+/[0-9]+/[a-z_]+", path)
        assert set(item) == {"post"} and set(item) <= VERBS
        operation = item["post"]
        assert operation["operationId"] not in seen
        seen.add(operation["operationId"])
        assert operation["summary"] and operation["tags"]
        assert isinstance(operation["requestBody"]["required"], bool)
        assert set(operation["responses"]) == {"200", "default"}
        for part in (operation["requestBody"], *operation["responses"].values()):
            (content,) = part["content"].values()
            assert list(part["content"]) == ["application/json"]
            check_schema(document, content["schema"], path)
            if "example" in content:
                assert fits(document, content["schema"], content["example"]), (path, content["example"])
        assert all(response["description"] for response in operation["responses"].values())


@pytest.mark.parametrize("row", METHODS, ids=NAMES)
def test_the_openapi_document_has_the_parameters(document, row):
    operation = document["paths"][f"/webapi/{row['api']}/{row['version']}/{row['method']}"]["post"]
    assert operation["summary"] == row["summary"]
    content = operation["requestBody"]["content"]["application/json"]
    assert content["example"] == row["example_request"]
    assert operation["responses"]["200"]["content"]["application/json"]["example"] == row["example_answer"]
    same_parameters(content["schema"], row["parameters"])


def same_parameters(schema, parameters):
    assert schema["type"] == "object"
    assert set(schema.get("properties", {})) == {parameter["name"] for parameter in parameters}
    assert set(schema.get("required", [])) == {row["name"] for row in parameters if row["required"]}
    for parameter in parameters:
        shown = schema["properties"][parameter["name"]]
        assert (shown["type"], shown["description"]) == (parameter["type"], parameter["description"])
        if "members" in parameter:
            same_parameters(shown, parameter["members"])
        if "items" in parameter:
            assert shown["items"]["type"] == parameter["items"]


def test_real_answers_fit_the_document(joined, document):
    for api, method, parameters in [(DOMAIN, "get", {}), (CONF, "get", {}), (SCHEDULE, "set", {}), (EVENTS, "list", {}),
                                    (DOMAIN, "update_status", {"task_id": "none"})]:
        answer = joined.client.call(api, 1, method, parameters)
        operation = document["paths"][f"/webapi/{api}/1/{method}"]["post"]
        assert fits(document, operation["responses"]["200"]["content"]["application/json"]["schema"], answer.body)
    for target, body in [("/webapi/No.Api/1/get", b"{}"), (f"/webapi/{DOMAIN}/1/get", b"{"), ("/webapi/x", b"{}")]:
        status, body = joined.client.request("POST", target, body)
        assert status >= 400
        assert fits(document, {"$ref": "#/components/schemas/Failure"}, json.loads(body))


def test_every_code_is_explained(joined):
    page = (PROJECT / "docs/error-codes.md").read_text(encoding="utf-8")
    explained = {int(code) for code in re.findall(r"^\| (\d+) \|", page, re.M)}
    assert {code for row in METHODS for code in row["codes"]} <= explained
    catalogue = json.loads((PROJECT / "appliance/catalogue/error-codes.json").read_text(encoding="utf-8"))
    assert {entry["code"] for entry in catalogue["codes"]} == explained
    # Every code that the modules' sources name.
    sources = [*PROJECT.glob("src/**/*.cpp"), *PROJECT.glob("src/**/*.h"), *PROJECT.glob("appliance/module/*")]
    named = {int(code) for file in sources for code in re.findall(r"\b(26[0-2][0-9])\b", file.read_text())}
    assert named and named <= explained, named - explained
    for code in sorted(explained):
        result = joined.exec("vornctl", "explain", str(code))
        assert result.code == 0 and str(code) in result.out, result


def test_a_code_that_no_method_lists_shows():
    """The client checks every refusal of every test against the catalogue."""
    for api, version, method, status, code, known in [
        (CONF, 1, "set", 200, 2618, True),
        (CONF, 3, "set", 200, 2618, True),
        (CONF, 1, "set", 200, 2623, False),
        (DOMAIN, 2, "get_domain_list", 200, 2600, True),
        (DOMAIN, 1, "get_domain_list", 200, 2600, False),
        (CONF, 1, "set", 503, 240, True),
        (CONF, 1, "set", 400, 2618, False),
        (CONF, 1, "set", 200, 240, False),
    ]:
        answer = Answer(status, {"success": False, "error": {"code": code, "errors": None}}, 0)
        with contextlib.nullcontext() if known else pytest.raises(AssertionError, match="does not list"):
            check_documented(api, version, method, answer)


def test_the_pages_are_not_stale():
    result = subprocess.run([sys.executable, PROJECT / "dev.d/catalogue.py", "--check"], capture_output=True, text=True,
                            check=False, timeout=60)
    assert result.returncode == 0, result.stdout
