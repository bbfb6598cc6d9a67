"""The catalogues of error codes and methods against the sources that they speak of, and all that is made of them."""

import json
import pathlib
import re
import subprocess
import sys

from vornctl_case import DEADLINE, DIRECTORY, DOMAIN, VornctlCase, main, ok

ROOT = pathlib.Path(__file__).resolve().parents[3]
CATALOGUE = ROOT / "appliance" / "catalogue"
TYPES = {"boolean": bool, "integer": int, "string": str, "array": list, "object": dict}


def read(path):
    return (ROOT / path).read_text(encoding="utf-8")


def codes():
    return json.loads(read("appliance/catalogue/error-codes.json"))


def methods():
    return json.loads(read("appliance/catalogue/methods.json"))


def sources(folder):
    """The text of a folder's sources without comments."""
    text = ""
    for path in sorted((ROOT / folder).rglob("*")):
        if path.suffix in (".cpp", ".h"):
            text += re.sub(r"//[^\n]*", "", path.read_text(encoding="utf-8"))
    return text


def enumerators(header):
    """The numbers of a header that lists codes, by their names."""
    return {name: int(number) for name, number in re.findall(r"^    (\w+) = (\d+),", read(header), re.MULTILINE)}


def table(path):
    """The rows of a module's API table: (API, version, method)."""
    text = read(path)
    names = dict(re.findall(r'constexpr const char\* (k\w+) = "([^"]+)";', text))
    rows = re.findall(r'\{(k\w+), (\d+), "(\w+)", ', text)
    return [(names[name], int(version), method) for name, version, method in rows]


def manual_parts():
    """The manual's sections by their titles, without its marks and on one line each."""
    manual = re.sub(r"\\f[BIRP]", "", read("appliance/tools/vornctl/vornctl.1")).replace("\\-", "-")
    parts = re.split(r"^\.S[SH] ([^\n]+)\n", manual, flags=re.MULTILINE)[1:]
    texts = [" ".join(re.sub(r"^\.[A-Z]+ ?", "", text, flags=re.MULTILINE).split()) for text in parts[1::2]]
    return dict(zip([title.strip('"') for title in parts[0::2]], texts))


def help_sentences(text):
    """The options of a command's help, each with what is said of it, blanks folded."""
    sentence = r"(\S[^\n]*(?:\n {26}\S[^\n]*)*)"
    found = re.findall(rf"^  (?:-\w,)?(--[a-z0-9-]+)[^\n]*?(?:  +|\n {{26}}){sentence}", text, re.MULTILINE)
    return [(option, " ".join(sentence.split())) for option, sentence in found]


