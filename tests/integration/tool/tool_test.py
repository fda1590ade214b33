#!/usr/bin/env python3
"""The tool as people and scripts call it: the built program, real files below a root folder of the test's own.

WELCOMER_BUILD is the build folder, WELCOMER_TOOL_TEST_PLUGINS the folder with this test's own plug-ins.
"""

import datetime
import fcntl
import json
import os
import plistlib
import pty
import pwd
import re
import select
import shutil
import signal
import struct
import subprocess
import tempfile
import termios
import time
import unittest
from pathlib import Path

SOURCES = Path(__file__).resolve().parents[3]
BUILD = Path(os.environ["WELCOMER_BUILD"])
OWN_PLUGINS = Path(os.environ["WELCOMER_TOOL_TEST_PLUGINS"])
PROGRAM = BUILD / "bin/welcomer"
PLUGIN_FOLDER = "System/Library/CoreServices/FirstRunPlugins"
LAUNCH_AGENT = "com.corvid.welcomer.nimbussetup.user.plist"
HOME = pwd.getpwuid(os.geteuid()).pw_dir
IDENTIFIERS = ["com.corvid.chatter", "com.corvid.storefront", "com.corvid.vidlink"]
ACCOUNT = "newcomer@nimbus.example"
REPLAY = {
    "delegatesResponseDict": {"delegates": {"com.corvid.vidlink": {"token": b"\x00\xffbytes", "count": 3}}},
    "imAliases": ["one", "two"],
    "when": datetime.datetime(2024, 2, 29, 12, 30, 15),
    "real": 0.5,
    "yes": True,
}


class ToolTest(unittest.TestCase):
    def setUp(self):
        self.folder = Path(tempfile.mkdtemp(prefix="tool-test-"))
        self.addCleanup(shutil.rmtree, self.folder, ignore_errors=True)
        self.root = self.folder / "root"
        self.home = self.root / HOME.lstrip("/")
        self.home.mkdir(parents=True)

    def run_tool(self, *arguments, **options):
        return subprocess.run([PROGRAM, *map(str, arguments)], capture_output=True, timeout=100,
                              stdin=options.pop("stdin", subprocess.DEVNULL), text=True, **options)

    def run_below_root(self, *arguments, **options):
        return self.run_tool("--root", self.root, *arguments, **options)

    def succeeds(self, result):
        self.assertEqual((result.returncode, result.stderr), (0, ""), result)
        return result.stdout

    def fails(self, result, status, pattern):
        """Nothing on stdout, one line on stderr."""
        self.assertEqual((result.returncode, result.stdout), (status, ""), result)
        self.assertRegex(result.stderr, rf"\Awelcomer: .*{pattern}.*\n\Z")
        self.assertEqual(result.stderr.count("\n"), 1, result)


