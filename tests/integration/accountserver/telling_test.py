#!/usr/bin/env python3
"""What the installed tool says of the account server: which one it asks, and how the doctor finds it.

usage: telling_test.py BUILD_DIR SUITE
"""

import datetime
import email.utils
import json
import os
import subprocess
import sys
import unittest
from pathlib import Path

sys.path.insert(0, str(Path(__file__).resolve().parents[2] / "support"))
import account_server_test  # noqa: E402
import at_terminal  # noqa: E402
import machine  # noqa: E402
import tls_server  # noqa: E402
from account_server_test import PASSWORD, RIGHT, TOOL, AccountServerTest  # noqa: E402
from tls_server import answer, problem  # noqa: E402

TERMS = {"version": "2026-10", "text": "Be kind.", "url": "https://nimbus.example/terms"}
DESCRIPTION = {"server": "a server", "version": "1.2"}


def now(**away):
    return datetime.datetime.now(datetime.timezone.utc) + datetime.timedelta(**away)


class Setup(at_terminal.AtTerminal, AccountServerTest):
    @classmethod
    def setUpClass(cls):
        super().setUpClass()
        os.mknod(cls.root / "dev/tty", 0o020666, os.makedev(5, 0))

    def setUp(self):
        (self.root / "etc/anna.plist").write_text('{ Account = "anna"; }', encoding="ascii")

    def set_up(self, *options):
        return self.tool(*options, "setup", "--answers", "/etc/anna.plist")

    def test_from_a_script_it_says_which_server_it_asks_before_anything_else(self):
        self.settle(self.serve(account_server_test.right, certificate=self.certificate))
        done = self.set_up()
        self.assertEqual((done.returncode, done.stderr), (0, ""), done)
        self.assertTrue(done.stdout.startswith(f"Asking the account server {self.address}\n\nanna is set up.\n"), done)

    def test_it_says_so_of_a_server_that_does_not_answer(self):
        server = tls_server.Server(account_server_test.right)
        server.close()
        self.settle(server)
        done = self.set_up()
        self.assertEqual((done.returncode, done.stdout), (1, f"Asking the account server {self.address}\n"), done)

    def test_programs_have_it_in_the_document(self):
        self.settle(self.serve(account_server_test.right, certificate=self.certificate))
        self.assertEqual(json.loads(self.set_up("--json").stdout)["server"], self.address)

    def test_without_a_server_nothing_is_said_of_one(self):
        self.settle()
        added = self.tool("account", "add", "anna")
        self.assertEqual(added.returncode, 0, added)
        done = self.set_up()
        self.assertEqual((done.returncode, "account server" in done.stdout), (0, False), done)
        subprocess.run(["rm", "-r", str(self.root / "var/lib/welcomer")], check=True)

    def test_at_a_terminal_it_says_so_before_it_asks_and_offers_the_servers_terms(self):
        accepted = []

        def reply(line, body):
            if line.startswith("POST /v1/accept-terms "):
                accepted.append(json.loads(body))
                return b"HTTP/1.1 204 No Content\r\n\r\n"
            return answer(200, RIGHT) if accepted else problem(403, "terms-of-service", errorInfo=TERMS)

        self.settle(self.serve(reply, certificate=self.certificate))
        self.start_program(*self.machine._chroot([TOOL, "setup"], False))
        said = self.answer("account's name: ", "anna")
        self.assertIn(f"Your name and password go to the account server {self.address}\r\n", said)
        self.answer_password("Password for anna: ", PASSWORD)
        self.answer(r"accepted first:\r\nBe kind.\r\nhttps://nimbus.example/terms\r\nDo you accept them\? \[Y/n\] ", "y")
        self.answer(r"none \[all\]: ", "")
        self.answer(r"\[Y/n\] ", "")
        rest, status = self.end()
        self.assertEqual(status, 0, rest)
        self.assertEqual([(request["user"], request["password"], request["terms"]) for request in accepted],
                         [("anna", PASSWORD, TERMS)])


class Doctor(AccountServerTest):
    def look(self, seconds_ahead=0, certificate=None):
        """What the doctor says of a server with such a clock, and its advice where something is wrong with it."""
        def reply(*_):
            date = email.utils.format_datetime(now(seconds=seconds_ahead), usegmt=True)
            return answer(200, DESCRIPTION, fields=f"Date: {date}\r\n")

        server = self.serve(reply, certificate=certificate or self.certificate)
        self.settle(server)
        document = json.loads(self.machine.run([TOOL, "--json", "doctor"]).stdout)
        [found] = [each for each in document["backends"] if each["interface"] == "SignInDirectory"]
        wrong = [each for each in document["checks"] if each["subject"] == "account server"]
        self.assertEqual([(each["state"], each["text"], each["advice"]) for each in wrong],
                         [("wrong", found["reason"], found["advice"])] if found["advice"] else [])
        self.assertEqual([head.split("\r\n")[0] for head, _ in server.requests],
                         [] if "certificate of" in found["reason"] else ["GET /v1/server HTTP/1.1"])
        return found["reason"], found["advice"]

    def issue(self, name, **until):
        return self.authority.issue(name, end=now(**until).strftime("%Y%m%d%H%M%SZ"))

    def test_clocks_that_agree_are_right(self):
        reason, advice = self.look()
        # On a machine that is slow the answer has become old meanwhile.
        self.assertRegex(reason, r"^answers: a server 1\.2, certificate until 2049-01-01, "
                                 r"(clocks agree|its clock is \d+ s behind)$")
        self.assertIsNone(advice)

    def test_clocks_that_differ_by_more_than_two_minutes_are_wrong(self):
        for away, text in ((3600, "ahead"), (-3600, "behind")):
            reason, advice = self.look(away)
            self.assertRegex(reason, rf", its clock is 3[56]\d\d s {text}$")
            self.assertEqual(advice, "set this machine's clock, or the server's")
        reason, advice = self.look(100)
        self.assertRegex(reason, r", its clock is \d+ s ahead$")
        self.assertIsNone(advice)

    def test_a_certificate_that_ends_within_a_fortnight_is_wrong(self):
        reason, advice = self.look(certificate=self.issue("soon", days=13))
        self.assertIn(f", certificate until {now(days=13):%Y-%m-%d}, ", reason)
        self.assertEqual(advice, "have the server's certificate renewed")
        self.assertIsNone(self.look(certificate=self.issue("later", days=15))[1])

    def test_a_certificate_that_is_not_to_be_trusted_is_wrong(self):
        for name, certificate, text in (
                ("expired", self.authority.issue("past", end="20200201000000Z"), "has expired by this machine's clock"),
                ("other host", self.authority.issue("elsewhere", host="other.example"), "is for another host"),
                ("other authority", self.authority.self_signed(), "is from an authority that is not known")):
            with self.subTest(name):
                reason, advice = self.look(certificate=certificate)
                self.assertIn(text, reason)
                self.assertIn("welcomer-platform.conf(5)", advice)


if __name__ == "__main__":
    machine.enter_namespaces()
    subprocess.run(["ip", "link", "set", "lo", "up"], check=True)
    AccountServerTest.build = Path(sys.argv.pop(1)).resolve()
    unittest.main(verbosity=2)
