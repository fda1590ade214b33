#!/usr/bin/env python3
"""The tool's commands about cloud accounts, their services and setting one up.

Run like tool_test.py beside it.
"""

import json
import os
import plistlib
import re
import signal
import subprocess
import time
import unittest

from tool_test import PROGRAM, ToolTest

DIRECTORY = "var/lib/welcomer/nimbus-directory.plist"
SERVICE = "com.corvid.nimbus.service."
PRE_LOGIN = ["photo-stream", "account-sync", "locator", "documents"]
POST_LOGIN = ["contacts", "calendars", "bookmarks", "reminders", "mail", "notes"]
ALL = ["contacts", "calendars", "bookmarks", "photo-stream", "reminders", "account-sync", "locator", "mail", "notes",
       "documents"]
ALIASES = ["anna@nimbus.example", "+1 555 0100"]
PASSWORD = "open sesame"


class CloudTest(ToolTest):
    def setUp(self):
        super().setUp()
        self.directory = self.root / DIRECTORY

    def with_password(self, password, *arguments, **options):
        """The tool below the root, with a password in a descriptor and without a terminal."""
        reading, writing = os.pipe()
        os.write(writing, (password + "\nnot the password\n").encode())
        os.close(writing)
        try:
            return self.run_below_root(*arguments, "--password-fd", reading, pass_fds=[reading],
                                       start_new_session=True, **options)
        finally:
            os.close(reading)

    def add(self, user="anna", password=PASSWORD, aliases=ALIASES):
        options = [option for alias in aliases for option in ("--alias", alias)]
        self.succeeds(self.with_password(password, "account", "add", user, "--mail", f"{user}@nimbus.example", *options))

    def change_user(self, user="anna", **values):
        """What an administrator would do with an editor."""
        directory = plistlib.loads(self.directory.read_bytes())
        directory["Users"][user].update(values)
        self.directory.write_bytes(plistlib.dumps(directory))

    def json(self, *arguments):
        return json.loads(self.succeeds(self.run_below_root("--json", *arguments)))

    def states(self, user="anna"):
        return {service["service"]: service for service in self.json("account", "services", user)["services"]}

    def enabled(self, user="anna"):
        return [name for name, service in self.states(user).items() if service["enabled"]]


