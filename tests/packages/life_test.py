#!/usr/bin/env python3
"""The life of the packages on a machine: installed, upgraded from the commit before, removed, purged.

usage: life_test.py MACHINE PACKAGES PACKAGES_BEFORE
    MACHINE   the minimal system that make_machine.py has made
    PACKAGES  the folder of the packages, and that of the commit before
"""

import hashlib
import os
import plistlib
import stat
import sys
import unittest
from pathlib import Path

sys.path.insert(0, str(Path(__file__).resolve().parents[1] / "support"))
import account_server  # noqa: E402
import booted_machine as booted  # noqa: E402

MACHINE, PACKAGES, PACKAGES_BEFORE = None, (), ()
LAUNCH, RESOLVER = "welcomer-launch-agents.service", "welcomer-resolver-sync.service"
NETWORK = "welcomer-restore-network.service"
ACCOUNTS = "welcomer-account-server.socket"
USER = "newcomer"
# What a machine itself writes while it runs, and what every package manager keeps for its own use.
OWN_BUSINESS = ("dev", "proc", "root", "run", "sys", "tmp", "mnt", "var/cache", "var/lib/dpkg", "var/lib/systemd", "var/log",
                "etc/machine-id")
# Accounts of services stay, as Debian has it: files that they own may be anywhere.
USERS_OF_SERVICES = {"etc/.pwd.lock"} | {f"etc/{name}{suffix}" for name in ("passwd", "group", "shadow", "gshadow")
                                         for suffix in ("", "-")}


def package_name(path):
    return path.name.split("_")[0]


def entry_of(path):
    """What is to be kept of a file: its kind, its mode, its owners and its content."""
    status = path.lstat()
    content = ""
    if stat.S_ISLNK(status.st_mode):
        content = os.readlink(path)
    elif stat.S_ISREG(status.st_mode):
        content = hashlib.sha256(path.read_bytes()).hexdigest()
    return status.st_mode, status.st_uid, status.st_gid, content


def files_of(root):
    """Every file of a machine but those that are its own business: by path."""
    found = {}
    for folder, names, files in os.walk(root):
        inside = os.path.relpath(folder, root)
        names[:] = [name for name in names if os.path.normpath(os.path.join(inside, name)) not in OWN_BUSINESS]
        for name in [*names, *files]:
            path = os.path.normpath(os.path.join(inside, name))
            if path not in OWN_BUSINESS:
                found[path] = entry_of(Path(folder) / name)
    return found


