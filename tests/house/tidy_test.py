#!/usr/bin/env python3
"""What was found clean is not looked at again while all that it is made of is the same. clang-tidy is a stand-in here."""

import json
import os
import subprocess
import sys
import tempfile
import unittest
from pathlib import Path

PROGRAM = Path(__file__).resolve().parents[2] / "scripts/check.d/tidy.py"
# Finds "bad" in a source and in the header beside it; ends like a program that was killed where there is "deadly".
STAND_IN = """#!/bin/sh
[ "$1" != --version ] || exec echo "stand-in $VERSION"
for file; do :; done
cat "$file" "${file%.cpp}.h" >"$0.read"
! grep -q deadly "$0.read" || kill -KILL $$
! grep bad "$0.read"
"""


class Tidy(unittest.TestCase):
    def setUp(self):
        folder = tempfile.TemporaryDirectory()
        self.addCleanup(folder.cleanup)
        self.folder = Path(folder.name)
        stand_in = self.folder / "clang-tidy-14"
        stand_in.write_text(STAND_IN, encoding="ascii")
        stand_in.chmod(0o755)
        self.environment = {**os.environ, "PATH": f"{self.folder}:{os.environ['PATH']}",
                            "XDG_CACHE_HOME": str(self.folder / "cache"), "VERSION": "1"}
        self.write("a.h", "int a;\n")
        self.write("a.cpp", '#include "a.h"\n')
        self.compile_with("-O0")
        self.assertEqual(self.look(), (0, 1))

    def write(self, name, text):
        (self.folder / name).write_text(text, encoding="ascii")

    def compile_with(self, option):
        entry = {"directory": str(self.folder), "file": str(self.folder / "a.cpp"), "command": f"g++ {option} -o a.o -c a.cpp"}
        self.write("compile_commands.json", json.dumps([entry]))

    def look(self):
        """The exit status, and how many files were looked at."""
        done = subprocess.run([sys.executable, "-B", PROGRAM, self.folder, self.folder / "a.cpp"], env=self.environment,
                              capture_output=True, text=True)
        self.assertIn("tidy: 1 files, ", done.stdout, done.stderr)
        return done.returncode, int(done.stdout.split("tidy: 1 files, ")[1].split()[0])

    def test_what_is_the_same_is_not_looked_at_again(self):
        self.assertEqual(self.look(), (0, 0))

    def test_another_source_header_option_or_clang_tidy_is_looked_at(self):
        for change in (lambda: self.write("a.cpp", '#include "a.h"\nint b;\n'), lambda: self.write("a.h", "int c; // of b\n"),
                       lambda: self.compile_with("-O2"), lambda: self.environment.update(VERSION="2")):
            change()
            self.assertEqual(self.look(), (0, 1))
            self.assertEqual(self.look(), (0, 0))

    def test_a_finding_is_one_each_time(self):
        self.write("a.h", "int bad;\n")
        self.assertEqual(self.look(), (1, 1))
        self.assertEqual(self.look(), (1, 1))

    def test_a_clang_tidy_that_ends_without_a_word_has_found_nothing_clean(self):
        self.write("a.h", "int deadly;\n")
        self.assertEqual(self.look(), (1, 1))

    def test_what_cannot_be_compiled_is_never_remembered(self):
        self.write("a.cpp", '#include "a.h"\n#include "missing.h"\n')
        self.assertEqual(self.look(), (0, 1))
        self.assertEqual(self.look(), (0, 1))


if __name__ == "__main__":
    unittest.main()
