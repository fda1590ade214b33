#!/usr/bin/env python3
"""The tool's commands about the network, on machines with real links, a real DHCP server and a real name server.

WELCOMER_BUILD is the build folder. Needs root, for the namespaces; run as anybody else, everything is skipped.
"""

import ipaddress
import json
import os
import plistlib
import re
import shutil
import sys
import unittest
from pathlib import Path

SOURCES = Path(__file__).resolve().parents[3]
sys.path[:0] = [str(SOURCES / "tests/integration/tool"), str(SOURCES / "tests/support")]

from network_space import NetworkSpace, make_etc  # noqa: E402
from tool_test import BUILD, PROGRAM, ToolTest  # noqa: E402

HEADER = (BUILD / "generated/WelcomerConfiguration.h").read_text(encoding="utf-8")
HOST = re.search(r'kPublicWebHost = "(.*)"', HEADER).group(1)
INTERNAL_PREFIX = re.search(r'kInternalAddressPrefix = "(.*)"', HEADER).group(1)
INTERNAL_ADDRESS = INTERNAL_PREFIX + ".".join(["7"] * (4 - INTERNAL_PREFIX.count(".")))
HOST_ADDRESS = "198.51.100.80"
MANUAL = ["--choice", "lan", "--method", "Manual", "--ip", "192.0.2.7", "--subnet", "255.255.255.0", "--router",
          "192.0.2.1"]


def mask(prefix_length):
    return str(ipaddress.ip_network(f"0.0.0.0/{prefix_length}").netmask)


@unittest.skipIf(os.geteuid() != 0, "needs root, to make network namespaces")
class SpaceTest(ToolTest):
    """A machine for the tool, "here", and one at the other end of its cables, "there"."""

    def setUp(self):
        super().setUp()
        self.etc = self.root / "etc"
        make_etc(self.etc)
        self.resolver = self.etc / "resolv.conf"
        self.stored = self.root / "var/lib/welcomer/network.plist"
        self.here = NetworkSpace(self.etc)
        self.addCleanup(self.here.close)
        self.there = NetworkSpace()
        self.addCleanup(self.there.close)
        self.leases = self.folder / "leases"

    def call(self, *arguments, before=()):
        return self.here.run(*before, PROGRAM, "--root", self.root, "network", *arguments)

    def asked(self, *arguments):
        return json.loads(self.succeeds(self.call("--json", *arguments)))

    def addresses(self, device):
        return [(each["local"], each["prefixlen"]) for link in self.here.ip("-4 addr show dev", device)
                for each in link["addr_info"]]

    def default_routes(self):
        return [(each.get("gateway"), each["dev"]) for each in self.here.ip("-4 route show default")]

    def name_server(self, *options):
        return self.there.start_name_server(self.folder, *options)


class CommandLine(SpaceTest):
    """Here too: a mistake must not reach the network outside."""

    def test_every_command_explains_itself(self):
        for command in ([], ["show"], ["ports"], ["probe"], ["apply"], ["register"]):
            text = self.succeeds(self.call(*command, "--help"))
            self.assertIn(" ".join(["Usage: welcomer network", *command]), text)

    def test_settings_that_make_no_sense_are_usage_errors(self):
        for arguments, reason in (
                ([], "--choice"), (["--choice", "LAN"], "--choice"), (["--choice", "lan", "--method", "dhcp"], "--method"),
                (["--choice", "lan", "--wait", "-1"], "--wait: a wait cannot be negative"),
                (["--choice", "lan", "--wait", "soon"], "--wait"),
                (["--choice", "lan", "--warning-type", "-1"], "--warning-type"),
                (["--choice", "lan", "--warning-type", "one"], "--warning-type"),
                (["--choice", "lan", "--method", "Manual", "--ip", "192.0.2.7"], "needs --ip and --subnet"),
                (["--choice", "lan", "--method", "Manual DHCP"], "needs --ip"), (["--choice", "lan", "more"], "more")):
            with self.subTest(arguments):
                self.fails(self.call("apply", *arguments), 2,
                           f"{reason}.*see welcomer network apply --help")
        self.fails(self.call(), 2, "a command is needed")


