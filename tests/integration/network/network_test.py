#!/usr/bin/env python3
"""The tool's commands about the network, on machines with real links, a real DHCP server and a real name server.

WELCOMER_BUILD is the build folder. Needs root, for the namespaces; run as anybody else, everything is skipped.
"""

import ipaddress
import json
import os
import plistlib
import pty
import re
import shutil
import subprocess
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
NO_INTERNET = "The internet cannot be reached. Check the cable or the wireless network, and try again."
NOT_CONFIGURED = ("The network could not be configured. Check the settings, and that you may change them, "
                  "and try again.")
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
        self.program = self.folder / "welcomer"  # the build folder may be the superuser's alone
        shutil.copy(PROGRAM, self.program)
        shutil.copytree(BUILD / "tool-bundle", self.folder / "tool-bundle")
        (self.folder / "bin").mkdir()
        self.program = shutil.move(self.program, self.folder / "bin/welcomer")
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
