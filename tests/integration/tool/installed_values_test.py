#!/usr/bin/env python3
"""What XML cannot hold, and what a terminal must not get, with the installed tool.

Run like tool_test.py beside it.
"""

import json
import os
import plistlib
import shutil
import struct
import subprocess
import sys
import tempfile
import unittest
from pathlib import Path

import state_test
import tool_test
from account_test import PASSWORD, CloudTest
from setup_test import SetupTest
from state_test import OrdinaryUserTest
from tool_test import ACCOUNT, BUILD, LAUNCH_AGENT, OWN_PLUGINS, ToolTest

sys.path.append(str(Path(__file__).resolve().parents[1] / "network"))
import network_test  # noqa: E402

BUNDLE = "/usr/share/welcomer/setup-bundle"
NO_PLACE = "for which XML has no place"
FAR = 123456789.0  # seconds, in the place of which a test puts a date that no XML property list can hold


def setUpModule():
    global prefix
    prefix = Path(tempfile.mkdtemp(prefix="installed-values-"))
    prefix.chmod(0o755)
    subprocess.run(["cmake", "--install", BUILD, "--prefix", prefix], check=True, capture_output=True)
    for module in (tool_test, state_test, network_test):
        module.PROGRAM = prefix / "bin/welcomer"


def tearDownModule():
    shutil.rmtree(prefix)


def binary(value):
    return plistlib.dumps(value, fmt=plistlib.FMT_BINARY)


def with_far_date(value):
    """The value in binary form; reals that are FAR in it become dates at 1e15."""
    far = b"\x23" + struct.pack(">d", FAR)
    content = binary(value)
    assert far in content
    return content.replace(far, b"\x33" + struct.pack(">d", 1e15))


class ReplayObject(ToolTest):
    def setUp(self):
        super().setUp()
        shutil.copytree(prefix / "share/welcomer/setup-bundle", self.root / BUNDLE.lstrip("/"), symlinks=False,
                        ignore_dangling_symlinks=True)
        self.file = self.folder / "replay.plist"

    def store(self, content):
        self.file.write_bytes(content)
        return self.run_below_root("replay", "store", "--account", ACCOUNT, "--file", self.file, "--bundle", BUNDLE)

    def test_what_cannot_be_written_is_refused_by_its_place_before_anything_is_stored(self):
        def response(name):
            return {"delegatesResponseDict": {"delegates": {"com.corvid.chatter": name}}}
        way = "delegatesResponseDict/delegates/com.corvid.chatter"
        for content, reason in (
                (binary(response({"name": "a\x01"})), f"{way}/name holds U\\+0001, {NO_PLACE}"),
                (binary(response({"names": ["a", "b\ufffe"]})), f"{way}/names/1 holds U\\+FFFE, {NO_PLACE}"),
                (binary(response({"a\x1b[2J": 1})), f"{way}/a\\?\\[2J is a key that holds U\\+001B, {NO_PLACE}"),
                (with_far_date(response({"when": FAR})), f"{way}/when is a date outside the years 0000 to 9999"),
                (b'{ vlAliases = ( "a\\U0000" ); }', f"vlAliases/0 holds U\\+0000, {NO_PLACE}")):
            with self.subTest(reason):
                self.fails(self.store(content), 1, f"replay.plist cannot be stored: {reason}$")
                self.fails(self.run_below_root("replay", "show"), 1, "no such item")
                self.assertFalse((self.home / "Library/LaunchAgents" / LAUNCH_AGENT).exists())
        # Nothing is in the way of one that can be.
        self.succeeds(self.store(binary(response({"name": "a\t\x7f\x9b\u2028"}))))

    def test_no_control_character_is_printed_raw(self):
        text = "a" + "".join(map(chr, [9, 10, 13, *range(0x7f, 0xa0), 0x2028, 0x202e])) + "z"
        self.succeeds(self.store(binary({text: text, "vlAliases": [text]})))
        result = subprocess.run([prefix / "bin/welcomer", "--root", self.root, "--json", "replay", "show"],
                                capture_output=True, timeout=100)
        self.assertEqual((result.returncode, result.stderr), (0, b""))
        self.assertEqual([byte for byte in result.stdout if byte != 10 and not 32 <= byte < 127], [])
        self.assertEqual(json.loads(result.stdout)["replay"], {text: text, "vlAliases": [text]})


class Setup(SetupTest):
    def set_up(self, *more):
        file = self.folder / "answers.plist"
        file.write_bytes(plistlib.dumps({"Account": "anna"}))
        return self.with_password(PASSWORD, *more, "setup", "--answers", file)

    def test_an_answer_that_cannot_be_handed_over_is_told_before_anything_is_set_up(self):
        good = self.directory.read_bytes()
        directory = plistlib.loads(good)
        delegates = directory["Users"]["anna"]["Response"]["delegates"]
        delegates["com.corvid.vidlink"]["note"] = "a\x01"
        self.directory.write_bytes(binary(directory))
        self.fails(self.set_up(), 1, "cannot hand over to the next login what the server answered: "
                   f"delegatesResponseDict/delegates/com.corvid.vidlink/note holds U\\+0001, {NO_PLACE}$")
        self.assertIsNone(self.json("account", "status")["loggedIn"])
        self.assertFalse(self.launch_agent.exists())
        self.fails(self.run_below_root("replay", "show"), 1, "no such item")
        self.directory.write_bytes(good)
        self.succeeds(self.set_up())

    def test_a_plugin_cannot_build_what_cannot_be_written(self):
        shutil.copy(OWN_PLUGINS / "UnwritablePlugin.ncdplugin", self.plugins)
        result = self.set_up("--verbose")
        self.assertEqual(result.returncode, 0, result)
        self.assertIn("Nimbus Plugins: Exception querying 'org.example.unwritable' for setup request: all was refused\n",
                      result.stderr)


