#!/usr/bin/env python3
"""What the installed tool reports of services that hang, have died or do not run.

usage: silent_services_doctor_test.py BUILD_DIR
"""

import json
import signal
import sys
import unittest

from silent_services import ONLINE_ACCOUNTS, SECRETS, SYSTEM_BUS, SilentServices, machine


class Doctor(SilentServices):
    def reports(self, bus=True):
        backends = json.loads(self.succeeds("--json", "doctor", bus=bus))["backends"]
        return {entry["interface"]: (entry["backend"], entry["reason"]) for entry in backends}

    def test_what_does_not_run_is_not_started(self):
        self.start_bus()
        activatable = self.ask_bus("ListActivatableNames")
        self.assertIn(SECRETS, activatable)
        self.assertIn(ONLINE_ACCOUNTS, activatable)
        before = self.ask_bus("ListNames").count("'org.")
        reports = self.reports()
        self.assertEqual(reports["CredentialStore"],
                         ("Secret Service", "it does not run; the session bus starts it when it is needed"))
        self.assertEqual(reports["AccountService"],
                         ("GNOME Online Accounts", "its daemon does not run; the session bus starts it when it is needed"))
        self.assertFalse(self.runs(SECRETS))
        self.assertFalse(self.runs(ONLINE_ACCOUNTS))
        self.assertEqual(self.ask_bus("ListNames").count("'org."), before)

    def test_what_hangs_runs_and_does_not_answer(self):
        self.start_bus()
        daemons = [self.start_keyring(), self.start_online_accounts()]
        self.assertEqual(self.reports()["CredentialStore"], ("Secret Service", "the default keyring is unlocked"))
        for daemon in daemons:
            self.stop(daemon)
        reports = self.reports()
        self.assertEqual(reports["CredentialStore"], ("Secret Service", "it runs, does not answer"))
        self.assertEqual(reports["AccountService"], ("GNOME Online Accounts", "its daemon runs, does not answer"))

    def test_without_a_session_bus_the_keyring_cannot_be_asked(self):
        self.assertEqual(self.reports(bus=False)["CredentialStore"],
                         ("none", "there is no session bus, so that the keyring cannot be asked"))

    def test_a_session_bus_that_hangs_is_given_up(self):
        self.stop(self.start_bus())
        reports = self.reports()
        self.assertEqual(reports["CredentialStore"],
                         ("none", "the session bus runs, does not answer, so that the keyring cannot be asked"))
        self.assertEqual(reports["AccountService"], ("account file", "no session bus answers"))

    def test_a_system_bus_that_hangs_is_given_up(self):
        (self.machine.root / "var/run/dbus").mkdir(parents=True, exist_ok=True)
        bus = self.machine.start(["dbus-daemon", "--session", "--nofork", "--nopidfile", f"--address={SYSTEM_BUS}"])

        def end():
            bus.send_signal(signal.SIGKILL)
            bus.wait(timeout=60)

        self.addCleanup(end)
        machine.Machine.wait_for(lambda: self.machine.run(["gdbus", "call", "--address", SYSTEM_BUS, "-d",
                                                           "org.freedesktop.DBus", "-o", "/", "-m",
                                                           "org.freedesktop.DBus.GetId"]).returncode == 0, "the bus")
        self.stop(bus)
        reports = self.reports(bus=False)
        self.assertEqual(reports["NetworkConfigStore"], ("local file and kernel", "the system bus does not answer"))
        self.assertEqual(reports["NetworkStateStore"], ("kernel", "the system bus does not answer"))
        self.assertEqual(reports["HostReachability"],
                         ("name lookup and routes", "the system bus does not answer"))

    def test_a_bus_that_has_died_is_told_from_none(self):
        bus = self.start_bus()
        bus.send_signal(signal.SIGKILL)
        bus.wait(timeout=60)
        self.assertEqual(self.reports()["CredentialStore"],
                         ("none", "the session bus is dead, so that the keyring cannot be asked"))


if __name__ == "__main__":
    machine.enter_namespaces()
    SilentServices.build = sys.argv.pop(1)
    unittest.main(verbosity=2)