class LifeTest(unittest.TestCase):
    def setUp(self):
        self.machine = booted.BootedMachine(MACHINE)
        self.addCleanup(self.machine.shut_down)
        self.machine.boot()
        self.root = self.machine.root
        self.names = [package_name(path) for path in PACKAGES]

    def state(self, unit, *scope):
        asked = self.machine.run(["systemctl", *scope, "is-enabled", unit])
        return asked.stdout.strip()

    def is_active(self, unit):
        return self.machine.run(["systemctl", "is-active", unit]).stdout.strip() == "active"

    def assert_same_files(self, before, after):
        changed = {path for path in set(before) | set(after) if before.get(path) != after.get(path)}
        self.assertEqual(sorted(changed - USERS_OF_SERVICES), [])

    def use(self):
        """What is there once somebody has worked with it: in a home, and of the machine."""
        self.machine.add_user(USER)
        self.machine.must(["welcomer", "account", "add", "nimbus", "--password-fd", "0"], input="secret\n")
        library = self.root / "home" / USER / "Library/Preferences"
        self.machine.must(["mkdir", "-p", "-m", "700", f"/home/{USER}/Library/Preferences"], USER)
        (library / "com.corvid.welcomer.plist").write_bytes(plistlib.dumps({"Kept": True}))
        (self.root / "var/lib/welcomer/network.plist").write_bytes(plistlib.dumps({"Kept": True}))

    def files_in_use(self):
        files = files_of(self.root)
        return {path: entry for path, entry in files.items()
                if path.startswith(f"home/{USER}/") or path.startswith("var/lib/welcomer/")}

    def test_installed_and_purged_it_leaves_nothing(self):
        before = files_of(self.root)
        self.machine.install(PACKAGES)
        self.assertNotEqual(files_of(self.root), before)
        self.assertRegex(self.machine.must(["welcomer", "--version"]), r"\d+\.\d+\.\d+")
        self.machine.must(["dpkg", "--purge", *self.names])
        self.assert_same_files(before, files_of(self.root))
        self.assertFalse([path for path in (self.root / "var/lib/dpkg/info").iterdir() if "welcomer" in path.name])
        left = self.machine.must(["find", "/var/lib/systemd", "/run/systemd", "/etc/systemd", "-name", "*welcomer*"])
        self.assertEqual(left, "")

    def test_the_login_service_and_the_network_are_enabled_and_what_serves_others_is_not(self):
        self.machine.install(PACKAGES)
        self.assertEqual(self.state(LAUNCH, "--global"), "enabled")
        # At the next start, and not in the middle of an installation.
        self.assertEqual((self.state(NETWORK), self.is_active(NETWORK)), ("enabled", False))
        for unit in (RESOLVER, ACCOUNTS):
            self.assertEqual((self.state(unit), self.is_active(unit)), ("disabled", False))
        self.assertEqual(self.machine.must(["systemctl", "--failed", "--no-legend"]), "")

    def test_an_account_server_that_serves_does_so_after_an_upgrade_with_its_settings(self):
        self.machine.install(PACKAGES_BEFORE)
        self.use()
        authenticate = lambda: account_server.ask_on(
            self.machine, USER, "/v1/authenticate", account_server.body_of("nimbus", "secret"))
        settings, noted = "etc/welcomer/account-server.conf", "var/lib/welcomer-account-server/accepted-terms.plist"
        self.machine.write(settings, "UnknownUsers=told\n")
        self.machine.must(["systemctl", "enable", "--now", ACCOUNTS])
        self.assertEqual(authenticate()[0], 200)
        self.machine.write(noted, "{}")
        before = [entry_of(self.root / name) for name in (settings, noted)]
        process = self.machine.process_of("welcomer-account-server")
        self.machine.install(PACKAGES)
        self.assertEqual((self.state(ACCOUNTS), self.is_active(ACCOUNTS)), ("enabled", True))
        self.assertEqual(authenticate()[0], 200)
        self.assertNotEqual(self.machine.process_of("welcomer-account-server"), process)
        self.assertEqual(self.machine.must(["systemctl", "--failed", "--no-legend"]), "")

        self.machine.must(["dpkg", "--remove", *self.names])
        self.assertEqual([entry_of(self.root / name) for name in (settings, noted)], before)
        self.assertIsNone(self.machine.process_of("welcomer-account-server"))
        self.assertNotEqual(self.machine.run(["test", "-e", "/run/welcomer-account-server.sock"]).returncode, 0)
        self.machine.must(["dpkg", "--purge", *self.names])
        self.assertFalse((self.root / noted).parent.exists())

    def test_an_upgrade_keeps_what_is_in_use_and_what_the_administrator_has_decided(self):
        self.machine.install(PACKAGES_BEFORE)
        self.use()
        in_use = self.files_in_use()
        self.assertIn("var/lib/welcomer/nimbus-directory.plist", in_use)
        autostart = self.root / "etc/xdg/autostart/welcomer-launch-agents.desktop"
        autostart.write_text(autostart.read_text() + "Hidden=true\n")
        self.machine.must(["systemctl", "--global", "disable", LAUNCH])
        self.machine.must(["systemctl", "enable", RESOLVER])
        self.machine.install(PACKAGES)
        self.assertEqual(self.files_in_use(), in_use)
        self.assertTrue(autostart.read_text().endswith("Hidden=true\n"))
        self.assertEqual(self.state(LAUNCH, "--global"), "disabled")
        self.assertEqual(self.state(RESOLVER), "enabled")
        self.assertIn("nimbus", self.machine.must(["welcomer", "account", "list"]))

        self.machine.must(["dpkg", "--remove", *self.names])
        self.assertEqual(self.files_in_use(), in_use)
        self.assertTrue(autostart.exists())
        self.assertFalse((self.root / "usr/bin/welcomer").exists())

        # Purging takes what the machine has, and no user's own.
        self.machine.must(["dpkg", "--purge", *self.names])
        homes = {path: entry for path, entry in in_use.items() if path.startswith("home/")}
        self.assertTrue(homes)
        self.assertEqual(self.files_in_use(), homes)
        self.assertFalse(autostart.exists())


if __name__ == "__main__":
    booted.enter_namespaces()
    MACHINE = Path(sys.argv[1])
    PACKAGES, PACKAGES_BEFORE = map(booted.package_files, sys.argv[2:4])
    unittest.main(argv=sys.argv[:1], verbosity=2)
