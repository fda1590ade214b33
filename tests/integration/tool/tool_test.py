#!/usr/bin/env python3
"""The tool as people and scripts call it: the built program, real files below a root folder of the test's own.

WELCOMER_BUILD is the build folder, WELCOMER_TOOL_TEST_PLUGINS the folder with this test's own plug-ins.
"""

import datetime
import json
import os
import plistlib
import pwd
import re
import shutil
import subprocess
import tempfile
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

    def lists_some_that_do_not_load(self, result, count="one plug-in does"):
        """What `plugins list` prints of them, with its failure."""
        self.assertEqual((result.returncode, result.stderr), (1, f"welcomer: {count} not load\n"), result)
        return result.stdout

    def fails(self, result, status, pattern):
        """Nothing on stdout, one line on stderr."""
        self.assertEqual((result.returncode, result.stdout), (status, ""), result)
        self.assertRegex(result.stderr, rf"\Awelcomer: .*{pattern}.*\n\Z")
        self.assertEqual(result.stderr.count("\n"), 1, result)


class CommandLine(ToolTest):
    COMMANDS = [[], ["try"], ["replay"], ["replay", "store"], ["replay", "show"], ["replay", "delete"], ["plugins"],
                ["plugins", "list"], ["plugins", "try"], ["plugins", "check"], ["setup"], ["account"], ["account", "add"],
                ["account", "list"], ["account", "status"], ["account", "sign-in"], ["account", "services"], ["services"],
                ["services", "list"], ["services", "enable"],
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
        listed = self.run_tool("--root", "root", "plugins", "list", cwd=self.folder)
        self.assertIn("a.ncdplugin", self.lists_some_that_do_not_load(listed))

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
        rows = self.lists_some_that_do_not_load(self.run_below_root("plugins", "list"), "2 plug-ins do").splitlines()
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
        document = json.loads(self.lists_some_that_do_not_load(self.run_below_root("--json", "plugins", "list")))
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
        plugins = json.loads(self.lists_some_that_do_not_load(self.run_below_root("--json", "plugins", "list")))["plugins"]
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
        self.assertEqual(result.stderr, "Nimbus Plugins: Failed to get principal class for text.ncdplugin\n"
                                        "welcomer: one plug-in does not load\n")

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


if __name__ == "__main__":
    unittest.main()
