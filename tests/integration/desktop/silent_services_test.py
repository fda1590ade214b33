#!/usr/bin/env python3
"""The credential store of the installed tool and agent beside a keyring or a bus that hangs, has died or is not there.

usage: silent_services_test.py BUILD_DIR
"""

import json
import os
import signal
import sys
import unittest

from silent_services import COULD_NOT_BE_ASKED, SECRETS, TIMED_OUT_FINDING, TOOL, SilentServices, machine


class HangingKeyring(SilentServices):
    def setUp(self):
        super().setUp()
        self.bus = self.start_bus()
        self.keyring = self.start_keyring()

    def test_the_agent_logs_a_time_out_and_the_item_stays(self):
        self.succeeds(*self.store())
        self.stop(self.keyring)
        self.assertEqual(self.run_agent(),
                         ["Self destructing...", "Failed to find replay keychain item: 15", "exiting"])
        self.assertEqual(self.fails("replay", "show"),
                         f"welcomer: cannot read the replay item: Failed to find replay keychain item: "
                         f"{TIMED_OUT_FINDING}\n")
        self.assertIn(f"Failed to delete replay keychain item: {TIMED_OUT_FINDING}", self.fails("replay", "delete"))
        self.keyring.send_signal(signal.SIGCONT)
        self.assertEqual(self.shown_account(), "newcomer")

    def test_nothing_is_stored_in_its_place_without_a_word(self):
        self.stop(self.keyring)
        error = self.fails(*self.store())
        self.assertIn(f"Failed to create replay keychain item: 16 ({COULD_NOT_BE_ASKED} to create the item", error)
        self.assertIn("--local", error)
        self.assertIn(COULD_NOT_BE_ASKED, self.fails("setup", "--answers", "/tmp/answers.plist"))
        self.assertFalse(self.local_file().exists())
        self.succeeds(*self.store("--local"))
        self.assertTrue(self.local_file().exists())
        self.assertEqual(self.shown_account(), "newcomer")

    def test_a_bus_that_hangs_is_a_time_out(self):
        self.succeeds(*self.store())
        self.stop(self.bus)
        self.assertIn(TIMED_OUT_FINDING, self.fails("replay", "show"))

    def test_a_bus_that_has_died_is_no_keyring_without_the_item(self):
        self.succeeds(*self.store())
        self.bus.send_signal(signal.SIGKILL)
        self.bus.wait(timeout=60)
        self.assertIn(f"21 ({COULD_NOT_BE_ASKED}: the session bus is dead)", self.fails("replay", "show"))


class NoSessionBus(SilentServices):
    """A user who has a keyring, and is on the machine without their session."""

    def test_the_keyring_could_not_be_asked(self):
        self.start_bus()
        self.start_keyring()
        self.succeeds(*self.store())
        without = f"12 ({COULD_NOT_BE_ASKED}: there is no session bus)"
        self.assertIn(without, self.fails("replay", "show", bus=False))
        self.assertIn(without, self.fails("replay", "delete", bus=False))
        error = self.fails(*self.store(), bus=False)
        self.assertIn(without, error)
        self.assertIn("--local", error)
        error = self.fails("setup", "--answers", "/tmp/answers.plist", bus=False)
        self.assertIn(f"{COULD_NOT_BE_ASKED}: there is no session bus", error)
        self.assertIn("--local", error)
        self.assertFalse(self.local_file().exists())
        self.assertEqual(self.labels_outside(), ["newcomer"])

    def test_who_asks_for_it_stores_into_the_local_file_where_it_is_found(self):
        self.succeeds(*self.store("--local"), bus=False)
        self.assertTrue(self.local_file().exists())
        self.assertEqual(self.shown_account(bus=False), "newcomer")
        self.start_bus()
        self.start_keyring()
        self.assertEqual(self.shown_account(), "newcomer")
        self.assertEqual(self.labels_outside(), [])

    def test_a_whole_setup_into_the_local_file(self):
        directory = self.machine.root / "var/lib/welcomer"
        directory.mkdir(parents=True)
        os.chown(directory, machine.UID, machine.UID)
        with_password = ["/bin/sh", "-c", 'exec "$@" --password-fd 3 3< /tmp/password', "sh", TOOL]
        added = self.machine.run([*with_password, "account", "add", "newcomer"], user=True)
        self.assertEqual(added.returncode, 0, added)
        done = self.machine.run([*with_password, "setup", "--local", "--answers", "/tmp/answers.plist"], user=True)
        self.assertEqual(done.returncode, 0, done)
        self.assertTrue(self.local_file().exists())
        self.assertTrue(self.launch_agent().exists())
        self.assertIn("waiting for the next login already",
                      self.fails("setup", "--local", "--answers", "/tmp/answers.plist", bus=False))

    def test_a_user_with_a_keyring_is_known_where_the_service_is_installed_no_more(self):
        keyrings = self.machine.home / ".local/share/keyrings"
        keyrings.mkdir(parents=True)
        (keyrings / "login.keyring").write_bytes(b"GnomeKeyring\n")
        machine.mount("/dev/null", self.machine.root / f"usr/share/dbus-1/services/{SECRETS}.service", None,
                      machine.MS_BIND)
        self.assertIn(COULD_NOT_BE_ASKED, self.fails("replay", "show", bus=False))


