"""The network commands on a real NetworkManager against its own tool, as whole processes."""

import json
import os
import subprocess
import sys
import time
from pathlib import Path

import figures

ROUNDS = 21
LINKS = 400


def measure(build, tables):
    # In a program of its own, since it puts itself into namespaces.
    environment = {**os.environ, "WELCOMER_BENCH_BUILD": str(build)}
    result = subprocess.run([sys.executable, __file__], check=True, stdout=subprocess.PIPE, text=True, env=environment)
    for arguments in json.loads(result.stdout):
        tables.ratio(*arguments)


def milliseconds(*commands):
    start = time.perf_counter()
    for command in commands:
        subprocess.run(command, check=True, stdin=subprocess.DEVNULL, stdout=subprocess.DEVNULL,
                       stderr=subprocess.DEVNULL)
    return (time.perf_counter() - start) * 1e3


class Commands:
    """The commands that are compared. Each configuration is another than the one before."""

    def __init__(self, tool):
        self._tool = str(tool)
        self._host = 10
        self._profile = None

    def _address(self):
        self._host = 10 + (self._host + 1) % 200
        return f"192.0.2.{self._host}"

    def _shown_address(self):
        shown = subprocess.run([self._tool, "network", "show", "--json"], check=True, capture_output=True, text=True)
        return json.loads(shown.stdout)["address"]

    def apply(self):
        address = self._address()
        taken = milliseconds([self._tool, "network", "apply", "--choice", "lan", "--method", "Manual", "--ip", address,
                              "--subnet", "255.255.255.0", "--router", "192.0.2.1", "--warning-type", "3"])
        if self._shown_address() != address:
            raise RuntimeError("the address is not there")
        return taken

    def peer_apply(self):
        address = self._address()
        if not self._profile:
            self._profile = subprocess.run(["nmcli", "-g", "GENERAL.CON-UUID", "device", "show", "eth7"], check=True,
                                           capture_output=True, text=True).stdout.strip()
        taken = milliseconds(["nmcli", "connection", "modify", self._profile, "ipv4.addresses", f"{address}/24"],
                             ["nmcli", "connection", "up", self._profile])
        if self._shown_address() != address:
            raise RuntimeError("the address is not there")
        return taken

    def show(self):
        return milliseconds([self._tool, "network", "show"])

    @staticmethod
    def peer_show():
        return milliseconds(["nmcli", "device", "show"])


def inside(build):
    import machine
    import network_manager

    machine.enter_namespaces()
    manager = network_manager.NetworkManager()
    try:
        manager.add_cable("eth7")
        commands = Commands(build / "bin" / "welcomer")
        rows = [("`welcomer network apply`, a manual address, NetworkManager",
                 "`nmcli connection modify` and `nmcli connection up`",
                 *figures.turn_about(commands.apply, commands.peer_apply, ROUNDS), 0.7, "ms"),
                ("`welcomer network show`, NetworkManager, one link", "`nmcli device show`",
                 *figures.turn_about(commands.show, commands.peer_show, ROUNDS), 1.0, "ms")]
        network_manager.shell(f"for n in $(seq {LINKS // 2 - 1}); do echo link add l$n type veth peer name p-l$n; done | "
                              "ip -batch -")
        network_manager.wait_for(lambda: network_manager.succeeds(
            f"test $(nmcli -g DEVICE device status | wc -l) -gt {LINKS}"), "all links")
        rows.append((f"`welcomer network show`, NetworkManager, {LINKS} links", "`nmcli device show`",
                     *figures.turn_about(commands.show, commands.peer_show, ROUNDS), 1.0, "ms"))
        json.dump(rows, sys.stdout)
    finally:
        manager.stop()


if __name__ == "__main__":
    sys.path.insert(0, str(Path(__file__).resolve().parents[2] / "tests" / "support"))
    inside(Path(os.environ["WELCOMER_BENCH_BUILD"]))
