"""Each command: what it asks the server for, what it prints, how it ends."""

import json
import subprocess

from vornctl_case import DIRECTORY, DOMAIN, EVENTS, MEMBER, OPTIONS, SCHEDULE, VornctlCase, main, ok, refused

class Commands(VornctlCase):
    def test_status_of_a_member(self):
        self.script[f"{DOMAIN}/1/get"] = ok(MEMBER)
        self.script[f"{DIRECTORY}/1/domains"] = ok(
            {
                "domains": [
                    {"domain": "LAB", "kind": "user", "count": 5009, "fetched": 1764230400},
                    {"domain": "OTHER", "kind": "user", "count": 7, "fetched": 1764230400},
                    {"domain": "lab", "kind": "group", "count": 61, "fetched": 0},
                ]
            }
        )
        result = self.run_program("status")
        self.assertEqual(result.code, 0)
        self.assertEqual(
            result.out,
            "Member of        LAB\n"
            "Kind of domain   Active Directory\n"
            "DNS name         LAB.TEST\n"
            "Trusted domains  used\n"
            "DNS servers      10.0.0.1, 10.0.0.2\n"
            "Local lists      5009 users of 2025-11-27 08:00:00; 61 groups of never\n",
        )
        self.assertEqual(result.err, "")
        self.assert_body(f"{DOMAIN}/1/get", {})

    def test_status_tells_of_the_last_test(self):
        self.script[f"{DOMAIN}/1/get"] = ok(MEMBER)
        for test, text in (
            ({"time": 1764230400, "success": True, "milliseconds": 120}, "worked, 2025-11-27 08:00:00, 0.12 s"),
            ({"time": 1764230400, "success": False, "milliseconds": 5000}, "failed, 2025-11-27 08:00:00, 5.00 s"),
            (None, 'none yet; "vornctl test" makes one'),
        ):
            self.script[f"{DIRECTORY}/1/overview"] = ok({"computer_account": "NAS1$", "last_test": test})
            result = self.run_program("status")
            self.assertIn(f"Last test        {text}\n", result.out)
            self.assert_fits(result.out)
            self.assertEqual(json.loads(self.run_program("status", "--json").out), ok({**MEMBER, "last_test": test}))

    def test_status_names_the_advanced_options(self):
        given = {"enable_advance_option": True, "kdc": "10.0.0.9", "register_nics": ["a", "b"]}
        changed = {"domain_type": "NT4", "manage_mode": 1, "advance_domain_conf": given}
        self.script[f"{DOMAIN}/1/get"] = ok({**MEMBER, **changed})
        result = self.run_program("status")
        self.assertIn("Kind of domain    NT4-style\n", result.out)
        self.assertIn("Trusted domains   not used\n", result.out)
        self.assertIn("Controller given  10.0.0.9\n", result.out)
        self.assertIn("Addresses in DNS  of a, b\n", result.out)

    def test_status_of_no_member(self):
        self.script[f"{DOMAIN}/1/get"] = ok({"enable_domain": False})
        self.script[f"{DIRECTORY}/1/overview"] = ok({"computer_account": None, "last_test": None})
        result = self.run_program("status")
        self.assertEqual(result.code, 0)
        self.assertIn("The appliance is not a member of a domain.\n", result.out)
        self.assertEqual(json.loads(self.run_program("status", "--json").out), ok({"enable_domain": False}))

    def test_status_as_json(self):
        self.script[f"{DOMAIN}/1/get"] = ok(MEMBER)
        for arguments in (["status", "--json"], ["--json", "status"]):
            result = self.run_program(*arguments)
            self.assertEqual(json.loads(result.out), ok(MEMBER))
            self.assertEqual(result.out.count("\n"), 1)
            self.assertEqual(result.err, "")

    def test_the_request_is_plain_http(self):
        self.script[f"{DOMAIN}/1/get"] = ok(MEMBER)
        self.run_program("status", "--json")
        request = self.server.requests[0]
        self.assertEqual(request.verb, "POST")
        self.assertEqual(request.path, f"/webapi/{DOMAIN}/1/get")
        self.assertEqual(request.headers["content-type"], "application/json")
        self.assertEqual(request.headers["host"], "localhost")

    def test_test_that_works(self):
        self.script[f"{DOMAIN}/1/test_dc"] = ok({"test_join_success": True})
        result = self.run_program("test")
        self.assertEqual((result.code, result.err), (0, ""))
        self.assertIn("The membership works", result.out)

    def test_test_that_does_not_work(self):
        self.script[f"{DOMAIN}/1/test_dc"] = ok({"test_join_success": False})
        self.script[f"{DOMAIN}/1/get"] = ok(MEMBER)
        result = self.run_program("test")
        self.assertEqual(result.code, 5)
        self.assertIn("The membership does not work.", result.out)
        self.assertEqual(self.run_program("test", "--json").code, 5)

    def test_test_of_no_member(self):
        self.script[f"{DOMAIN}/1/test_dc"] = ok({"test_join_success": False})
        self.script[f"{DOMAIN}/1/get"] = ok({"enable_domain": False})
        result = self.run_program("test")
        self.assertEqual(result.code, 5)
        self.assertIn("not a member", result.out)

    def test_list(self):
        rows = [["LAB", "LAB", "lab.test"], ["OLD", "OLD", ""]]
        self.script[f"{DOMAIN}/2/get_domain_list"] = ok({"domain_list": rows})
        result = self.run_program("list")
        self.assertEqual(result.out, "DOMAIN  DNS NAME\nLAB     lab.test\nOLD     -\n")

    def test_list_of_organisational_units(self):
        rows = [["--", "", "LAB"], ["Sales", "ou=Sales", "ou=Sales"]]
        self.script[f"{DOMAIN}/2/get_domain_list"] = ok({"domain_list": rows})
        result = self.run_program("list")
        self.assertIn("Organisational units of LAB:", result.out)
        self.assertIn("Sales  ou=Sales\n", result.out)
        self.script[f"{DOMAIN}/2/get_domain_list"] = ok({"domain_list": rows[:1]})
        self.assertTrue(self.run_program("list").out.endswith("\nnone\n"))

    def test_list_version_1(self):
        self.script[f"{DOMAIN}/1/get_domain_list"] = ok({"domain_list": ["LAB", "OTHER"]})
        self.assertEqual(self.run_program("list", "--v1").out, "LAB\nOTHER\n")

    def test_list_of_no_member(self):
        self.script[f"{DOMAIN}/2/get_domain_list"] = ok({"domain_list": []})
        result = self.run_program("list")
        self.assertEqual((result.code, result.out), (0, ""))
        self.assertIn("not a member", result.err)

    def test_options(self):
        self.script[f"{OPTIONS}/1/get"] = ok(
            {
                "enable_sync_time": True,
                "enable_server_signing": False,
                "enable_rpc_enum_usergroup": False,
                "domain_nested_group": 3,
                "disable_domain_admins": True,
            }
        )
        result = self.run_program("options")
        self.assertEqual(result.code, 0)
        self.assertRegex(result.out, r"Server signing +off +--server-signing\n")
        self.assertRegex(result.out, r"Time synchronisation +on +--sync-time\n")
        self.assertRegex(result.out, r"Domain administrators +off +--domain-admins\n")
        self.assertRegex(result.out, r"Depth of nested groups +3 +--nested-groups\n")
        self.assertEqual(self.server.sent(f"{OPTIONS}/1/set"), [])

    def test_options_set(self):
        self.script[f"{OPTIONS}/1/set"] = ok(None)
        self.script[f"{OPTIONS}/1/get"] = ok({"enable_server_signing": True})
        switches = ("--server-signing", "on", "--sync-time", "off", "--rpc-enum", "on", "--domain-admins", "off")
        self.run_program("options", *switches, "--nested-groups", "7")
        self.assert_body(
            f"{OPTIONS}/1/set",
            {
                "enable_server_signing": True,
                "enable_sync_time": False,
                "enable_rpc_enum_usergroup": True,
                "disable_domain_admins": True,
                "domain_nested_group": 7,
            },
        )

    def test_options_that_are_not_named_are_not_sent(self):
        self.script[f"{OPTIONS}/1/set"] = ok(None)
        result = self.run_program("options", "--domain-admins", "on", "--json")
        self.assert_body(f"{OPTIONS}/1/set", {"disable_domain_admins": False})
        self.assertEqual(json.loads(result.out), ok(None))

    def test_schedule_set(self):
        cases = {
            ("--weekly", "sun,WED", "--at", "03:30"): {"date_type": 0, "week_name": "0,3", "hour": 3, "min": 30},
            ("--weekly", "all", "--at", "6:05", "--every", "4", "--until", "20"): {
                "date_type": 0,
                "week_name": "0,1,2,3,4,5,6",
                "hour": 6,
                "min": 5,
                "repeat_hour": 4,
                "last_work_hour": 20,
            },
            ("--date", "2026-11-29", "--at", "23:59"): {
                "date_type": 1,
                "date": "2026/11/29",
                "repeat": 0,
                "hour": 23,
                "min": 59,
            },
            ("--date", "2026/1/2", "--repeat", "monthly", "--at", "00:00"): {
                "date_type": 1,
                "date": "2026/1/2",
                "repeat": 3,
                "hour": 0,
                "min": 0,
            },
            ("--off",): {"date_type": 2},
        }
        self.script[f"{SCHEDULE}/1/set"] = ok(None)
        self.script[f"{SCHEDULE}/1/get"] = ok({"date_type": 2})
        for arguments, body in cases.items():
            self.server.requests.clear()
            result = self.run_program("schedule", *arguments)
            self.assertEqual(result.code, 0, result.err)
            self.assert_body(f"{SCHEDULE}/1/set", body)

    def test_schedule_shown(self):
        values = {
            "date": "",
            "date_type": 0,
            "hour": 3,
            "last_work_hour": 20,
            "min": 30,
            "repeat": 0,
            "repeat_hour": 4,
            "week_name": "0,3",
        }
        self.script[f"{SCHEDULE}/1/get"] = ok(values)
        result = self.run_program("schedule")
        self.assertEqual(result.code, 0)
        self.assertIn("Every Sunday and Wednesday at 03:30 and every 4 hours from then to 19:30.\n", result.out)
        self.assertIn("repeat_hour 4", result.out)
        self.assert_fits(result.out)

    def test_schedule_that_is_none(self):
        self.script[f"{SCHEDULE}/1/get"] = ok({"date_type": 2})
        self.assertIn("There is no schedule", self.run_program("schedule").out)

    def test_schedule_refuses_what_can_not_be(self):
        for arguments in (
            ["--weekly", "sun"],
            ["--at", "03:30"],
            ["--weekly", "sonntag", "--at", "03:30"],
            ["--weekly", "sun", "--at", "3.30"],
            ["--weekly", "sun", "--at", "24:00"],
            ["--weekly", "sun", "--at", "03:60"],
            ["--weekly", "sun", "--at", "03:300"],
            ["--weekly", "sun", "--date", "2026-11-29", "--at", "03:30"],
            ["--weekly", "sun", "--repeat", "daily", "--at", "03:30"],
            ["--weekly", "sun", "--at", "03:30", "--until", "9"],
            ["--weekly", "sun", "--at", "09:30", "--every", "2", "--until", "8"],
            ["--weekly", "sun", "--at", "09:30", "--every", "0"],
            ["--date", "29.11.2026", "--at", "03:30"],
            ["--date", "2026-11-29", "--repeat", "hourly", "--at", "03:30"],
            ["--off", "--at", "03:30"],
        ):
            result = self.run_program("schedule", *arguments)
            self.assertEqual(result.code, 2, arguments)
            self.assertIn("vornctl schedule --help", result.err)
        self.assertEqual(self.server.requests, [])

    def test_users(self):
        self.script[f"{DIRECTORY}/1/users"] = ok(
            {
                "total": 5009,
                "offset": 10,
                "domain": "LAB",
                "fetched": 1764230400,
                "entries": [
                    {"name": "anna", "id": 1001104, "display": "Anna Bergström"},
                    {"name": "x" * 70, "id": None, "display": "y" * 70},
                ],
            }
        )
        result = self.run_program("users", "--offset", "10", "--limit", "2", "--search", "a", "--domain", "LAB")
        self.assertEqual(result.code, 0)
        self.assertRegex(result.out, r"\nanna +1001104  Anna Bergström\n")
        self.assert_fits(result.out)
        self.assertEqual(result.out.count("x") + result.out.count("y"), 140)
        self.assertIn("11 to 12 of 5009 users that match of LAB, fetched 2025-11-27 08:00:00.", result.err)
        self.assertIn("--offset 12", result.err)
        self.assert_body(f"{DIRECTORY}/1/users", {"offset": 10, "limit": 2, "search": "a", "domain": "LAB"})

    def test_groups(self):
        self.script[f"{DIRECTORY}/1/groups"] = ok(
            {"total": 0, "offset": 0, "domain": "LAB", "fetched": 1764230400, "entries": []}
        )
        result = self.run_program("groups")
        self.assertEqual((result.code, result.out), (0, ""))
        self.assertIn("None of 0 groups of LAB", result.err)
        self.assert_body(f"{DIRECTORY}/1/groups", {"offset": 0, "limit": 100})

    def test_a_list_that_was_never_fetched(self):
        nothing = {"total": 0, "offset": 0, "domain": "LAB", "fetched": None, "entries": []}
        self.script[f"{DIRECTORY}/1/users"] = ok(nothing)
        result = self.run_program("users")
        self.assertEqual((result.code, result.out), (0, ""))
        self.assertIn("no list of the users of LAB yet", result.err)

    def test_events(self):
        event = {"time": 1764230393, "kind": 2, "level": 1, "code": 0x11800404, "text": "joined \x1b[31mLAB\n now"}
        self.script[f"{EVENTS}/1/list"] = ok({"total": 12, "events": [event]})
        result = self.run_program("events", "--limit", "1")
        self.assertEqual(result.code, 0)
        self.assertIn("2025-11-27 07:59:53", result.out)
        self.assertRegex(result.out, r"^TIME +KIND +LEVEL +CODE +EVENT\n.* domain +information +0x11800404  ")
        self.assertIn("joined \\x1B[31mLAB\\x0A now", result.out)
        self.assertIn("1 of 12 events.", result.err)
        self.assert_body(f"{EVENTS}/1/list", {"offset": 0, "limit": 1})
        self.script[f"{EVENTS}/1/list"] = ok({"total": 2, "events": [{**event, "kind": 7, "level": 3}, {"kind": "x"}]})
        result = self.run_program("events")
        self.assertRegex(result.out, r" kind 7 +level 3 +0x11800404 ")
        self.assertRegex(result.out, r"\nnever +- +- ")

    def test_steps(self):
        self.script[f"{DIRECTORY}/1/join_steps"] = ok(
            {
                "id": "1-2",
                "action": "join",
                "domain": "lab.test",
                "started": 1764230393,
                "finished": 1764230399,
                "success": False,
                "message": "Invalid KDC ip.",
                "steps": [
                    {"name": "find", "server": "dc1", "outcome": "ok", "detail": "", "milliseconds": 42},
                    {"name": "check", "server": "", "outcome": "failed", "detail": "timed out", "milliseconds": 5000},
                ],
                "leftovers": ["the account NAS1$"],
            }
        )
        result = self.run_program("steps")
        self.assertEqual(result.code, 0)
        shown = ("join lab.test", "failed", "Invalid KDC ip.", "the account NAS1$", "find  [dc1]  0.04 s", "timed out")
        for text in shown:
            self.assertIn(text, result.out)

    def test_link(self):
        token = "a4KGh0frGnsZObBQTLacUD-b7oDfSKEufxooEVDRLt8"
        self.script["/session/new-link"] = ok({"token": token, "expires": 1764230400})
        result = self.run_program("link")
        self.assertEqual((result.code, result.out), (0, f"Token  {token}\nLink   /#/link/{token}\n"))
        self.assertEqual(result.err, "It logs in once, until 2025-11-27 08:00:00.\n")
        self.assert_body("/session/new-link", {})
        self.assertEqual(self.server.requests[0].verb, "POST")
        for address in ("https://nas1.example.com:8443", "https://nas1/", "http://127.0.0.1:80", "https://[::1]:8443"):
            result = self.run_program("link", "--address", address)
            self.assertIn(f"Link   {address.rstrip('/')}/#/link/{token}\n", result.out)
        self.assertEqual(json.loads(self.run_program("link", "--json").out)["data"]["token"], token)

    def test_link_to_what_is_no_page(self):
        addresses = ("nas1", "https://", "ftp://nas1", "https://nas1/page", "https://a b", "https://nas1:x", "https://[]",
                     "https://nas1:", "https://u@nas1", "https://nas1\x1b", "https://[::1]x:1")
        for address in addresses:
            result = self.run_program("link", "--address", address)
            self.assertEqual((result.code, result.out), (2, ""), address)
            self.assertIn("--address", result.err)
        self.assertEqual(self.server.requests, [])

    def test_link_that_is_none(self):
        self.script["/session/new-link"] = ok({})
        self.assertEqual(self.run_program("link").code, 3)

    def test_steps_when_there_are_none(self):
        for nothing in (None, {}):
            self.script[f"{DIRECTORY}/1/join_steps"] = ok(nothing)
            result = self.run_program("steps")
            self.assertEqual((result.code, result.out), (0, ""))
            self.assertIn("No join", result.err)

    def test_explain(self):
        result = self.run_program("explain", "2605")
        self.assertEqual(result.code, 0)
        self.assertIn("No domain controller was found.", result.out)
        self.assertEqual(self.run_program("explain", "9999").code, 1)
        self.assertIn("2605  No domain controller was found.\n", self.run_program("explain").out)
        self.assertEqual(json.loads(self.run_program("explain", "2605", "--json").out)[0]["code"], 2605)
        self.assertEqual(self.server.requests, [])

    def test_call(self):
        self.script[f"{DOMAIN}/2/get_domain_list"] = ok({"domain_list": []})
        result = self.run_program("call", DOMAIN, "2", "get_domain_list")
        self.assertEqual(json.loads(result.out), {"domain_list": []})
        self.assert_body(f"{DOMAIN}/2/get_domain_list", {})
        self.script[f"{OPTIONS}/1/set"] = ok(None)
        result = self.run_program("call", OPTIONS, "1", "set", '{"domain_nested_group": 2}', "--json")
        self.assertEqual(json.loads(result.out), ok(None))
        self.assert_body(f"{OPTIONS}/1/set", {"domain_nested_group": 2})

    def test_no_control_byte_reaches_the_terminal(self):
        every = "".join(map(chr, [*range(32), *range(127, 160)]))
        for answer in (ok({every: every}), refused(2617, {every: every})):
            self.script[f"{DOMAIN}/1/get"] = answer
            self.script[f"{DOMAIN}/1/test_dc"] = answer
            for arguments in (["call", DOMAIN, "1", "get"], ["call", DOMAIN, "1", "get", "--json"], ["test", "--json"]):
                result = self.run_program(*arguments)
                self.assertRegex(result.out + result.err, r"^[\n -~]+$", arguments)
                if result.code != 1 or "--json" in arguments:
                    self.assertIn(json.loads(result.out), (answer, answer.get("data")))

    def test_call_with_parameters_from_the_input(self):
        self.script[f"{OPTIONS}/1/set"] = ok(None)
        self.run_program("call", OPTIONS, "1", "set", "-", given=b'{"enable_sync_time": true}')
        self.assert_body(f"{OPTIONS}/1/set", {"enable_sync_time": True})

    def test_call_refuses_bad_arguments(self):
        for arguments in (
            [DOMAIN, "1", "get", "[]"],
            [DOMAIN, "1", "get", "{"],
            [DOMAIN, "x", "get"],
            [DOMAIN, "-1", "get"],
            ["a/b", "1", "get"],
            [DOMAIN, "1", "g\nt"],
            [DOMAIN, "1"],
        ):
            result = self.run_program("call", *arguments)
            self.assertEqual(result.code, 2, arguments)
        self.assertEqual(self.run_program("call", DOMAIN, "1", "get", "-", given=b"x" * 65537).code, 2)
        self.assertEqual(self.server.requests, [])

    def test_a_closed_output_shows(self):
        self.script[f"{DOMAIN}/1/get"] = ok(MEMBER)
        with open("/dev/full", "wb") as full:
            done = subprocess.run(self.command("status"), stdout=full, stderr=subprocess.PIPE, timeout=20, check=False,
                                  env=self.environment())
        self.assertEqual(done.returncode, 6)
        self.assertIn(b"could not be written", done.stderr)

    def test_no_colours_without_a_terminal(self):
        self.script[f"{DOMAIN}/1/test_dc"] = ok({"test_join_success": True})
        self.assertNotIn("\x1b", self.run_program("test", TERM="xterm").out)
        self.script[f"{DOMAIN}/1/get"] = refused(2622)
        self.assertNotIn("\x1b", self.run_program("status", TERM="xterm").err)


if __name__ == "__main__":
    main()