class Ports(SpaceTest):
    def test_a_machine_without_links(self):
        self.assertEqual(self.asked("ports"), {"ports": []})
        self.assertEqual(self.succeeds(self.call("ports")), "This machine has no network ports.\n")

    def test_the_ports_are_the_kernels_links_with_their_kinds(self):
        self.here.connect("eth7", self.there, "eth0")
        self.here.connect("eth8", self.there, "eth1")
        self.here.shell("ip link add br0 type bridge; ip link set eth8 master br0; "
                        "ip link add mac0 link eth7 type macvlan")
        kinds = {"bridge": "Bridge", "macvlan": "MACVLAN", "veth": "Ethernet"}
        links = [(each["ifname"], kinds[each["linkinfo"]["info_kind"]]) for each in self.here.ip("-d link")
                 if each["link_type"] == "ether"]
        self.assertEqual({device for device, _ in links}, {"eth7", "eth8", "br0", "mac0"})
        self.assertEqual(self.asked("ports"), {"ports": [{"device": device, "kind": kind, "name": f"{kind} ({device})"}
                                                         for device, kind in links]})
        lines = self.succeeds(self.call("ports")).splitlines()
        self.assertEqual(lines[0].split(), ["DEVICE", "KIND", "NAME"])
        self.assertEqual([line.split()[:2] for line in lines[1:]], [list(each) for each in links])

    def test_what_sys_shows_of_another_network_is_no_matter(self):
        self.here.connect("eth7", self.there, "eth0")
        other = self.root / "sys/class"  # as where it was mounted in a network with a wireless device of that name
        for folder in ("net/eth7/phy80211", "net/wlan0/phy80211", "ieee80211/phy0"):
            (other / folder).mkdir(parents=True)
        self.assertEqual(self.asked("ports"),
                         {"ports": [{"device": "eth7", "kind": "Ethernet", "name": "Ethernet (eth7)"}]})

    def test_every_port_gets_a_service_once(self):
        self.here.connect("eth7", self.there, "eth0")
        expected = {"services": ["Ethernet (eth7)"]}
        self.assertEqual(self.asked("register"), expected)
        before = self.stored.read_bytes()
        self.assertEqual(list(plistlib.loads(before)["Services"]), ["eth7"])
        self.assertEqual(self.asked("register"), expected)
        self.assertEqual(self.stored.read_bytes(), before)
        self.here.connect("eth8", self.there, "eth1")
        text = self.succeeds(self.call("register"))
        self.assertEqual(text, "The network services are stored:\n  Ethernet (eth7)\n  Ethernet (eth8)\n")

    def test_a_stored_configuration_without_its_set_is_waited_for_no_longer_than_there_are_ports(self):
        self.stored.parent.mkdir(parents=True)
        self.stored.write_bytes(plistlib.dumps({"CurrentSet": "missing", "Sets": {}, "Services": {}}))
        self.fails(self.call("register"), 1, "NCNetworkSetCopyCurrent failed")


