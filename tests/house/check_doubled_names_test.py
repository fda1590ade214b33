#!/usr/bin/env python3
"""The check of doubled names finds what it is there to find."""

import unittest

import house

check_doubled_names = house.load("check-doubled-names")


class CheckDoubledNames(unittest.TestCase):
    def findings(self, text, name="a_test.py"):
        return house.findings_in(check_doubled_names.findings, {name: text})

    def test_a_test_that_hides_another_is_found(self):
        text = "class A:\n    def test_b(self):\n        pass\n\n    def test_b(self):\n        pass\n"
        self.assertEqual(self.findings(text), ["a_test.py:5: another test_b stands above it, and is hidden"])

    def test_so_are_functions_and_classes(self):
        for text in ("def a(): pass\ndef a(): pass\n", "class a: pass\nasync def a(): pass\n",
                     "def f():\n  def a(): pass\n\n  class a: pass\n"):
            self.assertEqual(len(self.findings(text)), 1, text)

    def test_a_program_without_a_suffix_is_looked_at(self):
        self.assertEqual(len(self.findings("#!/usr/bin/env python3\ndef a(): pass\ndef a(): pass\n", "scripts/a")), 1)
        self.assertEqual(self.findings("#!/bin/sh\nif then\n", "scripts/a"), [])

    def test_what_hides_nothing_is_well(self):
        for text in ("class A:\n  def a(self): pass\nclass B:\n  def a(self): pass\ndef a(): pass\n",
                     "class A:\n  @property\n  def a(self): pass\n  @a.setter\n  def a(self, b): pass\n",
                     "try:\n  def a(): pass\nexcept E:\n  def a(): pass\n"):
            self.assertEqual(self.findings(text), [], text)

    def test_what_is_built_is_not_looked_at(self):
        self.assertEqual(self.findings("def a(): pass\ndef a(): pass\n", "build-asan/a.py"), [])


if __name__ == "__main__":
    unittest.main()
