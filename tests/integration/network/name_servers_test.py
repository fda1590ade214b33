#!/usr/bin/env python3
"""The installed tool on a machine whose /etc/resolv.conf is the real systemd-resolved's, and which has no NetworkManager.

usage: name_servers_test.py BUILD_DIR RESOLVED_DIR
"""

import json
import os
import shutil
import signal
import subprocess
import sys
import tempfile
import unittest
from pathlib import Path

sys.path.insert(0, str(Path(__file__).resolve().parents[2] / "support"))
import resolver  # noqa: E402

TOOL = "/usr/local/bin/welcomer"
STUB = "/run/systemd/resolve/stub-resolv.conf"
# The address that the nameservers' network is reached from, and another one of the same network.
ADDRESS, OTHER_ADDRESS = "10.7.0.1", "10.7.0.9"
NOT_CONFIGURED = "The network could not be configured."


class NameServers(unittest.TestCase):
    build = resolved = None

    def setUp(self):
        self.folder = Path(tempfile.mkdtemp(prefix="name-servers-"))
        self.addCleanup(subprocess.run, ["ip", "link", "delete", resolver.LINK], check=False, capture_output=True)
        self.machine = resolver.ResolverMachine(self.folder / "machine", self.resolved)
        self.machine.install(self.build)
        self.file = self.machine.root / "etc/resolv.conf"
        self.file.unlink()
        self.file.symlink_to(f"..{STUB}")
        # The first Ethernet service with a cable is configured: the only one here.
        self.assertEqual([each["device"] for each in self.ports()], [resolver.LINK])

    def tearDown(self):
        self.machine.stop()
        shutil.rmtree(self.folder)

    def tool(self, *arguments):
        return self.machine.run([TOOL, *arguments])

    def ports(self):
        return json.loads(self.tool("--json", "network", "ports").stdout)["ports"]

    def apply(self, address, *servers):
        options = [part for server in servers for part in ("--dns", server)]
        return self.tool("--verbose", "network", "apply", "--choice", "lan", "--method", "Manual", "--ip", address,
                         "--subnet", "255.255.255.0", *options, "--warning-type", "3")

    def state(self):
        """What an application may change, but for what systemd-resolved knows."""
        listed = [subprocess.run(["ip", "-4", *what], check=True, stdout=subprocess.PIPE, text=True).stdout
                  for what in (["-o", "addr", "show"], ["route", "show", "table", "all"])]
        return [*listed, os.readlink(self.file), (self.machine.root / STUB.lstrip("/")).read_bytes()]

    def servers(self):
        shown = self.machine.resolvectl("dns", resolver.LINK)
        return shown.split(":", 1)[1].split()

    def check_refused(self, result, error):
        self.assertEqual((result.returncode, result.stdout), (1, ""), result)
        self.assertRegex(result.stderr, f"NCPreferencesApplyChanges failed error code {error}")
        self.assertIn(NOT_CONFIGURED, result.stderr)

    def test_name_servers_go_to_the_resolver_and_names_are_found(self):
        name = f"any.{resolver.OTHER_DOMAIN}"
        self.assertIsNone(resolver.ask(name))
        before = self.state()
        result = self.apply(ADDRESS, resolver.OTHER_NAMESERVER, "2001:db8::1", f"fe80::1%{resolver.LINK}")
        self.assertEqual((result.returncode, result.stdout), (0, "Done.\n"), result)
        self.assertEqual(self.servers(), [resolver.OTHER_NAMESERVER, "2001:db8::1", "fe80::1"])
        self.machine.wait_for(lambda: resolver.ask(name) == resolver.OTHER_ANSWER, "the nameserver's answer")
        self.assertEqual(self.state()[2], before[2])
        again = self.apply(ADDRESS, resolver.NAMESERVERS["Nimbus1"])
        self.assertEqual(again.returncode, 0, again)
        self.assertEqual(self.servers(), [resolver.NAMESERVERS["Nimbus1"]])

    def test_without_the_resolver_nothing_changes(self):
        self.machine.stop_resolver()
        before = self.state()
        self.check_refused(self.apply(OTHER_ADDRESS, resolver.OTHER_NAMESERVER), 11)
        self.assertEqual(self.state(), before)

    def test_a_resolver_that_is_silent_is_waited_for_and_nothing_changes(self):
        before = self.state()
        self.machine.resolved.send_signal(signal.SIGSTOP)
        try:
            self.check_refused(self.apply(OTHER_ADDRESS, resolver.OTHER_NAMESERVER), 15)
            self.assertEqual(self.state(), before)
        finally:
            self.machine.resolved.send_signal(signal.SIGCONT)

    def test_a_bus_that_is_silent_is_waited_for_and_nothing_changes(self):
        before = self.state()
        self.machine.bus.send_signal(signal.SIGSTOP)
        try:
            self.check_refused(self.apply(OTHER_ADDRESS, resolver.OTHER_NAMESERVER), 15)
            self.assertEqual(self.state(), before)
        finally:
            self.machine.bus.send_signal(signal.SIGCONT)

    def test_a_link_of_another_program_stays_an_error(self):
        self.file.unlink()
        self.file.symlink_to("../run/other/resolv.conf")
        (self.machine.root / "run/other").mkdir()
        shutil.copy(self.machine.root / STUB.lstrip("/"), self.machine.root / "run/other/resolv.conf")
        before = self.state()
        self.check_refused(self.apply(OTHER_ADDRESS, resolver.OTHER_NAMESERVER), 11)
        self.assertEqual(self.state(), before)
        self.assertNotIn(resolver.OTHER_NAMESERVER, self.servers())


if __name__ == "__main__":
    NameServers.build, NameServers.resolved = sys.argv[1:3]
    resolver.enter_namespaces()
    unittest.main(argv=sys.argv[:1] + sys.argv[3:], verbosity=2)