class Account(CloudTest):
    def test_at_first_nobody_is_there(self):
        self.assertEqual(self.json("account", "list"), {"accounts": []})
        self.assertEqual(self.json("account", "status"),
                         {"loggedIn": None, "enabledServices": [], "noServicesEnabled": True})
        self.assertIn("Nobody is logged in", self.succeeds(self.run_below_root("account", "status")))
        self.assertIn("No accounts", self.succeeds(self.run_below_root("account", "list")))
        self.fails(self.run_below_root("account", "services"), 1, "nobody is logged in")
        self.assertFalse(self.directory.exists(), "looking makes nothing")

    def test_an_added_user_can_sign_in_and_has_no_account_before(self):
        self.add()
        self.assertEqual(self.json("account", "list")["accounts"],
                         [{"name": "anna", "canSignIn": True, "hasAccount": False, "loggedIn": False}])
        self.fails(self.run_below_root("account", "services", "anna"), 1, "there is no account anna")
        self.assertIn("anna is signed in", self.succeeds(self.with_password(PASSWORD, "account", "sign-in", "anna")))
        self.assertEqual(self.json("account", "list")["accounts"],
                         [{"name": "anna", "canSignIn": True, "hasAccount": True, "loggedIn": True}])
        self.assertEqual(self.json("account", "status"),
                         {"loggedIn": "anna", "enabledServices": [], "noServicesEnabled": True})
        rows = self.succeeds(self.run_below_root("account", "list")).splitlines()
        self.assertRegex(rows[1], r"^anna +yes +yes +yes$")

    def test_the_password_is_never_stored_or_shown(self):
        self.add()
        result = self.with_password(PASSWORD, "--verbose", "account", "sign-in", "anna")
        self.assertEqual(result.returncode, 0)
        self.assertIn("signInWithUsername", result.stderr)
        self.assertNotIn(PASSWORD, result.stderr + result.stdout)
        for path in self.root.rglob("*"):
            if path.is_file():
                self.assertNotIn(PASSWORD.encode(), path.read_bytes(), path)
        self.assertEqual(self.directory.stat().st_mode & 0o777, 0o600)

    def test_the_results_in_json(self):
        self.assertEqual(json.loads(self.succeeds(self.with_password("x", "--json", "account", "add", "bert"))),
                         {"user": "bert", "added": True})
        self.assertEqual(json.loads(self.succeeds(self.with_password("x", "--json", "account", "sign-in", "bert"))),
                         {"account": "bert", "signedIn": True})

    def test_a_user_is_not_added_twice(self):
        self.add()
        before = self.directory.read_bytes()
        self.fails(self.with_password("other", "account", "add", "anna"), 1, "anna exists already")
        self.assertEqual(self.directory.read_bytes(), before)

    def test_an_empty_name_and_an_empty_password_are_refused(self):
        self.fails(self.with_password("x", "account", "add", ""), 2, "name is empty")
        self.fails(self.with_password("x", "account", "sign-in", ""), 2, "name is empty")
        self.fails(self.with_password("", "account", "add", "anna"), 1, "the password is empty")
        self.assertFalse(self.directory.exists())

    def test_no_password_on_the_command_line(self):
        self.add()
        self.fails(self.run_below_root("account", "sign-in", "anna", PASSWORD), 2, "--help")

    def test_without_a_terminal_and_a_descriptor_it_is_a_usage_error(self):
        self.fails(self.run_below_root("account", "add", "anna", start_new_session=True), 2,
                   "no terminal.*--password-fd N")
        self.fails(self.run_below_root("setup", start_new_session=True), 2, "no terminal.*--answers PLIST")

    def test_a_descriptor_that_is_not_open_or_no_number(self):
        self.fails(self.run_below_root("account", "add", "anna", "--password-fd", 77), 1,
                   "--password-fd 77: Bad file descriptor")
        for number in ("-1", "x"):
            self.fails(self.run_below_root("account", "add", "anna", "--password-fd", number), 2, "--password-fd")

    def test_only_the_first_line_of_the_descriptor_is_read(self):
        reading, writing = os.pipe()
        os.write(writing, b"secret\nrest")
        os.close(writing)
        self.succeeds(self.run_below_root("account", "add", "anna", "--password-fd", reading, pass_fds=[reading]))
        self.assertEqual(os.read(reading, 100), b"rest")
        os.close(reading)

    def test_a_directory_that_is_damaged_stays_as_it_is_and_is_the_reason(self):
        self.directory.parent.mkdir(parents=True)
        self.directory.write_text("<plist><dict><key>torn")
        self.fails(self.with_password("x", "account", "add", "anna"), 1, "nimbus-directory.plist: ")
        self.assertEqual(self.directory.read_text(), "<plist><dict><key>torn")
        self.fails(self.with_password("x", "account", "sign-in", "anna"), 1, "directory of users")

    def test_every_outcome_of_a_sign_in_is_told(self):
        self.fails(self.with_password("x", "account", "sign-in", "anna"), 1, "directory of users is missing")
        self.add()
        self.fails(self.with_password("x", "account", "sign-in", "anna"), 1, "the password is wrong")
        self.fails(self.with_password("x", "account", "sign-in", "bert"), 1, "there is no such user")
        for values, reason in (({"AccountError": 3}, r"terms of service are to be accepted first\n"),
                               ({"AccountError": 3, "AccountErrorInfo": "terms 7"}, r"accepted first \(terms 7\)"),
                               ({"AccountError": 5, "AccountErrorInfo": {"url": "x"}}, r"repaired first \({url = x}\)"),
                               ({"AccountError": 42}, "account error 42"),
                               ({"Fails": True}, "the server gave no reason"),
                               ({"Response": {"status": 2}}, "a status other than 0")):
            with self.subTest(values):
                before = self.directory.read_bytes()
                self.change_user(**values)
                self.fails(self.with_password(PASSWORD, "account", "sign-in", "anna"), 1,
                           r"cannot sign in anna: .*" + reason.replace(r"\n", ""))
                self.directory.write_bytes(before)
                self.assertIsNone(self.json("account", "status")["loggedIn"])

    def test_a_failure_with_account_error_0_is_a_success_of_the_check_but_the_sign_in_fails(self):
        self.add()
        self.change_user(AccountError=0)
        self.fails(self.with_password(PASSWORD, "account", "sign-in", "anna"), 1, "could not be completed: account error 0$")

    def test_an_account_that_cannot_be_stored_is_the_reason_that_the_sign_in_fails(self):
        self.add()
        (self.home / "Library").mkdir(parents=True, exist_ok=True)
        (self.home / "Library/Accounts").write_text("in the folder's place")
        self.fails(self.with_password(PASSWORD, "account", "sign-in", "anna"), 1,
                   "could not be completed: the account could not be stored")

    def test_somebody_else_who_is_logged_in_is_in_the_way(self):
        self.add()
        self.add("bert")
        self.succeeds(self.with_password(PASSWORD, "account", "sign-in", "anna"))
        self.fails(self.with_password(PASSWORD, "account", "sign-in", "bert"), 1, "anna is logged in")
        self.succeeds(self.with_password(PASSWORD, "account", "sign-in", "anna"))
        self.assertEqual(self.json("account", "status")["loggedIn"], "anna")

    def test_the_table_of_services(self):
        self.add()
        self.change_user(Services={SERVICE + "mail": {"CanBeEnabled": False}, SERVICE + "locator": {}})
        self.succeeds(self.with_password(PASSWORD, "account", "sign-in", "anna"))
        rows = [re.split("  +", row) for row in self.succeeds(self.run_below_root("account", "services")).splitlines()]
        self.assertEqual(rows[0], ["SERVICE", "PHASE", "PRESENT", "CAN BE ENABLED", "ENABLED"])
        self.assertEqual([row[0] for row in rows[1:]], ALL)
        table = {row[0]: row[1:] for row in rows}
        self.assertEqual(table["mail"], ["post-login", "yes", "no", "no"])
        self.assertEqual(table["locator"], ["pre-login", "yes", "yes", "no"])
        self.assertEqual(table["contacts"], ["post-login", "no", "no", "no"])

    def test_the_answer_that_takes_its_time_is_waited_for(self):
        self.add()
        self.change_user(DelaySeconds=1)
        started = time.monotonic()
        self.succeeds(self.with_password(PASSWORD, "account", "sign-in", "anna"))
        self.assertGreaterEqual(time.monotonic() - started, 2, "the check and the sign-in")


