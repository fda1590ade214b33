#!/usr/bin/env python3
"""The installed tool and agent beside services of the desktop that hang, have died, cannot be asked, or do not run.

A service that hangs is stopped (SIGSTOP) by its process id, a real gnome-keyring on a real session bus.

usage: silent_services_test.py BUILD_DIR
"""

import json
import os
import plistlib
import shutil
import signal
import sys
import tempfile
import time
import unittest
from pathlib import Path

sys.path.insert(0, str(Path(__file__).resolve().parents[2] / "support"))
import login as logins  # noqa: E402
import machine  # noqa: E402

TOOL, AGENT = "/usr/local/bin/welcomer", "/usr/local/libexec/wlnimbussetup"
BUNDLE = "/usr/local/share/welcomer/setup-bundle"
BUS = f"unix:path=/run/user/{machine.UID}/bus"
SYSTEM_BUS = "unix:path=/var/run/dbus/system_bus_socket"
SECRETS, ONLINE_ACCOUNTS = "org.freedesktop.secrets", "org.gnome.OnlineAccounts"
KEY = ("service", "Welcomer Nimbus Replay Data", "account", "Welcomer")
REPLAY = plistlib.dumps({"delegatesResponseDict": {"delegates": {}}})
PASSWORD = "correct horse"
COULD_NOT_BE_ASKED = "the keyring could not be asked"
TIMED_OUT_FINDING = f"15 ({COULD_NOT_BE_ASKED} for the item: no answer within 10 seconds)"

BUILD = None


class SilentServices(unittest.TestCase):
    """A machine for each test, with a user in a session of a desktop without systemd."""

    with_keyring = True

    def setUp(self):
        self.folder = Path(tempfile.mkdtemp(prefix="silent-services-"))
        self.addCleanup(shutil.rmtree, self.folder)
        self.machine = machine.Machine(self.folder / "machine", self.with_keyring)
        self.addCleanup(self.machine.stop)
        self.machine.install(BUILD)
        self.machine.start_system_log()
        for name, content in (("replay.plist", REPLAY), ("password", f"{PASSWORD}\n".encode()),
                              ("answers.plist", plistlib.dumps({"Account": "newcomer"}))):
            (self.machine.root / "tmp" / name).write_bytes(content)
        self.session = logins.Login(self.machine, with_manager=False, environment={"DBUS_SESSION_BUS_ADDRESS": BUS})
        self.addCleanup(self.session.end)

    # The services.

    def start(self, *command, **options):
        daemon = self.session.start(command, **options)

        def end():
            daemon.send_signal(signal.SIGKILL)
            daemon.wait(timeout=60)

        self.addCleanup(end)
        return daemon

    def start_bus(self):
        bus = self.start("dbus-daemon", "--session", "--nofork", "--nopidfile", f"--address={BUS}")
        machine.Machine.wait_for(lambda: "true" in self.ask_bus("NameHasOwner", "org.freedesktop.DBus"), "the bus")
        return bus

    def start_keyring(self):
        reading, writing = os.pipe()
        os.write(writing, b"the keyring's password")
        os.close(writing)
        keyring = self.start("gnome-keyring-daemon", "--foreground", "--components=secrets", "--unlock", stdin=reading)
        os.close(reading)
        machine.Machine.wait_for(lambda: self.runs(SECRETS), "the keyring")
        locked = ["gdbus", "call", "--session", "-d", SECRETS, "-o", "/org/freedesktop/secrets/collection/login", "-m",
                  "org.freedesktop.DBus.Properties.Get", "org.freedesktop.Secret.Collection", "Locked"]
        machine.Machine.wait_for(lambda: "<false>" in self.session.run(locked).stdout, "the unlocked keyring")
        return keyring

    def start_online_accounts(self):
        daemon = self.start("/usr/libexec/goa-daemon")
        machine.Machine.wait_for(lambda: self.runs(ONLINE_ACCOUNTS), "the online accounts")
        return daemon

    def ask_bus(self, method, *arguments):
        # Asked of the bus itself, which starts nobody for it.
        return self.session.run(["gdbus", "call", "--session", "-d", "org.freedesktop.DBus", "-o", "/", "-m",
                                 f"org.freedesktop.DBus.{method}", *arguments]).stdout

    def runs(self, name):
        return "true" in self.ask_bus("NameHasOwner", name)

    def stop(self, daemon):
        """Has a service hang, for the rest of the test."""
        daemon.send_signal(signal.SIGSTOP)
        state = self.machine.root / "proc" / str(daemon.pid) / "stat"
        machine.Machine.wait_for(lambda: state.read_text().rpartition(")")[2].split()[0] == "T", "the stop")

    # The programs.

    def tool(self, *arguments, bus=True):
        if bus:
            return self.session.run([TOOL, *arguments])
        # As over ssh, or with sudo -u: nothing says where the session is.
        return self.machine.run([TOOL, *arguments], user=True)

    def succeeds(self, *arguments, bus=True):
        done = self.tool(*arguments, bus=bus)
        self.assertEqual((done.returncode, done.stderr), (0, ""), done)
        return done.stdout

    def fails(self, *arguments, bus=True):
        done = self.tool(*arguments, bus=bus)
        self.assertEqual((done.returncode, done.stdout), (1, ""), done)
        self.assertEqual(done.stderr.count("\n"), 1, done)
        return done.stderr

    def store(self, *options, account="newcomer", bus=True):
        return ("replay", "store", "--account", account, "--file", "/tmp/replay.plist", "--bundle", BUNDLE, *options)

    def remove_agent(self):
        self.launch_agent().unlink()

    def launch_agent(self):
        return self.machine.home / "Library/LaunchAgents/com.corvid.welcomer.nimbussetup.user.plist"

    def local_file(self):
        return self.machine.home / "Library/Credentials/Items.plist"

    def shown_account(self, bus=True):
        return json.loads(self.succeeds("--json", "replay", "show", bus=bus))["account"]

    def run_agent(self):
        """The agent's log lines in a login."""
        done = self.session.run([AGENT])
        self.assertEqual((done.returncode, done.stdout, done.stderr), (0, "", ""), done)
        texts = []

        def has_ended():
            texts[:] = [text for _, _, text in self.machine.log_records("wlnimbussetup")]
            return texts[-1:] == ["exiting"]

        machine.Machine.wait_for(has_ended, "the agent's last line")
        return texts

    def wait_for_next_second(self):
        # The stores' times have whole seconds.
        start = int(time.time())
        machine.Machine.wait_for(lambda: int(time.time()) > start, "the next second")

    def store_from_outside(self, account, *attributes):
        """An item of the same service and account, from another program."""
        reading, writing = os.pipe()
        os.write(writing, REPLAY)
        os.close(writing)
        done = self.session.run(["secret-tool", "store", f"--label={account}", *KEY, *attributes], stdin=reading)
        os.close(reading)
        self.assertEqual(done.returncode, 0, done)

    def labels_outside(self):
        found = self.session.run(["secret-tool", "search", "--all", *KEY])
        return sorted(line.removeprefix("label = ") for line in found.stdout.splitlines() if line.startswith("label = "))


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
    BUILD = sys.argv.pop(1)
    unittest.main(verbosity=2)