class Preferences(OrdinaryUserTest):
    def test_a_text_that_cannot_be_written_is_refused_with_its_key(self):
        self.succeeds(self.call("state", "set", "PreviousSystemVersion", "10.9"))
        before = self.record.read_bytes()
        self.fails(self.call("state", "set", "PreviousSystemVersion", "10\x01"), 1,
                   f"the value could not be stored: PreviousSystemVersion holds U\\+0001, {NO_PLACE}")
        self.assertEqual(self.record.read_bytes(), before)

    def test_a_file_that_cannot_be_written_back_is_left_as_it_is_and_told(self):
        for content, reason in ((binary({"PreviousBuildVersion": "13\x01", "DidSeeCloudSetup": True}),
                                 f"PreviousBuildVersion holds U\\+0001, {NO_PLACE}"),
                                (with_far_date({"Other": FAR, "DidSeeCloudSetup": True}),
                                 "Other is a date outside the years 0000 to 9999")):
            with self.subTest(reason):
                self.write_record(content)
                shown = json.loads(self.succeeds(self.call("--json", "state", "show")))["state"]
                self.assertIs(shown["DidSeeCloudSetup"], True)
                result = self.call("state", "set", "PreviousSystemVersion", "10.9")
                self.assertEqual((result.returncode, result.stdout), (1, ""))
                self.assertRegex(result.stderr, r"welcomer: the preferences com\.corvid\.FirstRun are damaged \(nothing "
                                 rf"can be stored while {reason}\) and still in their place\n")
                self.assertEqual(self.record.read_bytes(), content)

    def test_once_the_key_is_set_or_removed_everything_is_stored(self):
        for mend, expected in ((["set", "PreviousBuildVersion", "13A1"], "13A1"), (["remove", "PreviousBuildVersion"], None)):
            with self.subTest(mend):
                self.write_record(binary({"PreviousBuildVersion": "13\x01", "Foreign": 7}))
                self.succeeds(self.call("state", *mend))
                self.assertEqual(self.stored().get("PreviousBuildVersion"), expected)
                self.assertEqual(self.stored()["Foreign"], 7)


class Password(CloudTest):
    def test_a_carriage_return_before_the_lines_end_belongs_to_that(self):
        self.add(password="secret\r")  # the helper adds the line's end
        self.succeeds(self.with_password("secret", "account", "sign-in", "anna"))
        self.succeeds(self.with_password("secret\r", "account", "sign-in", "anna"))
        self.fails(self.with_password("secret\r\r", "account", "sign-in", "anna"), 1, "the password is wrong")
        self.fails(self.with_password("sec\rret", "account", "sign-in", "anna"), 1, "the password is wrong")

    def test_the_line_may_end_with_the_input(self):
        self.add(password="secret")
        for line in (b"secret", b"secret\r"):
            reading, writing = os.pipe()
            os.write(writing, line)
            os.close(writing)
            self.succeeds(self.run_below_root("account", "sign-in", "anna", "--password-fd", reading, pass_fds=[reading]))
            os.close(reading)

    def test_the_longest_password_may_have_both(self):
        self.add()
        for password, reason in (("x" * 4096 + "\r", "the password is wrong"), ("x" * 4097, "the password is too long"),
                                 ("x" * 4097 + "\r", "the password is too long")):
            with self.subTest(length=len(password)):
                self.fails(self.with_password(password, "account", "sign-in", "anna"), 1, reason)

    def test_a_carriage_return_alone_is_an_empty_password(self):
        self.fails(self.with_password("\r", "account", "add", "anna"), 1, "the password is empty")


class NothingToApply(network_test.SpaceTest):
    def test_what_configures_and_checks_nothing_says_so(self):
        for arguments in (["--choice", "lan", "--warning-type", "0"], ["--choice", "no", "--warning-type", "0"],
                          ["--choice", "wifi", "--warning-type", "3"]):
            with self.subTest(arguments):
                self.assertEqual(self.succeeds(self.call("apply", *arguments)),
                                 "Nothing was to be done: nothing is configured, and nothing checked.\n")
                self.assertEqual(json.loads(self.succeeds(self.call("apply", *arguments, "--json"))), {"applied": False})
                self.assertFalse(self.stored.exists())

    def test_what_configures_something_is_done(self):
        self.here.connect("eth7", self.there, "eth0")
        self.assertEqual(self.succeeds(self.call("apply", *network_test.MANUAL, "--warning-type", "3")), "Done.\n")
        self.assertTrue(self.stored.exists())


if __name__ == "__main__":
    unittest.main()
