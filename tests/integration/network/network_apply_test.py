#!/usr/bin/env python3
"""Applying a network configuration with the tool, and what it then reaches.

Run like network_test.py beside it.
"""

import json
import os
import plistlib
import pty
import re
import shutil
import subprocess
import unittest

from network_test import HOST, HOST_ADDRESS, MANUAL, SpaceTest
from tool_test import BUILD, PROGRAM  # noqa: E402, found by network_test

NO_INTERNET = "The internet cannot be reached. Check the cable or the wireless network, and try again."
NOT_CONFIGURED = ("The network could not be configured. Check the settings, and that you may change them, "
                  "and try again.")


class Applying(SpaceTest):
    def setUp(self):
        super().setUp()
        self.here.connect("eth7", self.there, "eth0")
        self.there.shell("ip addr add 192.0.2.1/24 dev eth0")

    def test_a_manual_configuration_is_in_the_kernel_and_a_ping_goes_through(self):
        self.assertEqual(self.succeeds(self.call("apply", *MANUAL, "--dns", " 192.0.2.1", "--dns", "0.0.0.0",
                                                 "--warning-type", "3")), "Done.\n")
        self.assertEqual(self.addresses("eth7"), [("192.0.2.7", 24)])
        self.assertEqual(self.default_routes(), [("192.0.2.1", "eth7")])
        self.assertEqual(self.resolver.read_text(encoding="ascii"), "# no servers\nnameserver 192.0.2.1\n")
        ping = self.here.run("ping", "-n", "-c", "1", "-w", "30", "192.0.2.1")
        self.assertEqual(ping.returncode, 0, ping)
        shown = self.asked("show")
        self.assertEqual(shown, {"method": "Manual", "address": "192.0.2.7", "subnetMask": "255.255.255.0",
                                 "router": "192.0.2.1", "dns": ["192.0.2.1"], "searchDomains": []})
        protocols = plistlib.loads(self.stored.read_bytes())["Services"]["eth7"]["Protocols"]
        self.assertEqual(protocols["IPv4"]["Configuration"],
                         {"ConfigMethod": "Manual", "Addresses": ["192.0.2.7"], "SubnetMasks": ["255.255.255.0"],
                          "Router": "192.0.2.1"})
        self.assertEqual(protocols["DNS"]["Configuration"], {"ServerAddresses": ["192.0.2.1"]})

    def test_it_takes_the_place_of_what_was_there_and_a_second_time_changes_nothing(self):
        self.here.shell("ip addr add 10.0.0.7/8 dev eth7; ip addr add 192.0.2.99/24 dev eth7; "
                        "ip route add default via 10.0.0.1")
        for _ in range(2):
            self.assertEqual(json.loads(self.succeeds(self.call("--json", "apply", *MANUAL, "--warning-type", "3"))),
                             {"applied": True})
            self.assertEqual(self.addresses("eth7"), [("192.0.2.7", 24)])
            self.assertEqual(self.default_routes(), [("192.0.2.1", "eth7")])

    def test_without_a_router_there_is_no_default_route(self):
        self.succeeds(self.call("apply", *MANUAL[:-2], "--warning-type", "3"))
        self.assertEqual(self.addresses("eth7"), [("192.0.2.7", 24)])
        self.assertEqual(self.default_routes(), [])

    INFORM = ["apply", "--choice", "lan", "--method", "Manual DHCP", "--ip", "192.0.2.8", "--warning-type", "3"]

    def test_manual_dhcp_takes_the_mask_and_the_router_that_are_there(self):
        self.succeeds(self.call("apply", *MANUAL[:-3], "255.255.255.128", "--router", "192.0.2.1", "--warning-type", "3"))
        self.succeeds(self.call(*self.INFORM))
        self.assertEqual(self.addresses("eth7"), [("192.0.2.8", 25)])
        self.assertEqual(self.default_routes(), [("192.0.2.1", "eth7")])

    def test_manual_dhcp_without_a_mask_has_the_network_of_its_class(self):
        self.succeeds(self.call(*self.INFORM))
        self.assertEqual(self.addresses("eth7"), [("192.0.2.8", 24)])
        self.assertEqual(self.default_routes(), [])

    def test_what_makes_no_sense_is_refused_and_not_stored(self):
        for option, value in (("--ip", "no address"), ("--ip", ""), ("--ip", "192.0.2.255"), ("--ip", "127.0.0.7"),
                              ("--ip", "224.0.0.7"), ("--subnet", "255.0.255.0"), ("--router", "192.0.2"),
                              ("--router", "10.9.9.9"), ("--dns", "no server")):
            with self.subTest(option=option, value=value):
                arguments = [*MANUAL, "--dns", "192.0.2.1"]
                arguments[arguments.index(option) + 1] = value
                before = self.stored.read_bytes() if self.stored.exists() else None
                result = self.call("--verbose", "apply", *arguments, "--warning-type", "3")
                self.assertEqual((result.returncode, result.stdout), (1, ""), result)
                self.assertRegex(result.stderr, "NCPreferencesCommitChanges failed error code 7 error .*makes no sense")
                self.assertIn(NOT_CONFIGURED, result.stderr)
                self.assertEqual(self.addresses("eth7"), [])
                after = self.stored.read_bytes()
                self.assertEqual(after, before or after)
                protocols = plistlib.loads(after)["Services"]["eth7"]["Protocols"]
                self.assertEqual(protocols, {"IPv4": {"Configuration": {"ConfigMethod": "DHCP"}}, "DNS": {}})
        self.succeeds(self.call("apply", *MANUAL, "--warning-type", "3"))
        self.assertEqual(self.addresses("eth7"), [("192.0.2.7", 24)])

    def state(self):
        """What an application may change."""
        return [self.here.shell("ip -4 -o addr show; ip -4 route show table all"), self.resolver.read_bytes()]

    def test_a_router_that_the_kernel_refuses_leaves_the_working_network_alone(self):
        # Which it does only when the address through which the router is reached has gone.
        self.here.shell("ip addr add 192.0.2.9/24 dev eth7; ip route add default via 192.0.2.1; "
                        "ip route add 198.51.100.0/24 via 192.0.2.2")
        before = self.state()
        outside = [*MANUAL[:5], "10.9.0.5", "--subnet", "255.255.255.255", "--router", "192.0.2.1"]
        self.fails(self.call("apply", *outside, "--dns", "192.0.2.1", "--warning-type", "3"), 1, NOT_CONFIGURED)
        self.assertEqual(self.state(), before)

    def test_name_servers_that_cannot_be_stored_leave_the_working_network_alone(self):
        self.here.shell("ip addr add 10.0.0.7/8 dev eth7; ip route add default via 10.0.0.1")
        before = self.here.shell("ip -4 -o addr show; ip -4 route show table all")
        self.resolver.unlink()
        self.resolver.mkdir()
        self.fails(self.call("apply", *MANUAL, "--dns", "192.0.2.1", "--warning-type", "3"), 1, NOT_CONFIGURED)
        self.assertEqual(self.here.shell("ip -4 -o addr show; ip -4 route show table all"), before)

    def test_another_links_default_route_stays(self):
        self.here.connect("eth8", self.there, "eth1")
        self.here.shell("ip addr add 198.51.100.7/24 dev eth8; ip route add default via 198.51.100.1 dev eth8")
        for _ in range(2):
            self.succeeds(self.call("apply", *MANUAL, "--warning-type", "3"))
            self.assertEqual([(each["dev"], each["gateway"], each.get("metric", 0))
                              for each in self.here.ip("-4 route show default")],
                             [("eth8", "198.51.100.1", 0), ("eth7", "192.0.2.1", 1)])

    def test_warning_type_zero_and_the_other_choices_configure_nothing(self):
        self.succeeds(self.call("apply", *MANUAL, "--warning-type", "0"))
        for choice in ("wifi", "no"):
            self.succeeds(self.call("apply", "--choice", choice, *MANUAL[2:], "--warning-type", "3"))
        self.assertEqual(self.addresses("eth7"), [])
        self.assertFalse(self.stored.exists())

    def test_warning_type_two_always_fails(self):
        self.fails(self.call("apply", *MANUAL, "--warning-type", "2"), 1, NO_INTERNET)
        self.assertEqual(self.addresses("eth7"), [("192.0.2.7", 24)])

    def test_a_resolvers_file_of_another_program_is_left_alone_and_an_error(self):
        self.resolver.unlink()
        (self.root / "run/other").mkdir(parents=True)
        other = self.root / "run/other/resolv.conf"
        other.write_text("nameserver 192.0.2.99\n", encoding="ascii")
        self.resolver.symlink_to("../run/other/resolv.conf")
        result = self.call("--verbose", "apply", *MANUAL, "--dns", "192.0.2.1", "--warning-type", "3")
        self.assertEqual(result.returncode, 1)
        self.assertIn("NCPreferencesApplyChanges failed error code 11 error the name servers are another program's", result.stderr)
        self.assertEqual(other.read_text(encoding="ascii"), "nameserver 192.0.2.99\n")


