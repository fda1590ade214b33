#!/usr/bin/env python3
"""The installed programs on a machine where libmnl is missing.

usage: without_libmnl_test.py BUILD_DIR
"""

import sys
import tempfile
import unittest
from pathlib import Path

sys.path.insert(0, str(Path(__file__).resolve().parents[2] / "support"))
import machine  # noqa: E402

TOOL, AGENT = "/usr/local/bin/welcomer", "/usr/local/libexec/wlnimbussetup"
BUILD = Path(sys.argv[1])


class WithoutLibmnl(unittest.TestCase):
    @classmethod
    def setUpClass(cls):
        cls.machine = machine.Machine(tempfile.mkdtemp())
        cls.machine.install(BUILD)
        cls.machine.start_system_log()
        libraries = [path for path in (cls.machine.root / "usr/lib").glob("**/libmnl.so.0.*") if not path.is_symlink()]
        assert libraries
        for path in libraries:
            machine.mount("/dev/null", path, None, machine.MS_BIND)

    @classmethod
    def tearDownClass(cls):
        cls.machine.stop()

    def test_a_question_about_the_network_fails_with_one_line(self):
        for command in (["network", "ports"], ["network", "show"]):
            with self.subTest(command):
                result = self.machine.run([TOOL, *command])
                self.assertEqual((result.returncode, result.stdout), (1, ""), result)
                self.assertRegex(result.stderr, r"\Awelcomer: \S*libmnl\.so\.0: .*\n\Z")

    def test_who_asks_nothing_does_not_notice(self):
        self.assertEqual(self.machine.run([TOOL, "--version"]).returncode, 0)
        result = self.machine.run([AGENT], user=True)
        self.assertEqual((result.returncode, result.stderr), (0, ""))
        # The log daemon may still be about to write it.
        self.machine.wait_for(
            lambda: [text for _, _, text in self.machine.log_records("wlnimbussetup")][-1:] == ["exiting"], "the last line")


if __name__ == "__main__":
    machine.enter_namespaces()
    unittest.main(argv=sys.argv[:1])