class NoSecretService(SilentServices):
    """A machine on which there is no Secret Service at all."""

    with_keyring = False

    def test_the_local_store_serves_alone(self):
        for bus in (False, True):
            if bus:
                self.start_bus()
            self.assertIn("2 (no such item)", self.fails("replay", "show", bus=bus))
            self.succeeds(*self.store(), bus=bus)
            self.assertEqual(self.shown_account(bus=bus), "newcomer")
            self.succeeds("replay", "delete", bus=bus)
            self.remove_agent()


    def test_where_the_local_store_cannot_be_written_the_path_and_the_reason_are_said(self):
        library = self.machine.home / "Library"
        for folder, mode in ((library, 0o700), (library / "Locks", 0o700), (library / "Credentials", 0o500)):
            folder.mkdir(exist_ok=True)
            os.chown(folder, machine.UID, machine.UID)
            folder.chmod(mode)
        path = f"/home/{machine.USER}/Library/Credentials"
        cannot = "the credential store cannot be written"
        self.assertIn(f"Failed to create replay keychain item: 6 ({cannot}: {path}/Items.plist: Permission denied)",
                      self.fails(*self.store(), bus=False))
        backends = json.loads(self.succeeds("--json", "doctor", bus=False))["backends"]
        reasons = [entry["reason"] for entry in backends if entry["interface"] == "CredentialStore"]
        self.assertEqual(reasons, [f"there is no session bus; {cannot}: {path}: Permission denied"])


class SecondItems(SilentServices):
    def setUp(self):
        super().setUp()
        self.start_bus()
        self.start_keyring()

    def test_of_one_in_the_keyring_and_one_in_the_local_file_the_newest_is_read_and_both_are_deleted(self):
        # Without the session, so that the other one is not seen.
        self.succeeds(*self.store(account="of the keyring"))
        self.remove_agent()
        self.wait_for_next_second()
        self.succeeds(*self.store("--local", account="of the file"), bus=False)
        self.assertEqual(self.shown_account(), "of the file")
        self.succeeds("replay", "delete")
        self.assertFalse(self.local_file().exists())
        self.assertEqual(self.labels_outside(), [])

    def test_the_keyrings_is_read_where_it_is_the_newest(self):
        self.succeeds(*self.store("--local", account="of the file"), bus=False)
        self.wait_for_next_second()
        self.store_from_outside("of the keyring")
        self.assertEqual(self.shown_account(), "of the keyring")
        self.succeeds("replay", "delete")
        self.assertFalse(self.local_file().exists())
        self.assertEqual(self.labels_outside(), [])

    def test_of_two_in_the_keyring_the_newest_is_read_and_both_are_deleted(self):
        for first, second in (("a", "b"), ("b", "a")):
            self.store_from_outside("old", "which", first)
            self.wait_for_next_second()
            self.store_from_outside("new", "which", second)
            self.assertEqual(self.labels_outside(), ["new", "old"])
            self.assertEqual(self.shown_account(), "new")
            self.succeeds("replay", "delete")
            self.assertEqual(self.labels_outside(), [])

    def test_with_the_option_too_an_item_of_the_keyring_is_not_stored_again(self):
        self.succeeds(*self.store())
        self.assertIn("Failed to create replay keychain item: 1 ", self.fails(*self.store("--local")))
        self.assertFalse(self.local_file().exists())


if __name__ == "__main__":
    machine.enter_namespaces()
    SilentServices.build = sys.argv.pop(1)
    unittest.main(verbosity=2)
