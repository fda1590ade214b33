#!/usr/bin/env python3
"""The installed tool's `plugins check` and `plugins list`, with plug-ins that break one rule each, and such as break none.

usage: plugin_check_test.py BUILD_DIR CC CXX PART/PARTS [UNITTEST_ARGUMENT ...]

The part is for the broken ones: every so many of them, beginning with that one.
"""

import json
import os
import re
import shutil
import subprocess
import sys
import unittest
from pathlib import Path

HERE = Path(__file__).resolve().parent
SOURCES = HERE.parents[1]
sys.path[:0] = [str(HERE / "broken"), str(HERE.parent / "support")]
from installed_tool import InstalledToolCase  # noqa: E402
from table import BROKEN  # noqa: E402

PLUGIN_FOLDER = "System/Library/CoreServices/FirstRunPlugins"
CC, CXX, PART = None, None, None


class WithTool(InstalledToolCase):
    def compile(self, source, name, *options):
        library = self.folder / f"{name}.ncdplugin"
        compiler = [CXX, "-std=c++17"] if source.suffix == ".cpp" else [CC, "-std=c11"]
        subprocess.run([*compiler, "-Wall", "-Wextra", "-Wno-unused-function", "-Wno-unused-variable", "-shared", "-fPIC",
                        "-pthread", f"-I{self.prefix}/include", *options, source, "-o", library], check=True, timeout=120)
        return library

    def tool(self, *arguments):
        return super().tool(*arguments, DBUS_SESSION_BUS_ADDRESS="unix:path=/nonexistent")

    def check(self, *arguments):
        """The exit status, and the records of the first plug-in."""
        done = self.tool("--json", "plugins", "check", *arguments)
        self.assertIn(done.returncode, (0, 1, 3), done)
        return done.returncode, json.loads(done.stdout)["plugins"][0]["checks"]


def not_as_it_should(records):
    return [(record["name"], record["verdict"]) for record in records if record["verdict"] in ("failed", "warned")]


class Broken(WithTool):
    def test_each_is_caught_by_its_check_and_by_no_other(self):
        part, parts = map(int, PART.split("/"))
        mine = BROKEN[part::parts]
        self.assertGreater(len(mine), 0)
        for number, (source, check, verdict, options) in enumerate(mine):
            with self.subTest(source, check=check):
                status, records = self.check(self.compile(HERE / "broken" / source, f"broken{number}", *options))
                self.assertEqual(not_as_it_should(records), [(check, verdict)], records)
                self.assertEqual(status, {"failed": 1, "warned": 3}[verdict])
                [record] = [record for record in records if record["name"] == check]
                self.assertTrue(record["seen"], "what was seen is said")


class Examples(WithTool):
    def assert_passes(self, plugin):
        status, records = self.check(plugin)
        self.assertEqual((not_as_it_should(records), status), ([], 0), records)
        self.assertEqual({record["verdict"] for record in records}, {"passed"})

    def test_the_examples_pass(self):
        examples = [path for path in self.prefix.glob("lib/**/welcomer/examples/*plugins/*.ncdplugin")]
        self.assertGreaterEqual(len(examples), 3)
        for example in examples:
            with self.subTest(example.name):
                self.assert_passes(example)

    def test_one_that_is_whole_in_c_passes(self):
        source = self.folder / "whole.c"
        source.write_text('#include "plugin.h"\n#include "whole.h"\n')
        self.assert_passes(self.compile(source, "whole", f"-I{HERE}/broken"))

    def test_the_one_in_the_documentation_passes(self):
        text = (SOURCES / "docs/plugins.md").read_text()
        source = self.folder / "notes.cpp"
        source.write_text(re.search(r"^```cpp\n(.*?)^```", text, re.MULTILINE | re.DOTALL)[1])
        self.assert_passes(self.compile(source, "Notes", "-fvisibility=hidden", "-fno-gnu-unique"))