class States(SpaceTest):
    """What is shown, logged and answered over a table of kernel states, against what `ip -json` tells of them."""

    ADDRESS = "ip addr add 192.0.2.7/24 dev eth7"
    ROUTE = "ip route add default via 192.0.2.1 dev eth7"
    # The state, the commands that make it, whether a cable is in.
    TABLE = [
        ("no link at all", None, False),
        ("no address", "", True),
        ("an address without a route", ADDRESS, True),
        ("an address and a route", f"{ADDRESS}; {ROUTE}", True),
        ("no carrier", f"{ADDRESS}; {ROUTE}; carrier off", False),
        ("a route without a router", f"{ADDRESS}; ip route add default dev eth7", True),
        ("a route without an address", "ip route add default dev eth7", True),
        ("a link-local address", "ip addr add 169.254.7.7/16 dev eth7; ip route add default dev eth7", True),
        ("several addresses", f"ip addr add 10.1.2.3/9 dev eth7; {ADDRESS}; ip addr add 192.0.2.8/24 dev eth7; {ROUTE}", True),
        ("two routes", f"{ADDRESS}; ip addr add 10.9.0.7/16 dev eth8; {ROUTE} metric 200; "
                       "ip route add default via 10.9.0.1 dev eth8 metric 100", True),
        ("two links of which the second has a cable", f"{ADDRESS}; {ROUTE}; ip link set eth8 up; carrier off", True),
        ("a macvlan", "ip link add mac0 link eth7 type macvlan; ip link set mac0 up; "
                      "ip addr add 192.0.2.9/26 dev mac0; ip route add default via 192.0.2.1", True),
        ("a bridge", "ip link add br0 type bridge; ip link set eth7 master br0; ip link set br0 up; "
                     "ip addr add 192.0.2.9/28 dev br0; ip route add default via 192.0.2.1", True),
        ("the maker's network", f"ip addr add {INTERNAL_ADDRESS}/24 dev eth7; ip route add default dev eth7", True),
    ]

    def expected(self):
        """What the kernel and the resolver's file tell, by way of `ip`."""
        routes = sorted(self.here.ip("-4 route show default"), key=lambda route: route.get("metric", 0))
        router, address, netmask = None, None, None
        if routes:
            router = routes[0].get("gateway")
            found = self.addresses(routes[0]["dev"])
            address, netmask = (found[0][0], mask(found[0][1])) if found else (None, None)
        return router, address, netmask

    def check(self, name, cable):
        router, address, netmask = self.expected()
        shown = {"method": None, "address": None, "subnetMask": None, "router": None, "dns": None, "searchDomains": None}
        if address and not address.startswith("169.254."):
            shown = {"method": None, "address": address, "subnetMask": netmask, "router": router,
                     "dns": ["192.0.2.53", "192.0.2.54"], "searchDomains": ["home.example"]}
        result = self.call("--json", "--verbose", "show")
        self.assertEqual(json.loads(result.stdout), shown)
        text = lambda value: value or "(null)"
        self.assertEqual(result.stderr.splitlines(),
                         ["--- WLCopyNetworkConfig ---", f"IP: {text(address)}", f"Mask: {text(netmask)}",
                          f"Router: {text(router)}", "DNS: 192.0.2.53", "Domain: home.example", "Config Method: (null)"])
        lines = self.succeeds(self.call("show")).splitlines()
        dash = lambda value: " ".join(value) if isinstance(value, list) else value or "-"
        self.assertEqual([line.split(None, 1 if line.startswith(("Method", "Address", "Router")) else 2)[-1]
                          for line in lines], [dash(value) for value in shown.values()])

        reachable = bool(self.here.ip("-4 route show default"))
        has_ethernet = bool([each for each in self.here.ip("link") if each["link_type"] == "ether"])
        self.assertEqual(self.asked("probe"), {
            "internetIsReachable": reachable, "isEthernetCablePluggedIn": cable,
            "hasUsableDynamicEthernetConfiguration": has_ethernet and address is None and reachable,
            "dirServiceNodesExist": False,
            "isOnCorvidInternalNetwork": bool(address and address.startswith(INTERNAL_PREFIX))})

    def test_what_is_shown_logged_and_answered_is_what_the_kernel_tells(self):
        self.resolver.write_text("domain home.example\nnameserver 192.0.2.53\nnameserver 192.0.2.54\n", encoding="ascii")
        (self.etc / "hosts").write_text(f"{HOST_ADDRESS} {HOST}\n", encoding="ascii")
        (self.root / "CorvidInternal").touch()
        for name, commands, cable in self.TABLE:
            with self.subTest(name):
                here = NetworkSpace(self.etc)
                there = NetworkSpace()
                try:
                    self.here = here
                    if commands is not None:
                        here.connect("eth7", there, "eth0")
                        here.connect("eth8", there, "eth1")
                        there.shell("ip link set eth1 down")
                        if "eth8" in commands:
                            there.shell("ip link set eth1 up")
                        here.shell(commands.replace("carrier off", "true"))
                        if "carrier off" in commands:
                            there.shell("ip link set eth0 down")
                    shutil.rmtree(self.stored.parent, ignore_errors=True)
                    self.check(name, cable)
                finally:
                    here.close()
                    there.close()

    def test_the_internal_network_needs_the_marker_too(self):
        self.here.connect("eth7", self.there, "eth0")
        self.here.shell(f"ip addr add {INTERNAL_ADDRESS}/24 dev eth7; ip route add default dev eth7")
        self.assertIs(self.asked("probe")["isOnCorvidInternalNetwork"], False)
        (self.root / "CorvidInternal").touch()
        self.assertIs(self.asked("probe")["isOnCorvidInternalNetwork"], True)
        self.assertIn("On the maker's own network:     yes\n", self.succeeds(self.call("probe")))

    def test_three_directories_that_load_are_enough_and_one_that_does_not_is_unreachable(self):
        for sources, expected in (("files compat hesiod", True), ("files compat absent", False), ("files hesiod", False)):
            (self.etc / "nsswitch.conf").write_text(f"passwd: {sources}\nhosts: files dns\n", encoding="ascii")
            self.assertIs(self.asked("probe")["dirServiceNodesExist"], expected, sources)


