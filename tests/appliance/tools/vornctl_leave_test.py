"""Leaving a domain by the command line: what stays behind is named, whatever the form of the answer."""

import json

from vornctl_case import DIRECTORY, DOMAIN, MEMBER, VornctlCase, main, ok, refused


class Leave(VornctlCase):
    def test_leave(self):
        account = "the computer account NAS1$ stays on the domain controller"
        self.script[f"{DIRECTORY}/1/join_steps"] = [
            ok({"id": "old"}),
            ok({"id": "new", "action": "leave", "steps": [], "leftovers": [account]}),
        ]
        self.script[f"{DOMAIN}/1/set"] = ok(None)
        result = self.run_program("leave", "--yes")
        self.assertEqual(result.code, 0)
        self.assert_body(f"{DOMAIN}/1/set", {"enable_domain": False})
        self.assertIn("no member of a domain any more", result.out)
        self.assertIn(account, result.out.replace("\n           ", " "))

    def test_leave_as_json_names_what_stays(self):
        record = {"id": "new", "action": "leave", "finished": 1764230399, "steps": []}
        stays = "the computer account NAS1$ stays in the domain LAB"
        without = "The appliance's computer account NAS1$ stays in the domain LAB."
        self.script[f"{DOMAIN}/1/get"] = ok(MEMBER)
        self.script[f"{DIRECTORY}/1/overview"] = ok({"computer_account": "NAS1$"})
        self.script[f"{DOMAIN}/1/set"] = ok(None)
        for steps, data in (
            ([ok({"id": "old"}), ok({**record, "leftovers": [stays]})], {"leftovers": [stays]}),
            # Known to be gone.
            ([ok({"id": "old"}), ok({**record, "leftovers": []})], None),
            # Of the leave no step is recorded, or the record can't be had.
            (ok({"id": "old", "finished": 1, "leftovers": []}), {"leftovers": [without]}),
            (refused(2617), {"leftovers": [without]}),
        ):
            self.script[f"{DIRECTORY}/1/join_steps"] = steps
            result = self.run_program("leave", "--yes", "--json")
            self.assertEqual((result.code, result.err), (0, ""))
            self.assertEqual(json.loads(result.out), ok(data))
            self.assertEqual(result.out.count("\n"), 1)

    def test_leave_does_not_say_that_an_account_stays_which_is_gone(self):
        addresses = "the addresses of nas1.lab.test stay in DNS: Client not found in Kerberos database"
        self.script[f"{DOMAIN}/1/get"] = ok(MEMBER)
        self.script[f"{DIRECTORY}/1/overview"] = ok({"computer_account": "NAS1$"})
        self.script[f"{DOMAIN}/1/set"] = ok(None)
        for leftovers in ([addresses], []):
            record = {"id": "new", "action": "leave", "finished": 1764230399, "steps": [], "leftovers": leftovers}
            self.script[f"{DIRECTORY}/1/join_steps"] = [ok({"id": "old"}), ok(record)]
            result = self.run_program("leave", "--yes")
            self.assertEqual((result.code, result.err), (0, ""))
            self.assertNotIn("account", result.out)
            self.assertEqual(result.out.count("Note:"), len(leftovers))

    def test_leave_of_no_member(self):
        self.script[f"{DOMAIN}/1/get"] = ok({"enable_domain": False})
        self.script[f"{DIRECTORY}/1/join_steps"] = ok(None)
        self.script[f"{DOMAIN}/1/set"] = ok(None)
        result = self.run_program("leave", "--yes")
        self.assertEqual((result.code, result.err), (0, ""))
        self.assertIn("The appliance is not a member of a domain.\n", result.out)

    def test_leave_names_the_account_also_without_its_steps(self):
        self.script[f"{DOMAIN}/1/get"] = ok(MEMBER)
        self.script[f"{DOMAIN}/1/set"] = ok(None)
        self.assertIn("computer account stays in the domain LAB.", self.run_program("leave", "--yes").out)
        self.script[f"{DIRECTORY}/1/overview"] = ok({"computer_account": "NAS\x1b1$"})
        text = "  Note:    The appliance's computer account NAS\\x1B1$ stays in the domain LAB.\n"
        self.assertIn(text, self.run_program("leave", "--yes").out)

    def test_leave_asks_and_can_not_without_a_terminal(self):
        result = self.run_program("leave")
        self.assertEqual(result.code, 2)
        self.assertIn("--yes", result.err)
        self.assertEqual(self.server.sent(f"{DOMAIN}/1/set"), [])

    def test_leave_with_the_account(self):
        self.script[f"{DIRECTORY}/1/leave"] = ok(None)
        options = ("--yes", "--delete-account", "-u", "adm", "--password-stdin")
        result = self.run_program("leave", *options, given=b"s3cret\n")
        self.assertEqual(result.code, 0, result.err)
        self.assert_body(f"{DIRECTORY}/1/leave", {"delete_account": True, "username": "adm", "password": "s3cret"})

    def test_leave_refuses_half_a_request(self):
        self.assertEqual(self.run_program("leave", "--yes", "--delete-account").code, 2)
        self.assertEqual(self.run_program("leave", "--yes", "--user", "adm").code, 2)
        self.assertEqual(self.server.requests, [])


if __name__ == "__main__":
    main()
