#!/usr/bin/env python3
"""What the installed doctor hears of the starter's unit from a real user manager.

usage: doctor_units_test.py BUILD_DIR
"""

import json
import sys
import unittest

from launch_agents_test import UNIT, LaunchAgentsTest, logins, machine

TOOL = "/usr/local/bin/welcomer"


class DoctorUnits(LaunchAgentsTest):
    def log_in(self, **options):
        """A login whose unit has been started; the test does not ask whether that went well."""
        self.login = logins.Login(self.machine, **options)
        if self.login.manager:
            self.login.systemctl("start", UNIT, check=False)

    def units(self):
        """What the doctor says of the units: one finding, (state, text, advice)."""
        done = self.login.run([TOOL, "--json", "doctor"])
        document = json.loads(done.stdout)
        [found] = [each for each in document["checks"] if each["subject"] == "units"]
        wrong = any(each["state"] == "wrong" for each in document["checks"])
        self.assertEqual(done.returncode, 1 if wrong else 0, done)
        return found["state"], found["text"], found["advice"]

    def override(self, text):
        folder = self.machine.root / f"etc/systemd/user/{UNIT}.d"
        folder.mkdir(parents=True)
        (folder / "test.conf").write_text(text, encoding="utf-8")

    def test_one_that_starts_agents_is_well(self):
        self.log_in()
        self.assertEqual(self.units(), ("right", f"the user's unit {UNIT} starts agents at a login", None))

    def test_one_that_is_disabled_starts_nothing(self):
        done = self.machine.run(["/usr/bin/systemctl", "--global", "disable", UNIT])
        self.assertEqual(done.returncode, 0, done)
        self.log_in()
        self.assertEqual(self.units(), ("wrong", f"the user's unit {UNIT} is disabled", f"systemctl --user enable {UNIT}"))
        # The advice helps.
        self.login.systemctl("enable", UNIT)
        self.assertEqual(self.units()[0], "right")

    def test_one_that_is_masked_is_not_loaded(self):
        self.log_in()
        self.login.systemctl("mask", UNIT)
        state, text, advice = self.units()
        self.assertEqual((state, text), ("wrong", f"the user's unit {UNIT} is not loaded: masked"))
        self.assertIn(f"systemctl --user unmask {UNIT}", advice)

    def test_one_that_has_failed_is_wrong(self):
        self.override("[Service]\nExecStart=\nExecStart=/bin/false\n")
        self.log_in()
        self.assertEqual(self.units(), ("wrong", f"the user's unit {UNIT} has failed: exit-code",
                                        f"journalctl --user -u {UNIT}"))

    def test_without_a_user_manager_the_file_is_what_can_be_told(self):
        self.log_in(with_manager=False)
        self.assertEqual(self.units(), ("right", f"the user's unit {UNIT} is installed; "
                                        "no service manager runs for this user", None))


if __name__ == "__main__":
    machine.enter_namespaces()
    LaunchAgentsTest.build = sys.argv.pop(1)
    unittest.main(verbosity=2)
