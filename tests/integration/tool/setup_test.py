#!/usr/bin/env python3
"""The tool's setting up of an account, with answers from a file and at a terminal.

Run like tool_test.py beside it.
"""

import json
import os
import plistlib
import shutil
import signal
import sys
import termios
import time
import unittest
from pathlib import Path

sys.path.append(str(Path(__file__).resolve().parents[2] / "support"))
import at_terminal  # noqa: E402
from account_test import ALIASES, PASSWORD, POST_LOGIN, PRE_LOGIN, SERVICE, CloudTest  # noqa: E402
from tool_test import BUILD, IDENTIFIERS, LAUNCH_AGENT, OWN_PLUGINS, PLUGIN_FOLDER, PROGRAM  # noqa: E402


class SetupTest(CloudTest):
    def setUp(self):
        super().setUp()
        plugins = self.root / PLUGIN_FOLDER
        plugins.mkdir(parents=True)
        for plugin in (BUILD / "plugins").glob("*.ncdplugin"):
            (shutil.copytree if plugin.is_dir() else shutil.copy)(plugin, plugins / plugin.name)
        self.plugins = plugins
        self.bundle = self.root / "usr/share/welcomer/setup-bundle"
        shutil.copytree(BUILD / "setup-bundle", self.bundle)
        self.launch_agent = self.home / "Library/LaunchAgents" / LAUNCH_AGENT
        self.add()

    def replay(self):
        return self.json("replay", "show")


