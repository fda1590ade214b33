#!/usr/bin/env python3
"""The tool's trial of the whole story, in a temporary folder or below a root.

Run like tool_test.py beside it.
"""

import fcntl
import json
import os
import plistlib
import pty
import re
import select
import shutil
import signal
import struct
import subprocess
import termios
import time
import unittest
from pathlib import Path

from tool_test import (ACCOUNT, BUILD, HOME, IDENTIFIERS, LAUNCH_AGENT, OWN_PLUGINS, PLUGIN_FOLDER, PROGRAM, REPLAY,
                       ToolTest)


class Try(ToolTest):
    def setUp(self):
        super().setUp()
        self.temporary = self.folder / "tmp"
        self.temporary.mkdir()
        self.environment = {**os.environ, "TMPDIR": str(self.temporary)}

    def fresh_root(self):
        root = self.folder / "fresh"
        root.mkdir()
        return root

    def log_lines(self, text):
        return [line.split(maxsplit=1)[1] for line in text.splitlines() if re.match(r" +\d+\.\d{3}  ", line)]

    def enabled_in(self, text):
        return re.findall(r"^  ([\w-]+) +(?:pre|post)-login +yes +yes +yes$", text, re.MULTILINE)

    def test_the_whole_story(self):
        text = self.succeeds(self.run_tool("try", "--time-lapse", env=self.environment))
        setup, first = text.split("First login")
        first, second = first.split("Second login")
        lines = self.log_lines(setup)
        self.assertTrue(any("signInWithUsername" in line and line.endswith("user@nimbus.example - *") for line in lines))
        request = next(line for line in lines if "'uber' request" in line)
        for identifier in IDENTIFIERS:
            self.assertIn(identifier, request)
        service = "com.corvid.nimbus.service.{}".format
        self.assertIn(f"Enabling Nimbus service '{service('mediastream')}'", lines)
        self.assertIn(f"{service('contacts')} should be configured post-login", lines)
        self.assertTrue(any(re.match(r"Stored \d+b replay data", line) for line in lines))
        self.assertEqual(lines[-1], "WLCallTesselFinishedSetup")
        self.assertEqual(self.enabled_in(setup), ["photo-stream", "account-sync", "locator", "documents"])
        self.assertRegex(setup, r"2 aliases chosen for com.corvid.vidlink\n")

        lines = self.log_lines(first)
        self.assertEqual(lines[0], "Self destructing...")
        begin = lines.index("Vidlink: 2 aliases")
        self.assertEqual(lines[begin + 1], "Chatter: 1 aliases")
        for name, form in (("chatter", "setup+chosen"), ("storefront", "setup"), ("vidlink", "setup+chosen")):
            self.assertIn(f"setting up com.corvid.{name}", lines)
            self.assertTrue(any(line.startswith(f"com.corvid.{name} {form}: completed (") for line in lines), lines)
        self.assertEqual(lines[1:3], ["Killing onlineaccounts",
                                      "Enabling post-login services for account user@nimbus.example"])
        enabling = "Enabling Nimbus service 'com.corvid.nimbus.service.{}'".format
        self.assertEqual(lines[-4:], ["delaying exit by two minutes", enabling("calendars"), enabling("reminders"),
                                      "exiting"])
        self.assertIn("Enabling Nimbus Mail: user@nimbus.example", lines)
        self.assertEqual(len(self.enabled_in(first)), 10)

        table = re.findall(r"^  (com\.corvid\.\w+) +(completed) +\d+\.\d{3}$", first, re.MULTILINE)
        self.assertEqual(sorted(name for name, _ in table), IDENTIFIERS)
        self.assertLess(first.index("  DELEGATE"), first.index("Lingering"))
        self.assertLess(first.index("delaying exit"), first.index("  DELEGATE"))
        self.assertLess(first.index("Lingering"), first.index("exiting"))
        self.assertIn("simulated time", first)
        self.assertIn("has ended with status 0", first)

        self.assertRegex(first, r"launch agent +none\n")
        self.assertRegex(first, r"replay item +none\n")

        self.assertIn("Failed to find replay keychain item", second)
        self.assertNotIn("delaying exit", second)
        self.assertIn("has ended with status 0", second)
        self.assertIn("has changed nothing", second)
        self.assertEqual(list(self.temporary.iterdir()), [], "the temporary folder is gone")

    def test_the_time_lapse_takes_no_two_minutes(self):
        started = time.monotonic()
        document = json.loads(self.succeeds(self.run_tool("--json", "try", "--time-lapse", env=self.environment)))
        self.assertLess(time.monotonic() - started, 60)
        log = {record["message"]: record["seconds"] for record in document["firstLogin"]["log"]}
        self.assertGreaterEqual(log["exiting"] - log["delaying exit by two minutes"], 120)

    def test_the_story_as_one_document(self):
        document = json.loads(self.succeeds(self.run_tool("try", "--time-lapse", "--json", env=self.environment)))
        self.assertIs(document["timeLapse"], True)
        delegates = document["firstLogin"]["delegates"]
        self.assertEqual(sorted(delegate["identifier"] for delegate in delegates), IDENTIFIERS)
        for delegate in delegates:
            self.assertEqual(delegate["outcome"], "completed")
            self.assertIsInstance(delegate["seconds"], float)
        self.assertEqual(document["firstLogin"]["exitStatus"], 0)
        self.assertEqual(document["setup"]["aliases"]["com.corvid.chatter"], ["user@nimbus.example"])
        self.assertEqual([service["service"] for service in document["setup"]["services"] if service["enabled"]],
                         ["photo-stream", "account-sync", "locator", "documents"])
        self.assertEqual({service["enabled"] for service in document["left"]["services"]}, {True})
        self.assertEqual((document["left"]["launchAgent"], document["left"]["replayItem"]), (False, False))
        self.assertEqual(document["secondLogin"]["exitStatus"], 0)
        self.assertEqual(document["secondLogin"]["delegates"], [])
        self.assertEqual(document["changedBySecondLogin"], [])

    def test_below_a_root_everything_stays_to_be_looked_at(self):
        root = self.fresh_root()
        text = self.succeeds(self.run_tool("--root", root, "try", "--time-lapse", env=self.environment))
        self.assertIn(f"{root} is left as it is", text)
        home = root / HOME.lstrip("/")
        self.assertTrue((root / PLUGIN_FOLDER).is_dir())
        self.assertFalse((home / "Library/LaunchAgents" / LAUNCH_AGENT).exists())
        self.assertEqual(list(self.temporary.iterdir()), [])
        # And once more in the same folder.
        self.succeeds(self.run_tool("--root", root, "try", "--time-lapse", env=self.environment))

    def test_a_hand_over_that_is_waiting_already_is_not_touched(self):
        root = self.fresh_root()
        self.succeeds(self.run_tool("--root", root, "try", "--time-lapse", env=self.environment))
        replay = self.folder / "replay.plist"
        replay.write_bytes(plistlib.dumps(REPLAY))
        self.succeeds(self.run_tool("--root", root, "replay", "store", "--account", ACCOUNT, "--file", replay,
                                    "--bundle", "/usr/share/welcomer/setup-bundle"))
        result = self.run_tool("--root", root, "try", "--time-lapse", env=self.environment)
        self.assertEqual(result.returncode, 1)
        self.assertRegex(result.stderr, r"\Awelcomer: cannot hand over .*exists already\)\n\Z")
        self.assertIn(ACCOUNT, self.succeeds(self.run_tool("--root", root, "replay", "show")))

    def test_the_machines_own_root_is_refused(self):
        self.fails(self.run_tool("--root", "/", "try", "--time-lapse", env=self.environment), 2, "--root")

    def plugin_below_root(self, name):
        plugins = self.root / PLUGIN_FOLDER
        plugins.mkdir(parents=True)
        shutil.copy(OWN_PLUGINS / name, plugins)

    def test_a_plugin_of_the_users_own_takes_part(self):
        self.plugin_below_root("TalkingPlugin.ncdplugin")
        result = self.run_below_root("--json", "try", "--time-lapse", env=self.environment)
        delegates = json.loads(result.stdout)["firstLogin"]["delegates"]
        self.assertIn({"identifier": "org.example.talking", "outcome": "no cached response", "seconds": None},
                      delegates)
        self.assertIn("hello", result.stderr, "a plug-in's own words are no result of the tool")

    def test_a_setup_that_crashes_is_a_failure(self):
        self.plugin_below_root("CrashingPlugin.ncdplugin")
        result = self.run_below_root("try", "--time-lapse", env=self.environment)
        self.assertEqual(result.returncode, 1)
        self.assertIn("welcomer: the setup ended with signal 6", result.stderr)

    def test_a_setup_that_fails_says_why(self):
        root = self.fresh_root()
        accounts = root / HOME.lstrip("/") / "Library/Accounts"
        accounts.mkdir(parents=True)
        (accounts / "Accounts.plist").write_bytes(plistlib.dumps({"Accounts": {"bert": {}}, "LoggedInAccount": "bert"}))
        result = self.run_tool("--root", root, "try", "--time-lapse", env=self.environment)
        self.assertEqual(result.returncode, 1)
        self.assertEqual(result.stderr, "welcomer: bert is logged in to the cloud already\n")

    def test_an_agent_that_crashes_is_a_failure(self):
        self.plugin_below_root("CrashingPlugin.ncdplugin")
        self.environment["TOOL_TEST_FILE"] = str(self.home / "Library/Accounts/Accounts.plist")
        result = self.run_below_root("try", "--time-lapse", env=self.environment)
        self.assertEqual(result.returncode, 1)
        self.assertIn("welcomer: the agent of the first login ended with signal 6", result.stderr)

    def test_a_launch_agent_that_is_left_behind_is_a_failure(self):
        self.plugin_below_root("TalkingPlugin.ncdplugin")
        self.environment["TOOL_TEST_FILE"] = str(self.home / "Library/LaunchAgents" / LAUNCH_AGENT)
        result = self.run_below_root("try", "--time-lapse", env=self.environment)
        self.assertEqual(result.returncode, 1)
        self.assertRegex(result.stdout, r"launch agent +still there\n")
        self.assertIn("welcomer: the first login left the launch agent behind\n", result.stderr)

    def start_on_terminal(self, *arguments):
        """The tool with a terminal of its own, of 100 columns, as its standard streams and its controlling terminal."""
        identifier, terminal = pty.fork()
        if identifier == 0:
            fcntl.ioctl(1, termios.TIOCSWINSZ, struct.pack("HHHH", 40, 100, 0, 0))
            os.execve(PROGRAM, [str(PROGRAM), *arguments], self.environment)
        self.addCleanup(os.close, terminal)
        return identifier, terminal

    def read_until(self, terminal, pattern, timeout=60):
        text = ""
        end = time.monotonic() + timeout
        while not re.search(pattern, text):
            ready, _, _ = select.select([terminal], [], [], max(0, end - time.monotonic()))
            self.assertTrue(ready, f"{pattern} did not come: {text}")
            text += os.read(terminal, 65536).decode()
        return text

    def test_on_a_terminal_the_linger_is_a_progress_bar_and_control_c_leaves_nothing_behind(self):
        identifier, terminal = self.start_on_terminal("try")
        text = self.read_until(terminal, r"Lingering \[#*-+\] 1 of 120 s")
        self.assertEqual(len(list(self.temporary.iterdir())), 1)
        agent = int(Path(f"/proc/{identifier}/task/{identifier}/children").read_text())
        os.write(terminal, b"\x03")
        _, status = os.waitpid(identifier, 0)
        self.assertTrue(os.WIFSIGNALED(status), status)
        self.assertEqual(os.WTERMSIG(status), signal.SIGINT)
        self.assertEqual(list(self.temporary.iterdir()), [])
        self.assertFalse(Path(f"/proc/{agent}").exists(), "the agent is gone too")
        self.assertIn("DELEGATE", text)

    def test_ended_by_a_signal_it_leaves_nothing_behind(self):
        process = subprocess.Popen([PROGRAM, "try"], stdout=subprocess.PIPE, stderr=subprocess.PIPE, text=True,
                                   env=self.environment)
        for line in process.stdout:
            if "Lingering for two minutes" in line:
                break
        process.send_signal(signal.SIGTERM)
        self.assertEqual(process.wait(timeout=60), -signal.SIGTERM)
        process.communicate()
        self.assertEqual(list(self.temporary.iterdir()), [])

    def test_a_tool_that_is_killed_takes_its_agent_along(self):
        process = subprocess.Popen([PROGRAM, "try"], stdout=subprocess.PIPE, stderr=subprocess.PIPE, text=True,
                                   env=self.environment)
        for line in process.stdout:
            if "Lingering for two minutes" in line:
                break
        agent = int(Path(f"/proc/{process.pid}/task/{process.pid}/children").read_text())
        process.kill()
        process.communicate(timeout=60)  # ends when the agent, which holds stderr, has ended too
        self.assertFalse(Path(f"/proc/{agent}/exe").exists())

    def test_a_reader_that_goes_away_leaves_nothing_behind(self):
        process = subprocess.Popen([PROGRAM, "try", "--time-lapse"], stdout=subprocess.PIPE, stderr=subprocess.PIPE,
                                   env=self.environment)
        process.stdout.close()
        process.wait(timeout=60)
        process.stderr.close()
        self.assertNotEqual(process.returncode, 0)
        self.assertEqual(list(self.temporary.iterdir()), [])

    def test_the_installed_program_finds_its_examples(self):
        prefix = self.folder / "prefix"
        subprocess.run(["cmake", "--install", BUILD, "--prefix", prefix], check=True, capture_output=True)
        result = subprocess.run([prefix / "bin/welcomer", "--json", "try", "--time-lapse"], capture_output=True,
                                text=True, env=self.environment, timeout=100)
        document = json.loads(self.succeeds(result))
        self.assertEqual(sorted(delegate["identifier"] for delegate in document["firstLogin"]["delegates"]),
                         IDENTIFIERS)


if __name__ == "__main__":
    unittest.main()