class Cable(SpaceTest):
    def cable(self):
        return self.asked("probe")["isEthernetCablePluggedIn"]

    def test_the_carrier_decides(self):
        self.here.connect("eth7", self.there, "eth0")
        self.assertTrue(self.cable())
        self.there.shell("ip link set eth0 down")
        self.assertFalse(self.cable())
        self.there.shell("ip link set eth0 up")
        self.assertTrue(self.cable())
        self.here.shell("ip link set eth7 down")
        self.assertFalse(self.cable())

    def test_a_link_whose_other_end_is_gone_is_no_cable(self):
        self.here.connect("eth7", self.there, "eth0")
        self.there.shell("ip link del eth0")
        self.assertFalse(self.cable())
        self.assertEqual(self.asked("ports"), {"ports": []})

    def test_of_two_links_the_one_with_a_cable_is_configured(self):
        self.here.connect("eth7", self.there, "eth0")
        self.here.connect("eth8", self.there, "eth1")
        self.there.shell("ip link set eth0 down")
        self.succeeds(self.call("apply", *MANUAL, "--warning-type", "3"))
        self.assertEqual(self.addresses("eth7"), [])
        self.assertEqual(self.addresses("eth8"), [("192.0.2.7", 24)])

    def test_a_bridge_with_a_cabled_port_is_configured_in_the_ports_place(self):
        self.here.connect("eth7", self.there, "eth0")
        self.here.shell("ip link add br0 type bridge; ip link set eth7 master br0; ip link set br0 up")
        self.succeeds(self.call("apply", *MANUAL, "--warning-type", "3"))
        self.assertEqual(self.addresses("eth7"), [])
        self.assertEqual(self.addresses("br0"), [("192.0.2.7", 24)])

    def test_a_stored_service_whose_device_became_a_port_makes_way_for_the_bridge(self):
        self.here.connect("eth7", self.there, "eth0")
        self.succeeds(self.call("apply", *MANUAL, "--warning-type", "3"))
        self.here.shell("ip addr flush dev eth7; ip link add br0 type bridge; ip link set eth7 master br0; "
                        "ip link set br0 up")
        self.succeeds(self.call("apply", *MANUAL, "--warning-type", "3"))
        self.assertEqual(self.addresses("eth7"), [])
        self.assertEqual(self.addresses("br0"), [("192.0.2.7", 24)])


if __name__ == "__main__":
    unittest.main()