class CommandLine(ToolTest):
    COMMANDS = [[], ["try"], ["replay"], ["replay", "store"], ["replay", "show"], ["replay", "delete"], ["plugins"],
                ["plugins", "list"], ["setup"], ["account"], ["account", "add"], ["account", "list"], ["account", "status"],
                ["account", "sign-in"], ["account", "services"], ["services"], ["services", "list"], ["services", "enable"],
                ["network"], ["network", "show"], ["network", "ports"], ["network", "probe"], ["network", "apply"],
                ["network", "register"]]

    def test_every_command_explains_itself(self):
        for command in self.COMMANDS:
            for option in ("--help", "-h"):
                with self.subTest(command=command, option=option):
                    text = self.succeeds(self.run_tool(*command, option))
                    self.assertIn("Usage: " + " ".join(["welcomer", *command]), text)
                    self.assertIn("--root", text)

    def test_what_makes_no_sense_is_a_usage_error_on_one_line(self):
        for arguments in ([], ["nonsense"], ["replay"], ["replay", "nonsense"], ["plugins", "list", "more"],
                          ["--nonsense", "plugins", "list"], ["--root"], ["--root", "", "plugins", "list"], ["replay", "store"],
                          ["replay", "store", "--account", "a", "--file", "f"], ["try", "--time-lapse=maybe"],
                          ["replay", "show", "plugins", "list"]):
            with self.subTest(arguments):
                self.fails(self.run_tool(*arguments), 2, r"\(see welcomer.* --help\)")

    def test_the_usage_error_names_the_command(self):
        self.fails(self.run_tool("replay", "store"), 2, r"--account.*\(see welcomer replay store --help\)")

    def test_a_command_that_is_none_is_named(self):
        self.fails(self.run_tool("replay", "nonsense"), 2, "there is no command nonsense .see welcomer replay --help")
        self.fails(self.run_tool(), 2, "a command is needed")

    def test_the_version(self):
        self.assertRegex(self.succeeds(self.run_tool("--version")), r"\Awelcomer \d+\.\d+\.\d+\n\Z")

    def test_the_global_options_may_stand_before_and_after_the_command(self):
        for arguments in (["--root", self.root, "--json", "plugins", "list"],
                          ["plugins", "list", "--root", self.root, "--json"],
                          ["plugins", "--json", "list", "--root", self.root]):
            with self.subTest(arguments):
                self.assertEqual(json.loads(self.succeeds(self.run_tool(*arguments)))["plugins"], [])

    def test_a_root_may_be_relative_to_the_working_folder(self):
        plugins = self.root / PLUGIN_FOLDER
        plugins.mkdir(parents=True)
        (plugins / "a.ncdplugin").write_text("nothing")
        self.assertIn("a.ncdplugin", self.succeeds(self.run_tool("--root", "root", "plugins", "list", cwd=self.folder)))

    def test_a_root_that_does_not_exist_is_a_failure(self):
        self.fails(self.run_tool("--root", self.folder / "missing", "plugins", "list"), 1, "--root: there is no folder .*missing")

    def test_output_that_cannot_be_written_is_a_failure(self):
        with open("/dev/full", "w") as full:
            result = subprocess.run([PROGRAM, "--root", self.root, "plugins", "list"], stdout=full,
                                    stderr=subprocess.PIPE, text=True, timeout=100)
        self.assertEqual(result.returncode, 1)
        self.assertRegex(result.stderr, r"\Awelcomer: .*could not be written\n\Z")


