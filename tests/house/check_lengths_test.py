#!/usr/bin/env python3
"""The check of lengths finds what it is there to find."""

import unittest

import house

check_lengths = house.load("check-lengths")


class CheckLengths(unittest.TestCase):
    def findings(self, name, text):
        return house.findings_in(check_lengths.findings, {name: text})

    def test_a_file_of_400_lines_is_not_too_long(self):
        for name in ("log/A.cpp", "tests/a_test.py"):
            self.assertEqual(self.findings(name, "\n" * 400), [])
            self.assertEqual(self.findings(name, "\n" * 401), [f"{name}: 401 lines, of at most 400"])

    def test_what_is_built_is_not_looked_at(self):
        self.assertEqual(self.findings("build-asan/A.cpp", "\n" * 401), [])

    def test_a_function_of_50_lines_is_not_too_long(self):
        for head in ("int f() {\n", "A::A(int a)\n    : _a(a) {\n", "TEST(A, B) { // of C\n"):
            self.assertEqual(self.findings("A.cpp", head + "    g();\n" * 50 + "}\n"), [])
            self.assertEqual(self.findings("A.cpp", "\n" + head + "    g();\n" * 51 + "}\n"),
                             ["A.cpp:2: a function of 51 lines, of at most 50"])

    def test_a_method_is_found_in_its_class(self):
        text = "class A {\n  public:\n    int f() {\n" + "        g();\n\n" * 26 + "    }\n};\n"
        self.assertEqual(self.findings("A.h", text), ["A.h:3: a function of 52 lines, of at most 50"])

    def test_what_is_no_function_may_be_longer(self):
        for head, end in (("class A {", "};"), ("namespace {", "} // namespace"), ('extern "C" {', "}"),
                          ("constexpr int kA[] = {", "};")):
            self.assertEqual(self.findings("A.h", f"{head}\n" + "    int a;\n" * 60 + f"{end}\n"), [])


if __name__ == "__main__":
    unittest.main()