class DHCP(SpaceTest):
    """With each of the two clients, the other one hidden."""

    PROGRAMS = {"dhclient": ["/usr/sbin/dhclient"], "udhcpc": ["/usr/sbin/udhcpc", "/usr/bin/udhcpc"]}

    def hide(self, client):
        """Covers a program, so that this machine cannot start it."""
        for path in filter(os.path.exists, self.PROGRAMS[client]):
            covered = self.here.run("mount", "--bind", "/dev/null", os.path.realpath(path))
            self.assertEqual(covered.returncode, 0, covered)

    def setUp(self):
        super().setUp()
        self.here.connect("eth7", self.there, "eth0")
        self.there.shell("ip addr add 192.0.2.1/24 dev eth0")
        self.name_server("--dhcp-range=192.0.2.100,192.0.2.109,255.255.255.0,2m", "--dhcp-option=option:router,192.0.2.1",
                         "--dhcp-option=option:dns-server,192.0.2.1", "--domain=home.example", "--dhcp-authoritative",
                         f"--address=/{HOST}/{HOST_ADDRESS}", "--log-dhcp")

    def running(self, client):
        return self.here.run("pgrep", "-r", "D,R,S", "-x", client).stdout.split()

    def check(self, client):
        text = self.succeeds(self.call("apply", "--choice", "lan", "--method", "DHCP", "--dhcp-client-id", "my desk",
                                       "--wait", "60"))
        self.assertEqual(text, "Done.\n")
        shown = self.asked("show")
        self.assertRegex(shown["address"], r"\A192\.0\.2\.10\d\Z")
        self.assertEqual(self.addresses("eth7"), [(shown["address"], 24)])
        self.assertEqual(self.default_routes(), [("192.0.2.1", "eth7")])
        self.assertEqual({**shown, "address": None},
                         {"method": "DHCP", "address": None, "subnetMask": "255.255.255.0", "router": "192.0.2.1",
                          "dns": ["192.0.2.1"], "searchDomains": ["home.example"]})
        lease = self.leases.read_text(encoding="ascii").split()
        self.assertEqual(lease[2], shown["address"])
        self.assertEqual(bytes.fromhex(lease[4].replace(":", "")), b"my desk")
        self.assertEqual(len(self.running(client)), 1)

        # Once more: the client that runs makes way for another one.
        first = self.running(client)
        self.succeeds(self.call("apply", "--choice", "lan", "--method", "DHCP", "--wait", "60"))
        self.assertEqual(len(self.running(client)), 1)
        self.assertNotEqual(self.running(client), first)

        # And a manual configuration ends it.
        self.succeeds(self.call("apply", *MANUAL, "--warning-type", "3"))
        self.assertEqual(self.running(client), [])
        self.assertEqual(self.addresses("eth7"), [("192.0.2.7", 24)])
        self.assertEqual(self.default_routes(), [("192.0.2.1", "eth7")])

    def test_with_dhclient(self):
        self.hide("udhcpc")
        self.check("dhclient")

    def test_with_udhcpc(self):
        self.hide("dhclient")
        self.check("udhcpc")

    def test_without_a_client_the_store_says_so(self):
        self.hide("dhclient")
        self.hide("udhcpc")
        for method in ("DHCP", "BootP"):
            result = self.call("--verbose", "apply", "--choice", "lan", "--method", method)
            self.assertEqual((result.returncode, result.stdout), (1, ""), result)
            self.assertRegex(result.stderr, r"NCPreferencesApplyChanges failed error code 9 error .*DHCP client")
            self.assertIn(NOT_CONFIGURED, result.stderr)
            self.assertEqual(self.addresses("eth7"), [])


