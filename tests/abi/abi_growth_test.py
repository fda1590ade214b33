#!/usr/bin/env python3
"""The plug-in interface has only grown at the end since it was first published; and this test would notice anything else.

usage: abi_growth_test.py SDK_FOLDER C_COMPILER
"""

import os
import re
import shutil
import subprocess
import sys
import tempfile
import unittest
from pathlib import Path

sys.path.insert(0, str(Path(__file__).resolve().parent))
from abi_report import problems  # noqa: E402

HERE = Path(__file__).resolve().parent
FROZEN = HERE / "frozen-1"
HEADER = "welcomer/delegate_plugin.h"
SDK, COMPILER = None, None


class Growth(unittest.TestCase):
    def setUp(self):
        self.folder = Path(tempfile.mkdtemp(prefix="abi-growth-"))
        self.addCleanup(shutil.rmtree, self.folder)

    def probe(self, include, name):
        library = self.folder / f"{name}.so"
        subprocess.run([COMPILER, "-g", "-shared", "-fPIC", f"-I{include}", "-o", library, HERE / "Probe.c"], check=True,
                       timeout=60)
        return library

    def report(self, include):
        """What abidiff says of the change from the frozen header to the one in this folder."""
        done = subprocess.run(["abidiff", "--leaf-changes-only", self.probe(FROZEN, "frozen"), self.probe(include, "other")],
                              capture_output=True, text=True, timeout=60, check=False)
        self.assertEqual(done.returncode & 3, 0, done)  # its own errors
        return done.stdout

    def edited(self, pattern, replacement):
        """The report of the frozen header with one edit."""
        text = (FROZEN / HEADER).read_text(encoding="utf-8")
        changed, count = re.subn(pattern, replacement, text, count=1)
        self.assertEqual(count, 1, pattern)
        header = self.folder / "edited" / HEADER
        header.parent.mkdir(parents=True)
        header.write_text(changed, encoding="utf-8")
        return self.report(self.folder / "edited")

    def test_the_header_has_only_grown(self):
        self.assertEqual(problems(self.report(SDK)), [])

    def test_growth_at_the_end_is_allowed(self):
        report = self.edited(r"\(\*release\)\(wl_value\* value\);", r"\g<0> void (*one)(void); void (*two)(int);")
        self.assertIn("2 data member insertions", report)
        self.assertEqual(problems(report), [])

    def test_a_member_in_the_middle_is_noticed(self):
        self.assertTrue(problems(self.edited(r"size_t \(\*count\)", r"void (*sneaked)(void); \g<0>")))

    def test_a_member_in_the_padding_is_noticed(self):
        self.assertTrue(problems(self.edited(r"void\* plugin_data;", r"uint32_t sneaked; \g<0>")))

    def test_a_member_that_is_gone_is_noticed(self):
        self.assertTrue(problems(self.edited(r"wl_value\* \(\*new_boolean\)\(bool value\);", "")))

    def test_a_member_of_another_type_is_noticed(self):
        self.assertTrue(problems(self.edited(r"\(\*new_integer\)\(int64_t value\)", "(*new_integer)(int32_t value)")))

    def test_members_that_change_places_are_noticed(self):
        self.assertTrue(problems(self.edited(r"(    uint32_t abi_version;[^\n]*\n)(    uint32_t size;[^\n]*\n)", r"\2\1")))

    def test_a_number_of_another_size_is_noticed(self):
        self.assertTrue(problems(self.edited(r"typedef int32_t wl_value_type;", "typedef int64_t wl_value_type;")))

    def test_what_is_passed_by_value_cannot_grow(self):
        found = problems(self.edited(r"uint64_t context;\n\} wl_completion_handler;",
                                     "uint64_t context; uint64_t more;\n} wl_completion_handler;"))
        self.assertIn("wl_completion_handler is passed by value and cannot change", found)


class Frozen(unittest.TestCase):
    def test_the_frozen_header_has_no_line_that_the_header_lacks(self):
        """What was published is still there, letter for letter, but for what explains it."""
        code = lambda path: [line for line in re.sub(r"/\*.*?\*/", "", path.read_text(encoding="utf-8"), flags=re.S).splitlines()
                             if line.strip()]
        now = code(SDK / HEADER)
        self.assertEqual([line for line in code(FROZEN / HEADER) if line not in now], [])


if __name__ == "__main__":
    SDK, COMPILER = Path(sys.argv[1]), sys.argv[2]
    os.environ["LC_ALL"] = "C"
    unittest.main(argv=sys.argv[:1], verbosity=2)
