#!/usr/bin/env python3
"""scripts/mutate finds what can be broken, and leaves alone what it is told to leave alone."""

import sys
import unittest
from pathlib import Path

sys.path.insert(0, str(Path(__file__).resolve().parents[2] / "scripts" / "mutate.d"))

import mutations  # noqa: E402


class Mutations(unittest.TestCase):
    def broken(self, body, head="int function(int a, int b)"):
        """What becomes of a function's body, without the spaces at line ends."""
        text = f"#include <x>\n\nnamespace n {{\n\n{head} {{\n    {body}\n}}\n\n}} // namespace n\n"
        source, found = mutations.find(text)
        return [(text[:each.start] + each.new + text[each.end:]).split("{\n    ", 1)[1].split("\n}\n")[0]
                for each, _ in found]

    def assert_broken(self, body, *expected):
        for text in expected:
            self.assertIn(text, self.broken(body))

    def test_conditions_are_negated(self):
        self.assert_broken("if (a && b) { f(); }", "if (!(a && b)) { f(); }", "if (a || b) { f(); }")
        self.assert_broken("if (const auto x = f(a)) { g(x); }", "if (const auto x = f(a); !(x)) { g(x); }")
        self.assert_broken("while (!a) { f(); }", "while (a) { f(); }")
        self.assert_broken("x = a ? 1 : 2;", "x = !(a) ? 1 : 2;")
        self.assert_broken("return f(a);", "return !(f(a));")

    def test_statements_are_dropped_and_swapped(self):
        self.assert_broken("f();\n    g();", ";\n    g();", "f();\n    ;", "g();\n    f();")
        self.assert_broken("run([&] {\n        f();\n        g();\n    });", ";",
                           "run([&] {\n        g();\n        f();\n    });",
                           "run([&] {\n        f();\n        ;\n    });")
        self.assert_broken("if (a) {\n        return b;\n    }\n    return a;",
                           "if (a) {\n        ;\n    }\n    return a;")

    def test_a_function_keeps_its_last_result(self):
        self.assertNotIn(";", self.broken("return a;"))

    def test_constants_change_by_one(self):
        self.assert_broken("f(7);", "f(6);", "f(8);")
        self.assert_broken("f(0755);", "f(0756);")
        self.assert_broken("f(100ms);", "f(101ms);")
        self.assert_broken("f(true);", "f(false);")
        self.assertNotIn("f(-1);", self.broken("f(0);"))

    def test_operators_are_turned(self):
        self.assert_broken("return a < b;", "return a <= b;", "return a >= b;")
        self.assert_broken("return a == b;", "return a != b;")
        self.assert_broken("x = a + 1;", "x = a - 1;")
        self.assertEqual(self.broken("std::vector<int> x;"), [";"])

    def test_calls_are_left_out(self):
        self.assert_broken("x = f(a);", "x = a;")
        self.assert_broken("x = a.trimmed();", "x = a;")
        self.assertNotIn("a;", self.broken("a.trim();"))  # dropped as a statement already

    def test_constants_outside_of_functions_change(self):
        source, found = mutations.find("namespace n {\nconstexpr int kNumber = 7;\n}\n")
        self.assertEqual([(each.new, opening) for each, opening in found], [("6", None), ("8", None)])

    def test_what_is_not_to_change_does_not(self):
        for text in ("#include <a0.h>\n", "// f(1);\n", "static_assert(a == 1);\n",
                     "void f() noexcept {\n    g(1);\n}\n", "const char* text = \"a == 1\";\n",
                     "#ifdef A\nvoid f() {\n    g(1);\n}\n#endif\n"):
            self.assertEqual(mutations.find("\n" + text + "\n")[1], [], text)


if __name__ == "__main__":
    unittest.main()
