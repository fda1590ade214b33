#!/usr/bin/env python3
"""The installed unit that puts the stored network configuration to use when a machine starts.

usage: restore_network_test.py BUILD_DIR
"""

import plistlib
import shutil
import subprocess
import sys
import tempfile
import unittest
from pathlib import Path

sys.path.insert(0, str(Path(__file__).resolve().parents[2] / "support"))
import booted  # noqa: E402
import machine  # noqa: E402

UNIT = "welcomer-restore-network.service"
PROGRAM = "/usr/local/libexec/welcomer-restore-network"


def service(device, address=None, enabled=True, router=None, dns=None):
    configuration = {"ConfigMethod": "Manual", "Addresses": [address], "SubnetMasks": ["255.255.255.0"]}
    if router:
        configuration["Router"] = router
    protocols = {"IPv4": {"Configuration": configuration} if address else {}, "DNS": {}}
    if dns:
        protocols["DNS"] = {"Configuration": {"ServerAddresses": dns}}
    return {"Name": device, "Device": device, "Enabled": enabled, "Protocols": protocols}


class RestoreNetwork(unittest.TestCase):
    build = None

    def setUp(self):
        self.folder = Path(tempfile.mkdtemp(prefix="restore-network-"))
        self.addCleanup(shutil.rmtree, self.folder)
        self.machine = booted.BootedMachine(self.folder / "machine")
        self.addCleanup(self.machine.stop)
        self.machine.install(self.build)
        self.resolver = self.machine.root / "etc/resolv.conf"
        self.resolver.write_text("# of the machine\n", encoding="ascii")
        for device in ("eth7", "eth8"):
            subprocess.run(["ip", "link", "add", device, "type", "veth", "peer", "name", f"p-{device}"], check=True)
            self.addCleanup(subprocess.run, ["ip", "link", "delete", device], check=False, capture_output=True)
            subprocess.run(["ip", "link", "set", f"p-{device}", "up"], check=True)

    def boot(self, *services):
        folder = self.machine.root / "var/lib/welcomer"
        folder.mkdir(parents=True)
        if services:
            (folder / "network.plist").write_bytes(plistlib.dumps({
                "CurrentSet": "automatic", "Sets": {"automatic": {"Services": [each["Device"] for each in services]}},
                "Services": {each["Device"]: each for each in services}}))
        done = self.machine.run(["/usr/bin/systemctl", "preset", UNIT])
        self.assertEqual(done.returncode, 0, done)
        self.machine.boot()

    def ip(self, *arguments):
        return subprocess.run(["ip", "-4", *arguments], check=True, capture_output=True, text=True).stdout

    def state(self):
        return self.machine.systemctl("show", UNIT, "--property=ActiveState,Result,ConditionResult").stdout.splitlines()

    def records(self):
        return self.machine.journal("-t", "welcomer-restore-network")

    def test_what_is_stored_and_enabled_is_in_use_after_the_boot(self):
        self.boot(service("eth7", "192.0.2.7", router="192.0.2.1", dns=["192.0.2.53"]),
                  service("eth8", "198.51.100.8", enabled=False))
        self.assertEqual(sorted(self.state()), ["ActiveState=active", "ConditionResult=yes", "Result=success"],
                         self.machine.journal("-u", UNIT))
        self.assertIn("inet 192.0.2.7/24 ", self.ip("address", "show", "dev", "eth7"))
        self.assertIn("default via 192.0.2.1 dev eth7", self.ip("route"))
        self.assertIn("nameserver 192.0.2.53\n", self.resolver.read_text())
        self.assertEqual(self.ip("address", "show", "dev", "eth8"), "")
        self.assertEqual(self.records(), [])

    def test_a_service_that_cannot_be_used_costs_one_line_and_no_other_service(self):
        self.boot(service("eth9", "203.0.113.9"), service("eth8", "198.51.100.0"), service("eth7", "192.0.2.7"))
        self.assertEqual(sorted(self.state()), ["ActiveState=failed", "ConditionResult=yes", "Result=exit-code"])
        self.assertIn("inet 192.0.2.7/24 ", self.ip("address", "show", "dev", "eth7"))
        self.assertEqual(self.ip("address", "show", "dev", "eth8"), "")
        first, second = self.records()
        self.assertRegex(first, "^Failed to use the stored network configuration of eth9: ")
        self.assertRegex(second, "^Failed to use the stored network configuration of eth8: .*198.51.100.0")

    def test_a_machine_without_a_stored_configuration_is_left_alone(self):
        self.boot()
        self.assertIn("ConditionResult=no", self.state())
        self.assertEqual(self.ip("address", "show", "dev", "eth7"), "")

    def test_where_networkmanager_runs_it_is_left_to_that(self):
        # Whoever has the name is it, as far as anybody else can tell.
        (self.machine.root / "usr/local/lib/systemd/system/name.service").write_text(
            "[Unit]\nAfter=dbus.socket\nBefore=welcomer-restore-network.service\nRequires=dbus.socket\n"
            "[Service]\nType=dbus\nBusName=org.freedesktop.NetworkManager\n"
            "ExecStart=/usr/bin/python3 -c 'import gi; from gi.repository import Gio, GLib; "
            "Gio.bus_own_name(Gio.BusType.SYSTEM, \"org.freedesktop.NetworkManager\", 0, None, None, None); "
            "GLib.MainLoop().run()'\n[Install]\nWantedBy=multi-user.target\n", encoding="ascii")
        self.machine.run(["/usr/bin/systemctl", "enable", "name.service"])
        self.boot(service("eth7", "192.0.2.7"))
        self.assertEqual(self.machine.systemctl("is-active", "name.service", check=False).stdout.strip(), "active")
        self.assertEqual(sorted(self.state()), ["ActiveState=active", "ConditionResult=yes", "Result=success"])
        self.assertEqual(self.ip("address", "show", "dev", "eth7"), "")

    def test_another_argument_is_a_mistake(self):
        refused = self.machine.run([PROGRAM, "now"])
        self.assertEqual((refused.returncode, refused.stdout), (2, ""))
        self.assertIn("usage:", refused.stderr)


if __name__ == "__main__":
    machine.enter_namespaces()
    machine.mount("proc", "/proc", "proc")
    RestoreNetwork.build = sys.argv.pop(1)
    unittest.main(verbosity=2)