class PluginsList(ToolTest):
    def setUp(self):
        super().setUp()
        self.plugins = self.root / PLUGIN_FOLDER
        self.plugins.mkdir(parents=True)

    def install(self, *plugins):
        for plugin in plugins:
            copy = shutil.copytree if plugin.is_dir() else shutil.copy
            copy(plugin, self.plugins / plugin.name)

    def test_no_plugins(self):
        self.assertIn("No plug-ins", self.succeeds(self.run_below_root("plugins", "list")))
        self.plugins.rmdir()
        self.assertIn("No plug-ins", self.succeeds(self.run_below_root("plugins", "list")))

    def test_good_and_bad_plugins_side_by_side(self):
        self.install(*(BUILD / "plugins").glob("*.ncdplugin"), OWN_PLUGINS / "SymbolLessLibrary.ncdplugin")
        (self.plugins / "text.ncdplugin").write_text("this is no library")
        (self.plugins / "ignored.txt").write_text("no plug-in")
        rows = self.succeeds(self.run_below_root("plugins", "list")).splitlines()
        self.assertRegex(rows[0], r"^IDENTIFIER +FILE +STATE$")
        cells = sorted(re.split(r"  +", row, maxsplit=2) for row in rows[1:])
        self.assertEqual([row[0] for row in cells], ["-", "-", *IDENTIFIERS])
        self.assertEqual([row[1] for row in cells[:2]], ["SymbolLessLibrary.ncdplugin", "text.ncdplugin"])
        for row in cells[:2]:
            self.assertGreater(len(row[2]), 10, "a reason")
            self.assertNotEqual(row[2], "loaded")
        self.assertEqual({row[2] for row in cells[2:]}, {"loaded"})

    def test_json(self):
        self.install(*(BUILD / "plugins").glob("*.ncdplugin"))
        (self.plugins / "text.ncdplugin").write_text("this is no library")
        document = json.loads(self.succeeds(self.run_below_root("--json", "plugins", "list")))
        self.assertEqual(document["directory"], "/" + PLUGIN_FOLDER)
        by_file = {plugin.pop("file"): plugin for plugin in document["plugins"]}
        bad = by_file.pop("text.ncdplugin")
        self.assertIsNone(bad["identifier"])
        self.assertNotEqual(bad["state"], "loaded")
        self.assertEqual(sorted(plugin["identifier"] for plugin in by_file.values()), IDENTIFIERS)
        self.assertEqual({plugin["state"] for plugin in by_file.values()}, {"loaded"})

    def test_of_two_with_one_identifier_the_second_says_why_it_is_skipped(self):
        plugin = next((BUILD / "plugins").glob("*.ncdplugin"))
        copy = shutil.copytree if plugin.is_dir() else shutil.copy
        for name in ("one.ncdplugin", "two.ncdplugin"):
            copy(plugin, self.plugins / name)
        plugins = json.loads(self.succeeds(self.run_below_root("--json", "plugins", "list")))["plugins"]
        self.assertEqual(plugins[0]["state"], "loaded")
        self.assertNotEqual(plugins[1]["state"], "loaded")

    def test_the_plugin_in_the_documentation_is_a_whole_one(self):
        text = (SOURCES / "docs/plugins.md").read_text()
        source = self.folder / "notes.cpp"
        source.write_text(re.search(r"^```cpp\n(.*?)^```", text, re.MULTILINE | re.DOTALL)[1])
        subprocess.run(["c++", "-std=c++17", "-shared", "-fPIC", f"-I{SOURCES}/sdk", source, "-o",
                        self.plugins / "Notes.ncdplugin"], check=True, capture_output=True)
        plugins = json.loads(self.succeeds(self.run_below_root("--json", "plugins", "list")))["plugins"]
        self.assertEqual(plugins, [{"identifier": "org.example.notes", "file": "Notes.ncdplugin", "state": "loaded"}])

    def test_verbose_shows_the_systems_log_lines(self):
        (self.plugins / "text.ncdplugin").write_text("this is no library")
        result = self.run_below_root("--verbose", "plugins", "list")
        self.assertEqual(result.stderr, "Nimbus Plugins: Failed to get principal class for text.ncdplugin\n")

    def test_a_plugin_that_writes_to_stdout_does_not_spoil_the_document(self):
        self.install(OWN_PLUGINS / "TalkingPlugin.ncdplugin")
        result = self.run_below_root("--json", "plugins", "list")
        self.assertEqual(json.loads(result.stdout)["plugins"][0]["identifier"], "org.example.talking")
        self.assertIn("hello", result.stderr)