class SetupAnswers(SetupTest):
    def set_up(self, answers, *more, password=PASSWORD):
        file = self.folder / "answers.plist"
        file.write_bytes(answers if isinstance(answers, bytes) else plistlib.dumps(answers))
        return self.with_password(password, "setup", "--answers", file, *more)

    def nothing_was_set_up(self):
        self.assertFalse(self.launch_agent.exists())
        self.fails(self.run_below_root("replay", "show"), 1, "no such item")

    def test_with_the_account_alone_everything_is_taken(self):
        document = json.loads(self.succeeds(self.set_up({"Account": "anna"}, "--json")))
        self.assertEqual(document["account"], "anna")
        self.assertEqual(document["aliases"], {"com.corvid.chatter": ALIASES, "com.corvid.vidlink": ALIASES})
        self.assertEqual(document["atNextLogin"], {"services": [SERVICE + name for name in POST_LOGIN],
                                                   "delegates": IDENTIFIERS})
        self.assertEqual(document["launchAgent"] + ".plist", LAUNCH_AGENT)
        self.assertEqual(self.enabled(), PRE_LOGIN)
        self.assertEqual(self.json("account", "status")["loggedIn"], "anna")
        self.assertTrue(self.launch_agent.exists())
        item = self.replay()
        self.assertEqual(item["account"], "anna")
        self.assertEqual((item["replay"]["vlAliases"], item["replay"]["imAliases"]), (ALIASES, ALIASES))
        self.assertEqual(set(item["replay"]["delegatesResponseDict"]["delegates"]),
                         {*IDENTIFIERS, "com.corvid.reader"})
        accounts = plistlib.loads((self.home / "Library/Accounts/Accounts.plist").read_bytes())
        self.assertIs(accounts["SetupFinished"], True)

    def test_people_are_told_what_will_happen(self):
        text = self.succeeds(self.set_up({"Account": "anna"}))
        self.assertIn("anna is set up.", text)
        self.assertRegex(text, r"  locator +pre-login +yes +yes +yes\n")
        self.assertIn("turns on contacts, calendars, bookmarks, reminders, mail, notes,\n", text)
        self.assertIn("finish: com.corvid.chatter, com.corvid.storefront, com.corvid.vidlink,\n", text)

    def test_chosen_services_and_aliases(self):
        self.succeeds(self.set_up({"Account": "anna", "Services": ["locator", SERVICE + "documents"],
                                   "Aliases": {"com.corvid.vidlink": ALIASES[1:], "com.corvid.chatter": []}}))
        self.assertEqual(self.enabled(), ["locator", "documents"])
        replay = self.replay()["replay"]
        self.assertEqual((replay["vlAliases"], replay["imAliases"]), (ALIASES[1:], []))

    def test_just_the_account_and_its_documents(self):
        self.succeeds(self.set_up({"Account": "anna", "JustTheAccountAndKVS": True, "Services": []}))
        self.assertEqual(self.enabled(), ["documents"])

    def test_the_answers_may_have_any_format(self):
        self.succeeds(self.set_up(b"{ Account = anna; Services = (locator); }"))
        self.assertEqual(self.enabled(), ["locator"])

    def test_answers_that_make_no_sense_are_refused_before_the_sign_in(self):
        for answers, reason in ((["anna"], "no dictionary"), ({}, "Account"), ({"Account": 1}, "Account"),
                                ({"Account": "anna", "Colour": "red"}, "no question is called Colour"),
                                ({"Account": "anna", "Services": "mail"}, "Services"),
                                ({"Account": "anna", "Services": [1]}, "Services"),
                                ({"Account": "anna", "Services": ["nonsense"]}, "there is no service nonsense"),
                                ({"Account": "anna", "JustTheAccountAndKVS": "maybe"}, "JustTheAccountAndKVS"),
                                ({"Account": "anna", "Aliases": []}, "Aliases")):
            with self.subTest(answers):
                self.fails(self.set_up(answers), 1, "answers.plist: .*" + reason)
                self.assertIsNone(self.json("account", "status")["loggedIn"])
        self.nothing_was_set_up()

    def test_aliases_that_are_not_on_offer_are_refused_before_anything_is_set_up(self):
        for aliases in ({"com.corvid.vidlink": ["other"]}, {"com.corvid.storefront": ["x"]},
                        {"com.corvid.chatter": "text"}):
            with self.subTest(aliases):
                self.fails(self.set_up({"Account": "anna", "Aliases": aliases}), 1, "answers.plist: ")
                self.assertIsNone(self.json("account", "status")["loggedIn"])
        self.nothing_was_set_up()

    def test_a_wrong_password_sets_nothing_up(self):
        self.fails(self.set_up({"Account": "anna"}, password="wrong"), 1, "the password is wrong")
        self.nothing_was_set_up()

    def test_what_is_in_the_way_is_told_before_the_sign_in(self):
        self.launch_agent.parent.mkdir(parents=True)
        self.launch_agent.write_text("mine")
        self.fails(self.set_up({"Account": "anna"}), 1, "the agent is installed already")
        self.launch_agent.unlink()
        self.succeeds(self.set_up({"Account": "anna"}))
        self.launch_agent.unlink()
        self.fails(self.set_up({"Account": "anna"}), 1, "a replay item is waiting")
        self.succeeds(self.run_below_root("replay", "delete"))
        self.add("bert")
        self.fails(self.set_up({"Account": "bert"}), 1, "anna is logged in")
        self.nothing_was_set_up()

    def test_for_somebody_who_is_logged_in_already_no_sign_in_is_made_again(self):
        self.succeeds(self.with_password(PASSWORD, "account", "sign-in", "anna"))
        result = self.set_up({"Account": "anna"}, "--verbose")
        self.assertEqual(result.returncode, 0)
        self.assertEqual(result.stderr.count("_validateOK"), 1, "the check alone")
        self.assertEqual(self.enabled(), PRE_LOGIN)

    def test_a_bundle_that_is_not_there_is_told_before_the_sign_in(self):
        shutil.rmtree(self.bundle)
        self.fails(self.set_up({"Account": "anna"}), 1, "no setup application at /usr/share/welcomer/setup-bundle below ")
        self.assertIsNone(self.json("account", "status")["loggedIn"])
        shutil.copytree(BUILD / "setup-bundle", self.root / "elsewhere")
        self.succeeds(self.set_up({"Account": "anna"}, "--bundle", "/elsewhere"))

    def test_without_plugins_there_are_no_aliases(self):
        shutil.rmtree(self.plugins)
        document = json.loads(self.succeeds(self.set_up({"Account": "anna"}, "--json")))
        self.assertEqual((document["aliases"], document["atNextLogin"]["delegates"]), ({}, []))
        self.assertNotIn("vlAliases", self.replay()["replay"])

    def test_a_plugin_that_writes_to_stdout_does_not_spoil_the_document(self):
        shutil.copy(OWN_PLUGINS / "TalkingPlugin.ncdplugin", self.plugins)
        result = self.set_up({"Account": "anna"}, "--json")
        self.assertEqual(json.loads(result.stdout)["account"], "anna")
        self.assertIn("hello", result.stderr)


