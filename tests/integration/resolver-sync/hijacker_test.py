#!/usr/bin/env python3
"""The installed service and the real systemd-resolved, with another user on the machine who means harm.

usage: hijacker_test.py BUILD_DIR RESOLVED_DIR
"""

import os
import random
import sys
import unittest
from pathlib import Path

sys.path.insert(0, str(Path(__file__).resolve().parent))
sys.path.insert(0, str(Path(__file__).resolve().parents[2] / "support"))
import resolver  # noqa: E402
import resolver_sync_test  # noqa: E402

EMIT = ["/usr/bin/env", "DBUS_SYSTEM_BUS_ADDRESS=unix:path=/run/dbus/system_bus_socket", "/usr/bin/gdbus", "emit", "--system"]

# Answers every query with an address of its own, and with every text that it could be asked for.
HIJACKING = """
import socket, sys
address, reuse = sys.argv[1:]
host, _, port = address.partition(":")
listening = socket.socket(socket.AF_INET, socket.SOCK_DGRAM)
listening.setsockopt(socket.SOL_SOCKET, socket.SO_REUSEADDR, reuse == "reuse")
try:
    listening.bind((host, int(port or 53)))
except OSError as error:
    sys.exit(print(error.strerror, flush=True))
print("listens", flush=True)
while True:
    query, sender = listening.recvfrom(4096)
    answer = bytes.fromhex("c00c000100010000000a0004cb007142")
    question = query[12:query.index(0, 12) + 5]
    listening.sendto(query[:2] + bytes.fromhex("81800001000100000000") + question + answer, sender)
"""


class Hijacker(resolver_sync_test.OnAMachine):
    """Another user of the machine listens where the resolver asks, and answers what they like."""

    def setUp(self):
        super().setUp()
        self.start_service()
        self.select("Nimbus1")
        self.wait_for_answer("probe.nimbus.example", resolver.ANSWERS["Nimbus1"])
        self.address = self.machine.resolvectl("dns", "welcomer0").split()[-1]

    def hijack(self, reuse):
        """Whether the other user may listen, too, or why not; if so, they answer from then on."""
        process = self.start_as_another_user(HIJACKING, self.address, reuse)
        return process.stdout.readline().strip()

    def assert_answers_are_right(self, count):
        for number in range(count):
            name = f"{random.randrange(1 << 40)}.{number}.nimbus.example"
            self.assertEqual(resolver.ask(name), resolver.ANSWERS["Nimbus1"])

    def test_nobody_else_can_listen_beside_the_running_service(self):
        self.assertEqual(self.hijack("reuse"), "Permission denied")
        self.assert_answers_are_right(20)

    def test_nobody_else_can_listen_in_the_place_of_the_service(self):
        self.end_service()
        for reuse in ("reuse", "alone"):
            self.assertEqual(self.hijack(reuse), "Permission denied")
        self.start_service()
        self.wait_for_answer("again.nimbus.example", resolver.ANSWERS["Nimbus1"])
        self.assert_answers_are_right(20)

    def test_signals_of_another_user_neither_end_the_service_nor_lead_it_astray(self):
        lost = ["/org/freedesktop/DBus/Local", "org.freedesktop.DBus.Local.Disconnected"]
        appeared = ["/org/freedesktop/DBus", "org.freedesktop.DBus.NameOwnerChanged", "'org.freedesktop.resolve1'", "''", "':1.99'"]
        sent = 0
        for path, signal_name, *arguments in (lost, appeared):
            for number in range(12):  # one of them is the service's connection
                done = self.machine.run([*EMIT, "-d", f":1.{number}", "-o", path, "-s", signal_name, *arguments],
                                        user=True)  # the bus wants a user whom it finds
                sent += done.returncode == 0
        self.assertGreater(sent, 0, done.stderr)
        self.assertIsNone(self.service.poll())
        self.select("Nimbus2")
        self.wait_for_answer("later.nimbus.example", resolver.ANSWERS["Nimbus2"])

    def test_another_user_finds_no_secret_and_nothing_to_write(self):
        looking = """
import os
for process in sorted(os.listdir("/proc")):
    for name in ("environ", "mem", "fd", "cwd"):
        path = f"/proc/{process}/{name}"
        if not process.isdigit() or os.stat(f"/proc/{process}").st_uid == os.geteuid():
            continue
        try:
            os.listdir(path) if name == "fd" else os.readlink(path) if name == "cwd" else open(path).read(1)
            print("readable:", path)
        except (PermissionError, FileNotFoundError, ProcessLookupError):
            pass
    if process.isdigit() and int(process) != os.getpid():
        command = open(f"/proc/{process}/cmdline").read()
        if "txt-record" in command:
            print("told:", command)
for folder, folders, files in os.walk("/run/welcomer-resolver-sync"):
    for path in [folder, *(os.path.join(folder, name) for name in files)]:
        if os.access(path, os.W_OK):
            print("writable:", path)
print("looked", flush=True)
"""
        process = self.start_as_another_user(looking)
        self.assertEqual(process.stdout.read().splitlines(), ["looked"])
        [forwarder] = self.forwarders()
        opened = [os.readlink(each) for each in Path(f"/proc/{forwarder}/fd").iterdir()]
        self.assertFalse([each for each in opened if "welcomer-resolver-sync" in each or "inotify" in each], opened)

    def test_where_everybody_may_listen_the_resolver_is_not_led_to_somebody_else(self):
        self.end_service()
        Path("/proc/sys/net/ipv4/ip_unprivileged_port_start").write_text("0", encoding="ascii")
        self.addCleanup(Path("/proc/sys/net/ipv4/ip_unprivileged_port_start").write_text, "1024", encoding="ascii")
        self.assertEqual(self.hijack("alone"), "listens")
        self.start_service()
        failure = "Failed to route the resolver's overrides: /usr/sbin/dnsmasq does not answer"
        self.machine.wait_for(lambda: failure in self.records(), "the failure")
        self.assertIsNone(resolver.ask("hijacked.nimbus.example"))
        self.assertEqual(resolver_sync_test.links(), set())


if __name__ == "__main__":
    resolver.enter_namespaces()
    resolver_sync_test.OnAMachine.build, resolver_sync_test.OnAMachine.resolved = sys.argv[1:3]
    unittest.main(argv=[sys.argv[0], *sys.argv[3:]], verbosity=2)