class Reachability(SpaceTest):
    def setUp(self):
        super().setUp()
        self.here.connect("eth7", self.there, "eth0")
        self.there.shell("ip addr add 192.0.2.1/24 dev eth0")
        self.here.shell("ip addr add 192.0.2.7/24 dev eth7")
        self.resolver.write_text("nameserver 192.0.2.1\noptions timeout:1 attempts:1\n", encoding="ascii")

    def route(self):
        self.here.shell("ip route add default via 192.0.2.1")

    def is_reachable(self):
        return self.asked("probe")["internetIsReachable"]

    def test_a_name_that_is_known_and_a_route(self):
        self.name_server(f"--address=/{HOST}/{HOST_ADDRESS}")
        self.route()
        self.assertTrue(self.is_reachable())
        self.assertEqual(self.succeeds(self.call("apply", "--choice", "no", "--wait", "0")), "Done.\n")

    def test_a_name_that_is_known_and_no_route(self):
        self.name_server(f"--address=/{HOST}/{HOST_ADDRESS}")
        self.assertFalse(self.is_reachable())

    def test_a_name_that_is_unknown(self):
        self.name_server()
        self.route()
        self.assertFalse(self.is_reachable())
        self.fails(self.call("apply", "--choice", "no", "--wait", "0"), 1, NO_INTERNET)

    def test_a_server_that_is_silent(self):
        self.there.start("python3", "-c", "import socket, sys, time\ns = socket.socket(type=socket.SOCK_DGRAM)\n"
                         "s.bind(('192.0.2.1', 53))\nprint('bound', file=sys.stderr, flush=True)\ntime.sleep(600)",
                         until="bound")
        self.route()
        self.assertFalse(self.is_reachable())

    def test_no_server(self):
        self.route()
        self.assertFalse(self.is_reachable())

    def test_the_wait_ends_when_the_route_comes(self):
        self.name_server(f"--address=/{HOST}/{HOST_ADDRESS}")
        waiting = subprocess.Popen(self.here.command(PROGRAM, "--root", self.root, "network", "apply", "--choice", "wifi",
                                                     "--wait", "60", "--verbose"),
                                   stdout=subprocess.PIPE, stderr=subprocess.PIPE, text=True, stdin=subprocess.DEVNULL)
        self.addCleanup(lambda: (waiting.stdout.close(), waiting.stderr.close()))
        while not re.search("Config Method", line := waiting.stderr.readline()):
            self.assertTrue(line)
        self.route()
        self.assertEqual(waiting.wait(timeout=100), 0)
        self.assertEqual(waiting.stdout.read(), "Done.\n")
        self.assertRegex(waiting.stderr.read(), r"<NetworkingManager>: Internet is reachable after \d+ seconds\n")