class AtTerminal(at_terminal.AtTerminal):
    def start(self, *arguments, stdout=None):
        self.start_program(str(PROGRAM), "--root", str(self.root), *arguments, stdout=stdout)


class SetupAtTerminal(AtTerminal, SetupTest):
    def test_a_person_sets_up_an_account(self):
        self.start("setup")
        self.answer("account's name: ", "  anna ")
        self.answer_password("Password for anna: ", "wrong")
        self.assertNotIn("wrong\r\n", self.expect("password is wrong. Please try again"))
        self.answer_password("Password for anna: ", PASSWORD)
        shown = self.answer(r"video calling\?[^$]*none \[all\]: ", "2")
        self.assertNotIn(PASSWORD, shown)
        self.assertIn("  1  anna@nimbus.example\r\n  2  +1 555 0100\r\n", shown)
        self.answer(r"messaging\?[^$]*none \[all\]: ", "7")
        self.answer(r"numbers from 1 to 2, all or none.[^$]*none \[all\]: ", "")
        shown = self.answer(r"turned on now [^$]*none \[all\]: ", "1, 3")
        self.assertIn("  1  photo-stream\r\n  2  account-sync\r\n  3  locator\r\n  4  documents\r\n", shown)
        shown = self.answer(r"Set up this account\? \[Y/n\] ", "y")
        self.assertIn("Services now:   photo-stream, locator\r\n", shown)
        self.assertIn("Aliases:        +1 555 0100 (for video calling)\r\n"
                      "Aliases:        anna@nimbus.example, +1 555 0100 (for messaging)\r\n", shown)
        rest, status = self.end()
        self.assertEqual(status, 0, rest)
        self.assertIn("anna is set up.", rest)
        self.assertIn("At the next login the agent starts, once.", rest)
        self.assertEqual(self.enabled(), ["photo-stream", "locator"])
        replay = self.replay()["replay"]
        self.assertEqual((replay["vlAliases"], replay["imAliases"]), (ALIASES[1:], ALIASES))
        self.assertTrue(self.launch_agent.exists())

    def test_saying_no_sets_nothing_up(self):
        self.start("setup")
        self.answer("account's name: ", "anna")
        self.answer_password("Password for anna: ", PASSWORD)
        for _ in range(3):
            self.answer(r"none \[all\]: ", "none")
        self.answer(r"\[Y/n\] ", "perhaps")
        self.answer(r"\[Y/n\] ", "n")
        rest, status = self.end()
        self.assertEqual(os.waitstatus_to_exitcode(status), 1)
        self.assertIn("welcomer: nothing was set up", rest)
        self.assertIsNone(self.json("account", "status")["loggedIn"])
        self.assertFalse(self.launch_agent.exists())

    def test_three_wrong_passwords_end_it(self):
        self.start("setup")
        self.answer("account's name: ", "anna")
        for _ in range(3):
            self.answer_password("Password for anna: ", "wrong")
        rest, status = self.end()
        self.assertEqual(os.waitstatus_to_exitcode(status), 1)
        self.assertIn("welcomer: cannot sign in anna: the password is wrong", rest)

    def test_a_mistyped_name_is_asked_for_again(self):
        self.start("setup")
        self.answer("account's name: ", "ana")
        self.answer_password("Password for ana: ", PASSWORD)
        self.answer("There is no user ana. Please try again.\r\nYour cloud account's name: ", "anna")
        self.answer_password("Password for anna: ", PASSWORD)
        self.accept_everything()
        self.assertEqual(self.json("account", "status")["loggedIn"], "anna")

    def test_no_alias_chosen_hands_none_over(self):
        self.start("setup")
        self.answer("account's name: ", "anna")
        self.answer_password("Password for anna: ", PASSWORD)
        self.answer(r"video calling\?[^$]*none \[all\]: ", "none")
        self.answer(r"messaging\?[^$]*none \[all\]: ", "none")
        self.answer(r"turned on now [^$]*none \[all\]: ", "")
        shown = self.answer(r"\[Y/n\] ", "")
        self.assertIn("Aliases:        none (for video calling)\r\nAliases:        none (for messaging)\r\n", shown)
        rest, status = self.end()
        self.assertEqual(status, 0, rest)
        replay = self.replay()["replay"]
        self.assertEqual((replay["vlAliases"], replay["imAliases"]), ([], []))

    def test_terms_of_service_to_be_accepted_end_it_and_say_which(self):
        self.change_user(AccountError=3, AccountErrorInfo="https://nimbus.example/terms")
        self.start("setup")
        self.answer("account's name: ", "anna")
        self.answer_password("Password for anna: ", PASSWORD)
        self.answer(r"accepted first:\r\nhttps://nimbus.example/terms\r\nDo you accept them\? \[Y/n\] ", "n")
        rest, status = self.end()
        self.assertEqual(os.waitstatus_to_exitcode(status), 1)
        self.assertIn("the terms of service are to be accepted first (https://nimbus.example/terms)", rest)
        self.assertNotIn("try again", rest)

    def test_terms_of_service_that_are_accepted_are_asked_for_no_more(self):
        self.change_user(AccountError=3, AccountErrorInfo={"text": "Be kind.", "url": "https://nimbus.example/terms"})
        self.start("setup")
        self.answer("account's name: ", "anna")
        self.answer_password("Password for anna: ", PASSWORD)
        self.answer(r"accepted first:\r\nBe kind.\r\nhttps://nimbus.example/terms\r\nDo you accept them\? \[Y/n\] ", "y")
        self.accept_everything()
        self.assertEqual(self.json("account", "status")["loggedIn"], "anna")

    def test_the_end_of_the_input_at_the_password_ends_it_with_the_echo_back(self):
        self.start("setup")
        self.answer("account's name: ", "anna")
        self.expect("Password for anna: ")
        os.write(self.terminal, b"\x04")
        self.expect("the input has ended")
        self.assertTrue(termios.tcgetattr(self.terminal)[3] & termios.ECHO)
        _, status = self.end()
        self.assertEqual(os.waitstatus_to_exitcode(status), 1)

    def test_the_end_of_the_input_ends_it(self):
        self.start("setup")
        self.expect("account's name: ")
        os.write(self.terminal, b"\x04")
        rest, status = self.end()
        self.assertEqual(os.waitstatus_to_exitcode(status), 1)
        self.assertIn("the input has ended", rest)

    def test_control_c_at_the_password_ends_it_with_the_echo_back(self):
        self.start("setup")
        self.answer("account's name: ", "anna")
        self.expect("Password for anna: ")
        self.assertFalse(termios.tcgetattr(self.terminal)[3] & termios.ECHO)
        os.write(self.terminal, b"\x03")
        deadline = time.monotonic() + 60
        while not termios.tcgetattr(self.terminal)[3] & termios.ECHO:
            self.assertLess(time.monotonic(), deadline)
            time.sleep(0.01)
        _, status = self.end()
        self.assertEqual(os.waitstatus_to_exitcode(status), -signal.SIGINT)

    def test_a_slow_answer_is_shown_as_waiting(self):
        self.change_user(DelaySeconds=2)
        self.start("setup")
        self.answer("account's name: ", "anna")
        self.answer_password("Password for anna: ", PASSWORD)
        self.expect(r"Signing in \.\.\. 1 s")
        self.answer(r"none \[all\]: ", "")
        self.assertNotIn("Signing in", self.seen)
        os.write(self.terminal, b"\x03")
        self.end()

    def test_the_document_is_on_stdout_alone(self):
        file = self.folder / "result.json"
        self.start("--json", "setup", stdout=file)
        self.answer("account's name: ", "anna")
        self.answer_password("Password for anna: ", PASSWORD)
        self.accept_everything()
        self.assertEqual(json.loads(file.read_text())["account"], "anna")

    def test_a_new_users_password_is_asked_for_twice(self):
        self.start("account", "add", "bert")
        self.answer_password("New password for bert: ", "one")
        self.answer_password("Once more: ", "two")
        rest, status = self.end()
        self.assertEqual(os.waitstatus_to_exitcode(status), 1)
        self.assertIn("the two passwords differ", rest)
        self.start("account", "add", "bert")
        self.answer_password("New password for bert: ", "one")
        self.answer_password("Once more: ", "one")
        rest, status = self.end()
        self.assertEqual(status, 0, rest)
        self.succeeds(self.with_password("one", "account", "sign-in", "bert"))


if __name__ == "__main__":
    unittest.main()