class Catalogue(VornctlCase):
    def numbers(self):
        return {entry["code"] for entry in codes()["codes"]}

    @staticmethod
    def check(root):
        script = [sys.executable, "-B", str(root / "dev.d" / "catalogue.py"), "--check"]
        return subprocess.run(script, capture_output=True, timeout=DEADLINE, check=False)

    def test_the_documents_are_fresh(self):
        done = self.check(ROOT)
        self.assertEqual(done.returncode, 0, done.stdout.decode() + done.stderr.decode())

    def test_a_stale_document_shows(self):
        copy = pathlib.Path(self.folder) / "copy"
        for part in ("dev.d", "docs", "appliance/catalogue"):
            (copy / part).mkdir(parents=True)
        documents = ("docs/error-codes.md", "docs/web-api.md")
        for part in ("dev.d/catalogue.py", "appliance/catalogue/methods.json", *documents):
            (copy / part).write_text(read(part), encoding="utf-8")
        text = read("appliance/catalogue/error-codes.json")
        changed = text.replace("No domain controller was found.", "Nothing was found.")
        self.assertNotEqual(changed, text)
        for content, result in ((text, 0), (changed, 1)):
            (copy / "appliance/catalogue/error-codes.json").write_text(content, encoding="utf-8")
            done = self.check(copy)
            self.assertEqual(done.returncode, result, done.stdout)
        self.assertIn(b"docs/error-codes.md is stale", done.stdout)

    def test_every_code_has_its_texts(self):
        entries = codes()["codes"]
        groups = {group["key"] for group in codes()["groups"]}
        for entry in entries:
            self.assertEqual(list(entry), ["code", "key", "group", "meaning", "cause", "action"])
            self.assertIn(entry["group"], groups)
            self.assertRegex(entry["key"], r"^[a-z][a-z0-9_]+$")
            for name in ("meaning", "cause", "action"):
                self.assertRegex(entry[name], r"^[^\x00-\x1f\x7f]{10,}\.$", entry["code"])
            self.assertLessEqual(len(entry["meaning"]), 80)
        for name in ("code", "key", "meaning"):
            self.assertEqual(len({entry[name] for entry in entries}), len(entries), name)
        self.assertEqual([entry["code"] for entry in entries], sorted(self.numbers()))
        self.assertEqual(groups, {entry["group"] for entry in entries})

    def test_it_holds_what_the_domain_module_records(self):
        recorded = {int(number) for number in re.findall(r"\b(26[0-2]\d|117)\b", sources("src"))}
        self.assertGreater(len(recorded), 20)
        known = {number for number in self.numbers() if 2600 <= number <= 2699 or number == 117}
        self.assertEqual(known, recorded)
        self.assertFalse(known & set(codes()["unused"]))

    def test_it_holds_what_the_second_module_answers(self):
        answered = {int(number) for number in re.findall(r"\b(26\d\d)\b", sources("appliance/module"))}
        self.assertGreater(len(answered), 3)
        self.assertLessEqual(answered, self.numbers())

    def test_it_holds_the_codes_of_framework_and_server(self):
        framework = enumerators("appliance/platform/webapi/framework_codes.h")
        server = enumerators("appliance/web/server_codes.h")
        self.assertGreater(len(framework), 5)
        self.assertGreater(len(server), 10)
        self.assertEqual({number for number in self.numbers() if 100 <= number < 200}, set(framework.values()))
        self.assertEqual({number for number in self.numbers() if 200 <= number < 1000}, set(server.values()))

    def test_the_refresh_has_every_code_of_its_tasks(self):
        framework = enumerators("appliance/platform/webapi/framework_codes.h")
        rows = {row["method"]: row for row in methods() if row["api"] == DOMAIN}
        polling = read("appliance/platform/webapi/polling.cpp")
        start = re.search(r"\nbool APIPolling::Start\(.*?\n}\n", polling, re.DOTALL).group()
        # Whatever the store does in a start fails with a code of its own.
        started = {*re.findall(r"POLLING_FAIL\((\w+)", start), "TaskStoreFailed"}
        self.assertGreater(len(started), 2)
        self.assertLessEqual({framework[name] for name in started}, set(rows["update_start"]["codes"]))
        tasks = read("appliance/platform/webapi/task_store.cpp") + read("appliance/vornd/task_main.cpp")
        ended = set(re.findall(r"FrameworkCode::(\w+)", tasks))
        self.assertGreater(len(ended), 2)
        self.assertLessEqual({framework[name] for name in ended}, set(rows["update_status"]["codes"]))
        table = rows["update_status"]["description"]
        shown = {int(code) for code in re.findall(r"\b\d{3,4}\b", table)}
        self.assertLessEqual(set(rows["update_status"]["codes"]) - {2618}, shown)
        self.assertLessEqual({framework["NoSuchTask"], framework["TaskStoreFailed"]}, shown)

    def test_the_program_has_every_text(self):
        explained = json.loads(self.run_program("explain", "--json").out)
        wanted = [{name: entry[name] for name in ("code", "meaning", "cause", "action")} for entry in codes()["codes"]]
        self.assertEqual(explained, wanted)

    def test_the_methods_are_those_of_the_tables(self):
        first = table("src/api_table.cpp")
        second = table("appliance/module/api_table.cpp")
        self.assertEqual(len(first), 12)
        self.assertEqual(len(second), 8)
        described = [(method["api"], method["version"], method["method"]) for method in methods()]
        self.assertEqual(len(described), len(set(described)))
        self.assertEqual(set(described), set(first + second))

    def test_the_parameters_are_those_of_the_sources(self):
        texts = {"Core": sources("src"), "Appliance": sources("appliance/module")}
        checked = 0
        for method in methods():
            text = texts[method["api"].split(".")[1]]
            for parameter in method["parameters"]:
                for one in [parameter, *parameter.get("members", [])]:
                    self.assertIn(f'"{one["name"]}"', text, method)
                    checked += 1
        self.assertGreater(checked, 30)

    def test_the_descriptions_are_whole(self):
        for method in methods():
            self.assertEqual(list(method), ["api", "version", "method", "summary", "description", "parameters",
                                            "example_request", "example_answer", "codes"])
            self.assertRegex(method["summary"], r"^[A-Z].*[.?]$")
            for parameter in method["parameters"]:
                for one in [parameter, *parameter.get("members", [])]:
                    self.assertIn(one["type"], TYPES)
                    self.assertIsInstance(one["required"], bool)
                    self.assertRegex(one["description"], r"^[A-Z0-9].*\.$")
            self.assertLessEqual(set(method["codes"]), self.numbers(), method["method"])

    def test_the_examples_follow_the_descriptions(self):
        for method in methods():
            request = method["example_request"]
            by_name = {parameter["name"]: parameter for parameter in method["parameters"]}
            self.assertLessEqual(set(request), set(by_name))
            self.assertLessEqual({name for name, one in by_name.items() if one["required"]}, set(request))
            for name, value in request.items():
                self.assertIs(type(value), TYPES[by_name[name]["type"]], name)
            self.assertEqual(set(method["example_answer"]), {"success", "data"})
            self.assertTrue(method["example_answer"]["success"])

    def test_the_manual_names_every_command_and_option(self):
        manual = read("appliance/tools/vornctl/vornctl.1").replace("\\-", "-")
        manual = re.sub(r"\\f[BIRP]", "", manual)
        commands = re.findall(r"^  ([a-z]+) +[A-Z]", self.run_program("--help").out, re.MULTILINE)
        self.assertEqual(len(commands), 15)
        for command in commands:
            self.assertRegex(manual, rf'\n\.SS "?[^\n]*\b{command}\b')
            options = re.findall(r"--[a-z0-9-]+", self.run_program(command, "--help").out)
            self.assertGreater(len(options), 3)
            for option in options:
                self.assertIn(option, manual, command)

    def test_the_manual_says_what_the_help_says(self):
        parts = manual_parts()
        checked = 0
        for command in re.findall(r"^  ([a-z]+) +[A-Z]", self.run_program("--help").out, re.MULTILINE):
            (own,) = (text for title, text in parts.items() if command in re.findall(r"[a-z]+", title))
            for option, sentence in help_sentences(self.run_program(command, "--help").out):
                text = parts["OPTIONS"] if option in ("--json", "--socket", "--timeout", "--help") else own
                self.assertIn(sentence.lower(), text.lower(), f"{command} {option}")
                checked += 1
        self.assertGreater(checked, 80)

    def test_the_manual_has_every_exit_code(self):
        numbers = re.findall(r"^    k\w+ = (\d+),", read("appliance/tools/vornctl/exit_code.h"), re.MULTILINE)
        manual = read("appliance/tools/vornctl/vornctl.1").split('.SH "EXIT STATUS"')[1].split(".SH ")[0]
        self.assertEqual(re.findall(r"\.TP\n\.B (\d+)\n", manual), numbers)
        self.assertEqual(len(numbers), 7)

    def complete(self, *words):
        """What bash offers for the words of a line, the last one being typed."""
        line = ["vornctl", *words]
        script = (
            f'source "{ROOT}/appliance/tools/vornctl/completion.bash"\n'
            'complete -p vornctl >/dev/null || exit 1\n'
            'COMP_WORDS=(vornctl "$@") COMP_CWORD=$#\n'
            f'_vornctl "{self.program}" "$1" "" && printf "%s\\n" "${{COMPREPLY[@]}}"'
        )
        done = subprocess.run(["/bin/bash", "-c", script, "bash", *line[1:]], capture_output=True, timeout=DEADLINE,
                              env=self.environment(), check=False)
        self.assertEqual((done.returncode, done.stderr), (0, b""))
        return done.stdout.decode().split()

    def test_bash_completes_commands_and_options(self):
        commands = re.findall(r"^  ([a-z]+) +[A-Z]", self.run_program("--help").out, re.MULTILINE)
        self.assertEqual(self.complete(""), commands)
        self.assertEqual(self.complete("st"), ["status", "steps"])
        self.assertEqual(self.complete("--js"), ["--json"])
        self.assertEqual(self.complete("join", "--n"), ["--no-trusted-domains", "--netbios-name"])
        self.assertEqual(self.complete("options", "--sync-time", "o"), ["on", "off"])
        self.assertEqual(self.complete("schedule", "--repeat", "m"), ["monthly"])
        self.assertEqual(self.complete("--timeout", "5", "ex"), ["explain"])
        self.assertEqual(self.complete("join", "--user", ""), [])
        self.assertIn("2605", self.complete("explain", ""))

    def test_bash_completes_every_option_of_the_help(self):
        for command in self.complete(""):
            text = self.run_program(command, "--help").out
            options = re.findall(r"^  (?:-\w,)?(--[a-z0-9-]+)", text, re.MULTILINE)
            self.assertEqual(set(self.complete(command, "--")), set(options), command)

    def test_bash_completes_calls(self):
        for method in methods():
            self.assertIn(method["api"], self.complete("call", ""))
            self.assertIn(str(method["version"]), self.complete("call", method["api"], ""))
            self.assertIn(method["method"], self.complete("call", method["api"], str(method["version"]), ""))

    def test_bash_completes_domains(self):
        names = ("LAB", "OTHER", "LAB", "a\x1b", "")
        lists = [{"domain": name, "kind": "user", "count": 1, "fetched": 1} for name in names]
        self.script[f"{DIRECTORY}/1/domains"] = ok({"domains": lists})
        for command in ("refresh", "users", "groups"):
            self.assertEqual(self.complete("--socket", self.socket, command, "--domain", ""), ["LAB", "OTHER"])
        self.assertEqual(self.complete("--socket", self.socket, "users", "--domain", "O"), ["OTHER"])
        self.assertEqual(self.complete("--socket", self.folder + "/none", "users", "--domain", ""), [])


if __name__ == "__main__":
    main()