class Replay(ToolTest):
    BUNDLE = "/usr/share/welcomer/setup-bundle"

    def setUp(self):
        super().setUp()
        shutil.copytree(BUILD / "setup-bundle", self.root / self.BUNDLE.lstrip("/"))
        self.file = self.folder / "replay.plist"
        self.file.write_bytes(plistlib.dumps(REPLAY))
        self.launch_agent = self.home / "Library/LaunchAgents" / LAUNCH_AGENT

    def store(self, *more, file=None, bundle=BUNDLE, **options):
        return self.run_below_root("replay", "store", "--account", ACCOUNT, "--file", file or self.file, "--bundle",
                                   bundle, *more, **options)

    def test_store_show_delete(self):
        self.assertIn(ACCOUNT, self.succeeds(self.store()))
        definition = plistlib.loads(self.launch_agent.read_bytes())
        self.assertEqual(definition["Label"] + ".plist", LAUNCH_AGENT)

        document = json.loads(self.succeeds(self.run_below_root("--json", "replay", "show")))
        self.assertEqual(list(document), ["account", "replay"])
        self.assertEqual(document, {
            "account": ACCOUNT,
            "replay": {
                "delegatesResponseDict": {"delegates": {"com.corvid.vidlink": {"count": 3, "token": "AP9ieXRlcw=="}}},
                "imAliases": ["one", "two"],
                "when": "2024-02-29T12:30:15Z",
                "real": 0.5,
                "yes": True,
            },
        })
        # Looking has changed nothing.
        self.succeeds(self.run_below_root("replay", "show"))

        self.assertIn("Deleted", self.succeeds(self.run_below_root("replay", "delete")))
        self.assertTrue(self.launch_agent.exists())
        for command in ("show", "delete"):
            self.fails(self.run_below_root("replay", command), 1,
                       r"Failed to (find|delete) replay keychain item: \d+ \(no such item\)")

    def test_show_tells_people_about_the_access_and_that_it_is_not_enforced(self):
        self.succeeds(self.store())
        text = self.succeeds(self.run_below_root("replay", "show"))
        self.assertIn(f"Account:   {ACCOUNT}\n", text)
        self.assertIn("Access:    Welcomer Nimbus Access\n", text)
        self.assertRegex(text, rf"Trusted:   {self.BUNDLE}/.*wlnimbussetup\n")
        self.assertIn("Stored in: local file\n", text)
        self.assertIn("           (kept with the item, but the local file does not enforce it)\n", text)
        self.assertIn("Readers:   every program of this user\n", text)
        self.assertIn("  imAliases:\n    - one\n    - two\n", text)
        self.assertIn("token: <00ff6279746573>", text)

    def test_the_results_of_store_and_delete_in_json(self):
        self.assertEqual(json.loads(self.succeeds(self.store("--json"))), {"account": ACCOUNT, "stored": True})
        self.assertEqual(json.loads(self.succeeds(self.run_below_root("--json", "replay", "delete"))),
                         {"deleted": True})

    def test_every_format_of_property_list_is_taken_also_from_stdin(self):
        for name, content in (("binary", plistlib.dumps(REPLAY, fmt=plistlib.FMT_BINARY)),
                              ("text", b'{ imAliases = ( one, "two" ); }')):
            with self.subTest(name):
                self.file.write_bytes(content)
                with self.file.open("rb") as stream:
                    self.succeeds(self.store(file="-", stdin=stream))
                document = json.loads(self.succeeds(self.run_below_root("--json", "replay", "show")))
                self.assertEqual(document["replay"]["imAliases"], ["one", "two"])
                self.succeeds(self.run_below_root("replay", "delete"))
                self.launch_agent.unlink()

    def test_a_second_item_is_refused_with_the_reason(self):
        self.succeeds(self.store())
        self.fails(self.store(), 1, r"Failed to create replay keychain item: \d+ \(an item .* exists already\)")

    def test_a_launch_agent_that_is_there_already_is_the_reason(self):
        self.launch_agent.parent.mkdir(parents=True)
        self.launch_agent.write_text("mine")
        self.fails(self.store(), 1, "failed to install com.corvid.welcomer.nimbussetup: ")
        self.assertEqual(self.launch_agent.read_text(), "mine")

    def test_a_file_that_is_no_property_list_says_what_and_where(self):
        self.file.write_text('<?xml version="1.0"?>\n<plist version="1.0"><dict><key>a</plist>')
        self.fails(self.store(), 1, "replay.plist is no property list: .*line 2")
        self.fails(self.run_below_root("replay", "show"), 1, "no such item")

    def test_files_that_cannot_be_read_say_why(self):
        self.fails(self.store(file=self.folder / "missing"), 1, "cannot read .*missing: No such file or directory")
        self.fails(self.store(file=self.folder), 1, f"cannot read {self.folder}: Is a directory")

    def test_a_bundle_that_is_not_there_is_refused_before_anything_is_stored(self):
        self.fails(self.store(bundle="/usr/share/elsewhere"), 1, "no bundle at /usr/share/elsewhere below ")
        self.fails(self.run_below_root("replay", "show"), 1, "no such item")

    def test_below_a_root_the_bundle_needs_a_whole_path(self):
        self.fails(self.store(bundle="setup-bundle"), 2, "--bundle")


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
