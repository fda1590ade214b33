#!/usr/bin/env python3
"""The installed unit that puts the stored network configuration to use when a machine starts.

usage: restore_network_test.py MACHINE PACKAGES
    MACHINE   the minimal system that make_machine.py has made
    PACKAGES  the folder of the packages that are installed on it
"""

import plistlib
import sys
import unittest
from pathlib import Path

sys.path.insert(0, str(Path(__file__).resolve().parents[1] / "support"))
import booted_machine as booted  # noqa: E402

UNIT = "welcomer-restore-network.service"
PROGRAM = "/usr/libexec/welcomer-restore-network"
# The machine's network devices, which it finds when it starts.
DEVICES = """[Unit]
DefaultDependencies=no
Before=network-pre.target

[Service]
Type=oneshot
RemainAfterExit=yes
ExecStart=ip link add eth7 type veth peer name p-eth7
ExecStart=ip link add eth8 type veth peer name p-eth8
ExecStart=ip link set p-eth7 up
ExecStart=ip link set p-eth8 up

[Install]
WantedBy=sysinit.target
"""
# Whoever has the name is it, as far as anybody else can tell.
NAME = "org.freedesktop.NetworkManager"
NAME_OWNER = f"""[Unit]
After=dbus.socket
Before={UNIT}
Requires=dbus.socket

[Service]
Type=dbus
BusName={NAME}
ExecStart=/usr/bin/python3 -c 'import gi; from gi.repository import Gio, GLib; \
Gio.bus_own_name(Gio.BusType.SYSTEM, "{NAME}", 0, None, None, None); GLib.MainLoop().run()'

[Install]
WantedBy=multi-user.target
"""
# Takes connections, and answers none: accepted ones wait in the kernel.
SILENT_BUS = """import socket, sys, time
listener = socket.socket(socket.AF_UNIX)
listener.bind(sys.argv[1])
listener.listen()
time.sleep(300)
"""
NAME_POLICY = f'<busconfig><policy user="root"><allow own="{NAME}"/></policy></busconfig>'


def service(device, address=None, enabled=True, router=None, dns=None):
    configuration = {"ConfigMethod": "Manual", "Addresses": [address], "SubnetMasks": ["255.255.255.0"]}
    if router:
        configuration["Router"] = router
    protocols = {"IPv4": {"Configuration": configuration} if address else {}, "DNS": {}}
    if dns:
        protocols["DNS"] = {"Configuration": {"ServerAddresses": dns}}
    return {"Name": device, "Device": device, "Enabled": enabled, "Protocols": protocols}


class RestoreNetwork(unittest.TestCase):
    base, packages = None, ()

    @classmethod
    def setUpClass(cls):
        cls.machine = booted.BootedMachine(cls.base)
        cls.addClassCleanup(cls.machine.shut_down)
        cls.machine.boot()
        cls.machine.install(cls.packages)
        cls.machine.write("etc/systemd/system/devices.service", DEVICES)
        cls.machine.must(["systemctl", "enable", "devices.service"])

    def setUp(self):
        self.resolver = self.machine.root / "etc/resolv.conf"
        self.resolver.write_text("# of the machine\n", encoding="ascii")

    def boot(self, *services):
        stored = self.machine.root / "var/lib/welcomer/network.plist"
        stored.parent.mkdir(exist_ok=True)
        stored.unlink(missing_ok=True)
        if services:
            stored.write_bytes(plistlib.dumps({
                "CurrentSet": "automatic", "Sets": {"automatic": {"Services": [each["Device"] for each in services]}},
                "Services": {each["Device"]: each for each in services}}))
        self.earlier = len(self.all_records())  # the kernel's boot stays the same one, to the journal too
        self.machine.reboot()

    def ip(self, *arguments):
        return self.machine.must(["ip", "-4", *arguments])

    def state(self):
        return self.machine.must(["systemctl", "show", UNIT, "--property=ActiveState,Result,ConditionResult"]).splitlines()

    def all_records(self):
        return self.machine.journal("--identifier=welcomer-restore-network")

    def records(self):
        return self.all_records()[self.earlier:]

    def test_what_is_stored_and_enabled_is_in_use_after_the_boot(self):
        self.boot(service("eth7", "192.0.2.7", router="192.0.2.1", dns=["192.0.2.53"]),
                  service("eth8", "198.51.100.8", enabled=False))
        self.assertEqual(sorted(self.state()), ["ActiveState=active", "ConditionResult=yes", "Result=success"],
                         self.machine.journal(f"--unit={UNIT}"))
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
        self.machine.write("etc/dbus-1/system.d/name.conf", NAME_POLICY)
        self.machine.write("etc/systemd/system/name.service", NAME_OWNER)
        self.machine.must(["systemctl", "enable", "name.service"])
        self.addCleanup(self.machine.must, ["systemctl", "disable", "name.service"])
        self.boot(service("eth7", "192.0.2.7"))
        self.assertEqual(self.machine.run(["systemctl", "is-active", "name.service"]).stdout.strip(), "active")
        self.assertEqual(sorted(self.state()), ["ActiveState=active", "ConditionResult=yes", "Result=success"])
        self.assertEqual(self.ip("address", "show", "dev", "eth7"), "")

    def test_a_bus_that_answers_nobody_keeps_nothing_from_being_used(self):
        self.boot(service("eth7", "192.0.2.7"))
        self.ip("address", "flush", "dev", "eth7")
        self.machine.must(["systemd-run", "--unit=silent-bus", "python3", "-c", SILENT_BUS, "/run/silent-bus"])
        self.addCleanup(self.machine.must, ["systemctl", "stop", "silent-bus"])
        booted.wait_for(lambda: "/run/silent-bus" in self.machine.must(["ss", "--listening", "--unix"]), "the bus")
        done = self.machine.run([PROGRAM], environment={"DBUS_SYSTEM_BUS_ADDRESS": "unix:path=/run/silent-bus"},
                                timeout=60)
        self.assertEqual((done.returncode, done.stdout, done.stderr), (0, "", ""))
        self.assertIn("inet 192.0.2.7/24 ", self.ip("address", "show", "dev", "eth7"))

    def test_another_argument_is_a_mistake(self):
        refused = self.machine.run([PROGRAM, "now"])
        self.assertEqual((refused.returncode, refused.stdout), (2, ""))
        self.assertIn("usage:", refused.stderr)


if __name__ == "__main__":
    booted.enter_namespaces()
    RestoreNetwork.base, RestoreNetwork.packages = sys.argv[1], booted.package_files(sys.argv[2])
    unittest.main(argv=sys.argv[:1], verbosity=2)