class Good(WithTool):
    def test_every_check_has_a_plugin_that_breaks_its_rule(self):
        checks = json.loads(self.tool("--json", "plugins", "check", "--list").stdout)["checks"]
        names = [check["name"] for check in checks]
        self.assertEqual(len(names), len(set(names)))
        self.assertEqual(set(names) - {"library"}, {check for _, check, _, _ in BROKEN})
        self.assertGreaterEqual(len(BROKEN), 40)
        shown = self.tool("plugins", "check", "--list")
        self.assertEqual(shown.returncode, 0, shown)
        for check in checks:
            self.assertRegex(shown.stdout, rf"(?m)^{check['name']} +{re.escape(check['description'])}")
            self.assertIn(check["verdict"], ("failed", "warned"))

    def test_what_a_check_is_documented_with_is_there(self):
        for check in json.loads(self.tool("--json", "plugins", "check", "--list").stdout)["checks"]:
            with self.subTest(check["name"]):
                place, text = check["documented"].split(": ", 1)
                file = SOURCES / ("docs" if place.endswith(".md") else "sdk") / place
                self.assertIn(text, " ".join(file.read_text().split()))

    def test_what_is_no_library_fails_and_nothing_of_it_is_loaded(self):
        for content, seen in ((b"no library", "it is no library"), (b"", "it is no library")):
            file = self.folder / "text.ncdplugin"
            file.write_bytes(content)
            status, records = self.check(file)
            self.assertEqual((status, not_as_it_should(records)), (1, [("library", "failed")]))
            self.assertEqual(records[0]["seen"], seen)
            self.assertEqual({record["verdict"] for record in records[1:]}, {"skipped"})
        pipe = self.folder / "pipe.ncdplugin"
        os.mkfifo(pipe)
        status, records = self.check(pipe)
        self.assertEqual((status, records[0]["seen"]), (1, "it is no regular file"))

    def test_people_are_shown_what_is_wrong_and_where_to_read_of_it(self):
        broken = self.compile(HERE / "broken/visible.c", "visible")
        done = self.tool("plugins", "check", broken)
        self.assertEqual((done.returncode, done.stderr), (3, "welcomer: one check warned\n"), done)
        self.assertIn("\n  passed   library\n", done.stdout)
        self.assertRegex(done.stdout, r"\n  WARNED   visibility: .*a_function_of_its_own.*\n +see welcomer/delegate_plugin\.h: ")
        worse = self.compile(HERE / "broken/faults_in_create.c", "worse")
        done = self.tool("plugins", "check", broken, worse)
        self.assertEqual((done.returncode, done.stderr), (1, "welcomer: one check failed\n"), done)
        self.assertIn("\n  FAILED   create: it ended the process: SIGSEGV in create\n", done.stdout)

    def test_the_response_is_that_of_the_command_line(self):
        response = self.folder / "response.plist"
        response.write_text('<plist version="1.0"><dict/></plist>')
        _, records = self.check(self.compile(HERE / "broken/faults_on_empty.c", "empty"), "--response", response)
        self.assertEqual(not_as_it_should(records), [("completion", "failed")])

    def test_what_makes_no_sense_is_a_usage_error(self):
        for arguments in ([], ["--nonsense", "file"]):
            done = self.tool("plugins", "check", *arguments)
            self.assertEqual(done.returncode, 2, done)
        self.assertEqual(self.tool("plugins", "check", self.folder / "missing").returncode, 1)


class Listing(WithTool):
    def list(self, **plugins):
        root = self.folder / "root"
        shutil.rmtree(root, ignore_errors=True)
        folder = root / PLUGIN_FOLDER
        folder.mkdir(parents=True)
        for name, library in plugins.items():
            shutil.copy(library, folder / f"{name}.ncdplugin")
        done = self.tool("--root", root, "--json", "plugins", "list")
        return done, {plugin["file"].removesuffix(".ncdplugin"): plugin for plugin in json.loads(done.stdout)["plugins"]}

    def good(self):
        source = self.folder / "good.c"
        source.write_text('#include "plugin.h"\n#include "whole.h"\n')
        return self.compile(source, "good", f"-I{HERE}/broken")

    def test_all_load(self):
        done, plugins = self.list(good=self.good())
        self.assertEqual((done.returncode, done.stderr), (0, ""), done)
        self.assertEqual(plugins["good"], {"identifier": "org.example.broken", "file": "good.ncdplugin", "state": "loaded"})

    def test_one_that_does_not_load_is_a_failure(self):
        done, plugins = self.list(good=self.good(), other=self.compile(HERE / "broken/other_version.c", "other"))
        self.assertEqual((done.returncode, done.stderr), (1, "welcomer: one plug-in does not load\n"), done)
        self.assertEqual((plugins["good"]["state"], plugins["other"]["state"]), ("loaded", "ABI version 2 instead of 1"))

    def test_those_that_end_or_hold_up_the_process_are_named_and_the_others_seen(self):
        culprits = {"exits": "initialiser_exits.c", "blocks": "initialiser_blocks.c", "faults": "initialiser_faults.c",
                    "creates": "faults_in_create.c"}
        done, plugins = self.list(good=self.good(), **{name: self.compile(HERE / "broken" / source, name)
                                                       for name, source in culprits.items()})
        self.assertEqual((done.returncode, done.stderr), (1, "welcomer: 4 plug-ins do not load\n"), done)
        self.assertEqual({name: plugin["state"] for name, plugin in plugins.items()}, {
            "good": "loaded", "exits": "it ends the process: exit(0)", "faults": "it ends the process: SIGSEGV",
            "creates": "it ends the process: SIGSEGV", "blocks": "it holds up the process for longer than 10 s"})


if __name__ == "__main__":
    InstalledToolCase.build, CC, CXX, PART = sys.argv[1:5]
    unittest.main(argv=[sys.argv[0], *sys.argv[5:]])
