"""The installed tool and agent beside services of the desktop that hang, have died, cannot be asked, or do not run.

A service that hangs is stopped (SIGSTOP) by its process id, a real gnome-keyring on a real session bus.
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


class SilentServices(unittest.TestCase):
    """A machine for each test, with a user in a session of a desktop without systemd."""

    build = None  # the build folder
    with_keyring = True

    def setUp(self):
        self.folder = Path(tempfile.mkdtemp(prefix="silent-services-"))
        self.addCleanup(shutil.rmtree, self.folder)
        self.machine = machine.Machine(self.folder / "machine", self.with_keyring)
        self.addCleanup(self.machine.stop)
        self.machine.install(self.build)
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
