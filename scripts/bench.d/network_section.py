"""The network's commands as whole processes, in a network of the section's own."""

import json
import subprocess
import sys
import tempfile
from pathlib import Path

import figures

ROUNDS = 60
MANY_LINKS = (10, 100, 1000)

# What `network apply` of a manual configuration does to the network, by hand.
APPLY_SCRIPT = """
ip link set dev eth7 up
ip -4 addr flush dev eth7
ip addr add "$1/24" brd + dev eth7
ip route replace default via 192.0.2.1 dev eth7
"""
STATE_SCRIPT = "ip -json addr && ip -json route"


def measure(build, tables):
    # In a program of its own, which stays in its network.
    result = subprocess.run(["unshare", "--net", sys.executable, __file__, str(build)], check=True,
                            stdout=subprocess.PIPE, text=True)
    for kind, arguments in json.loads(result.stdout):
        getattr(tables, kind)(*arguments)


def shell(commands):
    subprocess.run(["sh", "-e", "-c", commands], check=True)


def pair(build, command, peer):
    """Medians of two commands run turn about, in ms."""
    result = subprocess.run([build / "bench" / "process-pair", str(ROUNDS), *map(str, command), "--", *peer], check=True,
                            stdout=subprocess.PIPE, text=True)
    times = json.loads(result.stdout)
    return times["ns"] / 1e6, times["peer_ns"] / 1e6


def pair_applying(tool, script):
    """The same of the tool and a script, which configure another address each time."""
    addresses = [f"192.0.2.{number}" for number in range(10, 14)]
    turns = {"ours": 0, "peer": 0}

    def configured(who, command):
        address = addresses[turns[who] % 2 + (2 if who == "peer" else 0)]
        turns[who] += 1
        milliseconds = figures.timed([*command(address)])
        found = json.loads(subprocess.run(["ip", "-json", "-4", "addr", "show", "dev", "eth7"], check=True,
                                          stdout=subprocess.PIPE).stdout)
        if [each["local"] for each in found[0]["addr_info"]] != [address]:
            raise RuntimeError(f"{who} did not configure {address}")
        return milliseconds

    apply = lambda address: [*tool, "apply", "--choice", "lan", "--method", "Manual", "--ip", address, "--subnet",
                             "255.255.255.0", "--router", "192.0.2.1", "--warning-type", "3"]
    return figures.turn_about(lambda: configured("ours", apply),
                              lambda: configured("peer", lambda address: ["sh", script, address]), ROUNDS)


def figures_of(build, folder):
    root = folder / "root"
    (root / "etc").mkdir(parents=True)
    (root / "etc" / "resolv.conf").write_text("nameserver 192.0.2.1\n", encoding="ascii")
    script = folder / "apply.sh"
    script.write_text(APPLY_SCRIPT, encoding="ascii")
    tool = [build / "bin" / "welcomer", "--root", root, "network"]
    # The first Ethernet service with a cable is configured: the other end belongs to a later one.
    shell("ip link set lo up; ip link add eth7 type veth peer name peer7; ip link add br0 type bridge; "
          "ip link set peer7 master br0; ip link set eth7 up; ip link set peer7 up")
    found = []

    def ratio(what, against, times):
        found.append(("ratio", (what, against, *times, 1.0, "ms")))

    ratio("`network apply` of a manual address, whole process", "a shell script of the same `ip` commands",
          pair_applying(tool, script))
    ratio("`network show`, whole process", "`ip -json addr` and `ip -json route`",
          pair(build, [*tool, "show"], ["sh", "-c", STATE_SCRIPT]))

    rows, count = [], 2
    for links in MANY_LINKS:
        lines = [f"link add v{number} type veth peer name w{number}\naddr add 10.{number // 250}.{number % 250}.1/24 "
                 f"dev v{number}\n" for number in range(count // 2, links // 2)]
        subprocess.run(["ip", "-batch", "-"], input="".join(lines), text=True, check=True)
        count = links
        shown, addresses = pair(build, [*tool, "show"], ["ip", "-json", "addr"])
        ports, _ = pair(build, [*tool, "--json", "ports"], ["ip", "-json", "addr"])
        rows.append((links, shown, ports, 1e3 * ports / links, addresses))
    ratio("`network show` with 1,000 links", "`ip -json addr`", (shown, addresses))
    ratio("`network ports` with 1,000 links", "`ip -json addr`", (ports, addresses))
    found.append(("growth", ("Growth of reading the network's state",
                             ("links", "`network show`, ms", "`network ports`, ms", "per link, us",
                              "`ip -json addr`, ms"), rows)))
    return found


if __name__ == "__main__":
    with tempfile.TemporaryDirectory() as temporary:
        json.dump(figures_of(Path(sys.argv[1]), Path(temporary)), sys.stdout)
