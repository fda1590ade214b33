#!/usr/bin/env python3
"""What Debian's own checker says of the packages: no error, no warning, no pedantic remark.

usage: lintian_test.py PACKAGES
"""

import subprocess
import sys
import unittest
from pathlib import Path

PACKAGES = None


class LintianTest(unittest.TestCase):
    def test_it_has_nothing_to_say(self):
        changes = list(PACKAGES.glob("*.changes"))
        self.assertEqual(len(changes), 1)
        # Every override has its reason beside it, in debian/.
        checked = subprocess.run(["lintian", "--allow-root", "--pedantic", "--tag-display-limit", "0",
                                  "--fail-on", "error,warning,pedantic", changes[0]],
                                 capture_output=True, text=True, timeout=280)
        said = [line for line in checked.stdout.splitlines() if line[:2] in ("E:", "W:", "P:")]
        self.assertEqual((said, checked.returncode), ([], 0), checked.stdout + checked.stderr)


if __name__ == "__main__":
    PACKAGES = Path(sys.argv.pop(1))
    unittest.main(verbosity=2)
