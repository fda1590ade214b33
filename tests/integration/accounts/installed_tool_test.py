#!/usr/bin/env python3
"""The installed tool in a user's session with the real daemon of the online accounts, on a machine of its own.

usage: installed_tool_test.py BUILD_DIR
"""

import json
import os
import re
import shutil
import subprocess
import sys
import tempfile
import unittest
from pathlib import Path

sys.path.insert(0, str(Path(__file__).resolve().parents[2] / "support"))
sys.path.insert(0, str(Path(__file__).resolve().parents[1] / "accountserver"))
import machine  # noqa: E402
import process_memory  # noqa: E402
import tls_server  # noqa: E402

BUILD = None
TOOL = "/usr/local/bin/welcomer"
PASSWORD = "open sesame"
RUNTIME = f"/run/user/{machine.UID}"
SESSION = ["env", f"XDG_RUNTIME_DIR={RUNTIME}", f"DBUS_SESSION_BUS_ADDRESS=unix:path={RUNTIME}/bus",
           "GIO_USE_VFS=local", "GSETTINGS_BACKEND=memory", "GIO_USE_NETWORK_MONITOR=base"]
BUS = f"""<!DOCTYPE busconfig PUBLIC "-//freedesktop//DTD D-BUS Bus Configuration 1.0//EN"
 "http://www.freedesktop.org/standards/dbus/1.0/busconfig.dtd">
<busconfig><type>session</type><listen>unix:path={RUNTIME}/bus</listen><policy context="default">
<allow send_destination="*"/><allow receive_sender="*"/><allow own="*"/></policy></busconfig>
"""
NAME = "org.gnome.OnlineAccounts"
ACCOUNTS = "/org/gnome/OnlineAccounts"