class OrdinaryUser(SpaceTest):
    def setUp(self):
        super().setUp()
        self.here.connect("eth7", self.there, "eth0")
        # The build folder may be the superuser's alone.
        for name in ("bin", "lib"):
            (self.folder / name).mkdir()
        self.program = shutil.copy(PROGRAM, self.folder / "bin/welcomer")
        shutil.copy(BUILD / "lib/libwelcomer.so.0", self.folder / "lib")
        shutil.copytree(BUILD / "tool-bundle", self.folder / "tool-bundle")
        self.folder.chmod(0o755)
        self.succeeds(self.call("apply", *MANUAL, "--warning-type", "3"))
        self.before = self.stored.read_bytes()

    def call_as_user(self, *arguments):
        return self.here.run("setpriv", "--reuid=nobody", "--regid=nogroup", "--clear-groups", self.program, "--root",
                             self.root, "network", *arguments)

    def check_unchanged(self):
        self.assertEqual(self.stored.read_bytes(), self.before)
        self.assertEqual(self.addresses("eth7"), [("192.0.2.7", 24)])
        self.assertEqual(self.default_routes(), [("192.0.2.1", "eth7")])
        self.assertEqual(self.resolver.read_text(encoding="ascii"), "# no servers\n")

    def test_reading_works(self):
        for command in ("show", "ports", "probe"):
            self.assertEqual(self.succeeds(self.call_as_user("--json", command)), self.succeeds(self.call("--json", command)))
        self.assertEqual(json.loads(self.call_as_user("--json", "show").stdout)["method"], "Manual")
        self.check_unchanged()

    def test_writing_is_refused_with_the_error_code(self):
        result = self.call_as_user("--verbose", "apply", *MANUAL[:5], "192.0.2.8", *MANUAL[6:], "--dns", "192.0.2.1")
        self.assertEqual((result.returncode, result.stdout), (1, ""), result)
        self.assertIn("NCPreferencesCommitChanges failed error code 1 error ", result.stderr)
        self.assertIn(NOT_CONFIGURED, result.stderr)
        self.check_unchanged()

    def test_registering_is_refused_when_there_is_something_new(self):
        self.succeeds(self.call_as_user("register"))
        self.here.connect("eth8", self.there, "eth1")
        self.fails(self.call_as_user("register"), 1, "NCPreferencesCommitChanges failed error code 1")
        self.check_unchanged()


class Terminal(SpaceTest):
    def test_waiting_shows_its_progress_on_a_terminal_and_takes_it_away(self):
        main, terminal = pty.openpty()
        self.addCleanup(os.close, main)
        process = subprocess.Popen(self.here.command(PROGRAM, "--root", self.root, "network", "apply", "--choice", "no",
                                                     "--wait", "2"),
                                   stdin=subprocess.DEVNULL, stdout=subprocess.PIPE, stderr=terminal, text=True)
        self.addCleanup(process.stdout.close)
        os.close(terminal)
        shown = ""
        while True:
            try:
                block = os.read(main, 4096)
            except OSError:  # the other end is closed
                break
            if not block:
                break
            shown += block.decode()
        self.assertEqual(process.wait(), 1)
        self.assertEqual(process.stdout.read(), "")
        self.assertRegex(shown, r"waiting for the network for at most 2 s \.\.\. \d+ s")
        self.assertRegex(shown, re.escape(NO_INTERNET) + r"\r\n\Z")


if __name__ == "__main__":
    unittest.main()