class Services(CloudTest):
    def test_the_catalogue_with_its_phases(self):
        services = self.json("services", "list")["services"]
        self.assertEqual([service["service"] for service in services], ALL)
        self.assertEqual([service["service"] for service in services if service["phase"] == "pre-login"], PRE_LOGIN)
        self.assertEqual([service["service"] for service in services if service["delayed"]], ["calendars", "reminders"])
        self.assertEqual(len({service["identifier"] for service in services}), 10)
        rows = self.succeeds(self.run_below_root("services", "list")).splitlines()
        self.assertRegex(rows[2], rf"^calendars +post-login +yes +{SERVICE}calendars$")

    def enable(self, *arguments):
        return self.json("services", "enable", "--account", "anna", *arguments)

    def test_the_pre_login_phase(self):
        self.add()
        document = self.enable("--phase", "pre")
        self.assertEqual(self.enabled(), PRE_LOGIN)
        self.assertEqual((document["account"], document["phase"]), ("anna", "pre-login"))
        self.assertEqual(len(document["log"]), 10)
        self.assertIn(f"{SERVICE}contacts should be configured post-login", document["log"])
        self.assertEqual([service["service"] for service in document["services"] if service["enabled"]], PRE_LOGIN)

    def test_the_post_login_phase_waits_for_its_delayed_tasks(self):
        self.add()
        started = time.monotonic()
        document = self.enable("--phase", "post")
        self.assertGreaterEqual(time.monotonic() - started, 3)
        self.assertEqual(self.enabled(), POST_LOGIN)
        self.assertIn(f"Enabling '{SERVICE}calendars' after a 3.00 second delay", document["log"])
        self.assertEqual(sorted(document["log"][-2:]),
                         [f"Enabling Nimbus service '{SERVICE}{name}'" for name in ("calendars", "reminders")])

    def test_the_delay_can_be_set(self):
        self.add()
        preferences = self.home / "Library/Preferences"
        preferences.mkdir(parents=True)
        (preferences / "com.corvid.welcomer.plist").write_bytes(plistlib.dumps({"WLDebugPostLoginDelay": 1}))
        document = self.enable("--phase", "post", "--select", "calendars")
        self.assertIn(f"Enabling '{SERVICE}calendars' after a 1.00 second delay", document["log"])
        self.assertEqual(self.enabled(), ["calendars"])

    def test_what_is_not_selected_is_opted_out_by_name_or_identifier(self):
        self.add()
        document = self.enable("--phase", "pre", "--select", "locator", "--select", SERVICE + "documents")
        self.assertEqual(self.enabled(), ["locator", "documents"])
        self.assertIn(f"User opted out of {SERVICE}mediastream", document["log"])

    def test_documents_alone_whatever_the_phase_and_the_selection(self):
        self.add()
        self.assertEqual(self.enable("--phase", "post", "--only", "kvs", "--select", "mail")["log"], [])
        self.assertEqual(self.enabled(), ["documents"])

    def test_people_see_the_log_lines_and_the_table(self):
        self.add()
        text = self.succeeds(self.run_below_root("services", "enable", "--account", "anna", "--phase", "pre"))
        self.assertIn("Enabling Nimbus Locator\n", text)
        self.assertRegex(text, r"\nlocator +pre-login +yes +yes +yes\n")

    def test_what_makes_no_sense(self):
        for arguments in (["--phase", "mid"], [], ["--phase", "pre", "--only", "mail"],
                          ["--phase", "pre", "--select", "nonsense"], ["--phase", "pre", "--select"]):
            with self.subTest(arguments):
                self.fails(self.run_below_root("services", "enable", "--account", "anna", *arguments), 2, "--help")
        self.fails(self.run_below_root("services", "enable", "--phase", "pre"), 2, "--account")

    def test_an_account_that_cannot_be_had_is_a_failure(self):
        self.fails(self.run_below_root("services", "enable", "--account", "", "--phase", "pre"), 1,
                   "Failed to retrieve SK_Account")

    def test_interrupted_while_waiting_it_ends(self):
        self.add()
        process = subprocess.Popen([PROGRAM, "--root", self.root, "--verbose", "services", "enable", "--account", "anna",
                                    "--phase", "post"], stdout=subprocess.DEVNULL, stderr=subprocess.PIPE, text=True)
        for line in process.stderr:
            if "Documents" in line or "documents" in line:
                break
        process.send_signal(signal.SIGINT)
        self.assertEqual(process.wait(timeout=60), -signal.SIGINT)
        process.stderr.close()
        self.assertNotIn("calendars", self.enabled())


if __name__ == "__main__":
    unittest.main()