class InstalledTool(unittest.TestCase):
    def setUp(self):
        self.folder = Path(tempfile.mkdtemp(prefix="accounts-tool-"))
        self.addCleanup(shutil.rmtree, self.folder)
        self.machine = machine.Machine(self.folder / "machine")
        self.addCleanup(self.machine.stop)
        self.machine.install(BUILD)
        for path in (RUNTIME, "/var/lib/welcomer"):  # the user stands for the server, too
            folder = self.machine.root / path[1:]
            folder.mkdir(parents=True)
            folder.chmod(0o700)
            os.chown(folder, machine.UID, machine.UID)
        (self.machine.root / "etc/bus.conf").write_text(BUS, encoding="utf-8")
        self.start_bus()

    def start_bus(self):
        socket = self.machine.root / RUNTIME[1:] / "bus"
        socket.unlink(missing_ok=True)
        self.daemons = [self.start("dbus-daemon", "--nofork", "--config-file=/etc/bus.conf")]
        self.machine.wait_for(socket.exists, "the bus")

    def kill_bus(self):
        """The bus dies, and what is on it ends."""
        for daemon in self.daemons:
            daemon.kill()
            daemon.wait()

    def start(self, *command, pass_fds=()):
        daemon = self.machine.start([*SESSION, *command], user=True, pass_fds=pass_fds)
        self.addCleanup(daemon.wait)
        self.addCleanup(daemon.kill)
        return daemon

    def start_daemons(self):
        reading, writing = os.pipe()
        os.write(writing, b"keyring")
        os.close(writing)
        self.daemons.append(self.start(
            "sh", "-c", f"exec gnome-keyring-daemon --foreground --unlock --components=secrets <&{reading}",
            pass_fds=[reading]))
        os.close(reading)
        self.daemons.append(self.start("/usr/libexec/goa-daemon"))
        for name in ("org.freedesktop.secrets", NAME):
            self.machine.wait_for(lambda: "true" in self.call("org.freedesktop.DBus", "/", "org.freedesktop.DBus."
                                                              "NameHasOwner", name), name)

    def call(self, name, path, method, *arguments):
        done = self.machine.run([*SESSION, "gdbus", "call", "--session", "-d", name, "-o", path, "-m", method,
                                 *arguments], user=True)
        self.assertEqual(done.returncode, 0, done.stderr)
        return done.stdout

    @staticmethod
    def with_password(run, *arguments, password=PASSWORD):
        reading, writing = os.pipe()
        os.write(writing, password.encode() + b"\n")
        os.close(writing)
        try:
            return run([*SESSION, TOOL, "--json", *arguments, "--password-fd", str(reading)], user=True, pass_fds=[reading])
        finally:
            os.close(reading)

    def tool(self, *arguments, password=None):
        """The tool's JSON answer."""
        if password:
            done = self.with_password(self.machine.run, *arguments, password=password)
        else:
            done = self.machine.run([*SESSION, TOOL, "--json", *arguments], user=True)
        self.assertEqual(done.returncode, 0, done.stderr + done.stdout)
        return json.loads(done.stdout)

    def enabled(self):
        return {entry["service"] for entry in self.tool("account", "services", "anna")["services"] if entry["enabled"]}

    def online_account(self):
        """The one account's path, and its interfaces beside the account itself."""
        objects = self.call(NAME, ACCOUNTS, "org.freedesktop.DBus.ObjectManager.GetManagedObjects")
        paths = set(re.findall(rf"'({ACCOUNTS}/Accounts/\w+)'", objects))
        self.assertEqual(len(paths), 1, objects)
        return paths.pop(), {name for name in ("Calendar", "Contacts", "Files") if f"{NAME}.{name}'" in objects}

    def test_signing_in_makes_the_online_account_and_enabling_switches_it(self):
        self.start_daemons()
        self.tool("account", "add", "anna", "--mail", "anna@nimbus.example", password=PASSWORD)
        self.tool("account", "sign-in", "anna", password=PASSWORD)
        path, features = self.online_account()
        self.assertEqual(features, set())
        self.assertIn(PASSWORD, self.call(NAME, path, f"{NAME}.PasswordBased.GetPassword", "password"))
        self.assertEqual(self.tool("account", "status")["loggedIn"], "anna")
        self.assertEqual(self.enabled(), set())

        self.tool("services", "enable", "--account", "anna", "--phase", "pre")
        self.assertEqual(self.online_account(), (path, {"Files"}))
        self.assertEqual(self.enabled(), {"photo-stream", "account-sync", "locator", "documents"})
        self.tool("services", "enable", "--account", "anna", "--phase", "post", "--select", "contacts", "--select",
                  "reminders")
        self.assertEqual(self.online_account(), (path, {"Files", "Contacts"}))
        self.assertEqual(self.enabled(),
                         {"photo-stream", "account-sync", "locator", "documents", "contacts", "reminders"})

        self.call(NAME, path, f"{NAME}.Account.Remove")
        self.assertIsNone(self.tool("account", "status")["loggedIn"])
        self.tool("account", "sign-in", "anna", password=PASSWORD)
        self.assertEqual(self.online_account()[1], {"Files", "Contacts"}, "what was enabled is on again")

    def serve(self):
        """An account server that knows anna, which the settings name."""
        authority = tls_server.Authority(self.folder / "authority")
        right = {"status": 0, "accountID": "anna"}
        server = tls_server.Server(lambda *_: tls_server.answer(200, right), certificate=authority.issue("right"))
        self.addCleanup(server.close)
        address = f"https://{tls_server.HOST}:{server.port}"
        etc = self.machine.root / "etc"
        (etc / "welcomer").mkdir(exist_ok=True)
        (etc / "authority.pem").write_bytes(authority.certificate.read_bytes())
        (etc / "hosts").write_text(f"127.0.0.1 localhost {tls_server.HOST}\n", encoding="ascii")
        (etc / "welcomer/platform.conf").write_text(
            f"AccountServer={address}\nAccountServerAuthority=/etc/authority.pem\n", encoding="ascii")
        return server, address

    def stored_accounts(self):
        return (self.machine.home / ".config/goa-1.0/accounts.conf").read_text(encoding="utf-8")

    def test_with_an_account_server_the_online_account_gets_the_same_user_and_server(self):
        self.start_daemons()
        server, address = self.serve()
        self.tool("account", "sign-in", "anna", password=PASSWORD)
        asked = [json.loads(body)["user"] for head, body in server.requests if head.startswith("POST /v1/authenticate")]
        self.assertEqual(asked, ["anna", "anna"])
        path, features = self.online_account()
        self.assertEqual(features, set())
        self.assertIn("'anna'", self.call(NAME, path, "org.freedesktop.DBus.Properties.Get", f"{NAME}.Account", "Identity"))
        self.assertIn(PASSWORD, self.call(NAME, path, f"{NAME}.PasswordBased.GetPassword", "password"))
        self.assertIn(f"Uri={address}/\n", self.stored_accounts())
        self.assertEqual(self.tool("account", "status")["loggedIn"], "anna")

    def test_an_administrator_may_name_another_server_for_the_online_accounts(self):
        self.start_daemons()
        self.serve()
        with open(self.machine.root / "etc/welcomer/platform.conf", "a", encoding="ascii") as settings:
            settings.write("OnlineAccountServer=https://cloud.example/\n")
        self.tool("account", "sign-in", "anna", password=PASSWORD)
        self.assertIn("Uri=https://cloud.example/\n", self.stored_accounts())

    def test_the_online_account_leaves_no_password_behind(self):
        self.start_daemons()
        self.serve()
        left = []
        process = self.with_password(lambda command, **options: self.machine.start(command, stdout=subprocess.DEVNULL, **options),
                                     "account", "sign-in", "anna")
        proc = self.machine.root / "proc"
        process.returncode = process_memory.watch_ends(
            proc, process.pid, lambda each: left.append(process_memory.count(proc, each, PASSWORD)))
        self.assertEqual((process.returncode, left), (0, [0]))
        self.assertIn(PASSWORD, self.call(NAME, self.online_account()[0], f"{NAME}.PasswordBased.GetPassword", "password"))

    def test_setting_up_without_a_word_makes_the_online_account_with_what_was_chosen(self):
        self.start_daemons()
        self.tool("account", "add", "anna", password=PASSWORD)
        answers = self.machine.home / "answers.plist"
        answers.write_text("{ Account = anna; Services = (documents, contacts); }", encoding="utf-8")
        self.tool("setup", "--answers", f"/home/{machine.USER}/answers.plist", "--bundle",
                  "/usr/local/share/welcomer/setup-bundle", password=PASSWORD)
        path, features = self.online_account()
        self.assertEqual(features, {"Files"}, "contacts wait for the login")
        self.assertIn("'anna'", self.call(NAME, path, "org.freedesktop.DBus.Properties.Get", f"{NAME}.Account",
                                          "Identity"))
        self.assertEqual(self.enabled(), {"documents"})

    def enable_while_the_bus_is_dead(self):
        """Documents: the account file has them, the online account does not."""
        self.start_daemons()
        self.tool("account", "add", "anna", password=PASSWORD)
        self.tool("account", "sign-in", "anna", password=PASSWORD)
        self.kill_bus()
        self.tool("services", "enable", "--account", "anna", "--phase", "pre", "--select", "documents")
        self.start_bus()
        self.start_daemons()
        self.assertEqual(self.online_account()[1], set())

    def test_a_switch_that_a_dead_bus_kept_from_being_set_is_set_with_the_next_services(self):
        self.enable_while_the_bus_is_dead()
        self.tool("services", "enable", "--account", "anna", "--phase", "post", "--select", "contacts")
        self.assertEqual(self.online_account()[1], {"Files", "Contacts"})
        # What the user does with the switches from then on stands.
        path = self.online_account()[0]
        self.call(NAME, path, "org.freedesktop.DBus.Properties.Set", f"{NAME}.Account", "FilesDisabled", "<true>")
        self.machine.wait_for(lambda: self.online_account()[1] == {"Contacts"}, "the switch")
        self.tool("services", "enable", "--account", "anna", "--phase", "post", "--select", "contacts")
        self.assertEqual(self.online_account()[1], {"Contacts"})

    def test_so_is_it_with_the_next_sign_in(self):
        self.enable_while_the_bus_is_dead()
        self.tool("account", "sign-in", "anna", password=PASSWORD)
        self.assertEqual(self.online_account()[1], {"Files"})

    def test_without_the_daemon_the_account_file_serves(self):
        self.tool("account", "add", "anna", password=PASSWORD)
        self.tool("account", "sign-in", "anna", password=PASSWORD)
        self.tool("services", "enable", "--account", "anna", "--phase", "pre")
        self.assertEqual(self.enabled(), {"photo-stream", "account-sync", "locator", "documents"})
        self.start_daemons()
        self.assertEqual(self.enabled(), {"photo-stream", "account-sync", "locator", "documents"})
        self.assertEqual(self.tool("account", "status")["loggedIn"], "anna")


if __name__ == "__main__":
    BUILD = sys.argv.pop(1) if len(sys.argv) > 1 else sys.exit(__doc__)
    sys.argv.insert(1, BUILD)
    machine.enter_namespaces()
    subprocess.run(["ip", "link", "set", "lo", "up"], check=True)
    del sys.argv[1]
    unittest.main(verbosity=2)
