#!/usr/bin/env python3
"""The SDK's headers compile by every compiler that is there, as every standard from C99 and C++17 on, with strict
warnings, with and without exceptions and run-time type information; and each header by itself.

usage: sdk_headers_test.py SDK_FOLDER SUITE
"""

import functools
import itertools
import shutil
import subprocess
import sys
import unittest
from pathlib import Path

HERE = Path(__file__).resolve().parent
WARNINGS = ["-Wall", "-Wextra", "-Wpedantic", "-Wconversion", "-Wsign-conversion", "-Wshadow", "-Wcast-align", "-Wcast-qual",
            "-Wundef", "-Wformat=2", "-Werror"]
C_WARNINGS = [*WARNINGS, "-Wstrict-prototypes", "-Wmissing-prototypes", "-Wc++-compat"]
CXX_WARNINGS = [*WARNINGS, "-Wold-style-cast", "-Wnon-virtual-dtor", "-Woverloaded-virtual"]
C_STANDARDS = ["c99", "c11", "c17"]
CXX_STANDARDS = ["c++17", "c++20", "c++23"]
# What a compiler calls a standard before it is one.
OLD_NAMES = {"c++23": "c++2b", "c17": "c18"}
SDK = None


def compiles(compiler, standard, language, options, text):
    """What the compiler says; empty when it says nothing."""
    done = subprocess.run([compiler, "-x", language, f"-std={standard}", *options, f"-I{SDK}", "-fsyntax-only", "-"],
                          input=text, capture_output=True, text=True, timeout=250, check=False)
    return done.stderr or (f"status {done.returncode}" if done.returncode else "")


@functools.cache
def known(compiler, standard, language):
    """The name that the compiler knows a standard by, or None."""
    for name in (standard, OLD_NAMES.get(standard)):
        if name and not compiles(compiler, name, language, [], ""):
            return name
    return None


class HeaderTest(unittest.TestCase):
    def compilers(self, names):
        found = [name for name in names if shutil.which(name)]
        self.assertTrue(found, names)
        return found

    def assert_compiles(self, compilers, standards, language, variants, text):
        tried = 0
        for compiler, standard, variant in itertools.product(compilers, standards, variants):
            name = known(compiler, standard, language)
            if name:
                tried += 1
                with self.subTest(compiler=compiler, standard=standard, options=variant[-2:]):
                    self.assertEqual(compiles(compiler, name, language, variant, text), "")
        # Every compiler that builds this system knows all but the newest.
        self.assertGreaterEqual(tried, len(compilers) * max(1, len(standards) - 1) * len(variants))


class C(HeaderTest):
    def test_a_plugin_in_c(self):
        self.assert_compiles(self.compilers(["gcc", "clang"]), C_STANDARDS, "c", [C_WARNINGS],
                             (HERE / "HeaderUse.c").read_text(encoding="utf-8"))

    def test_the_same_as_cxx(self):
        self.assert_compiles(self.compilers(["g++", "clang++"]), CXX_STANDARDS, "c++", [WARNINGS],
                             (HERE / "HeaderUse.c").read_text(encoding="utf-8"))


class LayerTest(HeaderTest):
    def assert_layer_compiles(self, standards, *variants):
        self.assert_compiles(self.compilers(["g++", "clang++"]), standards, "c++",
                             [[*CXX_WARNINGS, *options] for options in variants],
                             (HERE / "LayerUse.cpp").read_text(encoding="utf-8"))


class Layer(LayerTest):
    def test_a_plugin_over_the_layer(self):
        self.assert_layer_compiles(CXX_STANDARDS, [])


# These differ by what the headers themselves ask the compiler, not by the standard.
class LayerWithout(LayerTest):
    def test_exceptions_and_run_time_type_information(self):
        self.assert_layer_compiles(CXX_STANDARDS[:1], ["-fno-exceptions"], ["-fno-rtti"], ["-fno-exceptions", "-fno-rtti"])


class Alone(HeaderTest):
    def test_each_header_by_itself(self):
        for header in sorted(SDK.glob("welcomer/**/*.h*")):
            name = header.relative_to(SDK)
            with self.subTest(name):
                text = f"#include <{name}>\n"
                if header.suffix == ".h":
                    self.assertEqual(compiles("gcc", "c99", "c", [*C_WARNINGS, "-Wno-pedantic"], text), "")
                self.assertEqual(compiles("g++", "c++17", "c++", CXX_WARNINGS, text), "")


if __name__ == "__main__":
    SDK = Path(sys.argv[1])
    unittest.main(argv=[sys.argv[0], sys.argv[2]], verbosity=2)
