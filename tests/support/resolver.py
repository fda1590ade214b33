"""systemd-resolved on a test's machine, with two test environments' nameservers in another network namespace."""

import os
import random
import socket
import struct
import subprocess

import machine

DOMAINS = ("configuration.nimbus.example", "services.nimbus.example", "nimbus.example", "online.example")
# The nameserver of an environment, and the address that it gives for every name in the cloud's domains.
NAMESERVERS = {"Nimbus1": "192.0.2.1", "Nimbus2": "192.0.2.2"}
ANSWERS = {"Nimbus1": "203.0.113.1", "Nimbus2": "203.0.113.2"}
# Another nameserver there, for one domain that has nothing to do with the cloud.
OTHER_NAMESERVER, OTHER_DOMAIN, OTHER_ANSWER = "192.0.2.77", "elsewhere.test", "203.0.113.77"
LINK = "wan0"
RESOLVED = "/opt/resolved"

USERS = """systemd-resolve:x:31001:31001::/:/usr/sbin/nologin
messagebus:x:31002:31002::/:/usr/sbin/nologin
dnsmasq:x:31003:31003::/:/usr/sbin/nologin
nobody:x:65534:65534::/:/usr/sbin/nologin
"""
GROUPS = """systemd-resolve:x:31001:
messagebus:x:31002:
dip:x:31003:
nogroup:x:65534:
"""


def enter_namespaces():
    """As machine.enter_namespaces; this program's own /proc shows them too."""
    machine.enter_namespaces()
    machine.mount("proc", "/proc", "proc")


class ResolverMachine(machine.Machine):
    """The machine, with its name resolution done by systemd-resolved from a folder."""

    def __init__(self, folder, resolved, with_resolver=True):
        super().__init__(folder)
        with open(self.root / "etc/passwd", "a", encoding="utf-8") as file:
            file.write(USERS)
        with open(self.root / "etc/group", "a", encoding="utf-8") as file:
            file.write(GROUPS)
        self._write("etc/nsswitch.conf", "passwd: files\ngroup: files\nhosts: files dns\n")
        self._write("etc/resolv.conf", "nameserver 127.0.0.53\n")
        inside = self.root / RESOLVED.lstrip("/")
        inside.mkdir(parents=True)
        machine.mount(resolved, inside, None, machine.MS_BIND)
        subprocess.run(["ip", "link", "set", "lo", "up"], check=True)
        self._start_bus()
        self.resolved = None
        if with_resolver:
            self.start_resolver()
        self._start_environments()

    def _start_bus(self):
        (self.root / "run/dbus").mkdir()
        self._write("etc/bus.conf", f"""<busconfig><type>system</type>
<listen>unix:path=/run/dbus/system_bus_socket</listen>
<policy context="default"><allow user="*"/><allow own="*"/><allow eavesdrop="true"/>
<allow send_destination="*" eavesdrop="true"/></policy>
</busconfig>
""")
        # Ready once it has told its address.
        self.bus = self.start(["/usr/bin/dbus-daemon", "--config-file=/etc/bus.conf", "--nofork", "--nopidfile",
                               "--print-address"], stdout=subprocess.PIPE, stderr=subprocess.DEVNULL)
        self._daemons.append(self.bus)
        self.bus.stdout.readline()
        self.bus.stdout.close()

    def start_resolver(self):
        folder = self.root / "run/systemd/resolve"
        folder.mkdir(parents=True, exist_ok=True)
        os.chown(folder, 31001, 31001)
        self.resolved = self.start([f"{RESOLVED}/lib/systemd/systemd-resolved"], stderr=subprocess.DEVNULL)
        self._daemons.append(self.resolved)
        self.wait_for(lambda: ask("localhost") == "127.0.0.1", "systemd-resolved")

    def stop_resolver(self):
        self._daemons.remove(self.resolved)
        self.resolved.terminate()
        self.resolved.wait(timeout=60)

    def resolvectl(self, *arguments):
        done = self.run([f"{RESOLVED}/usr/bin/resolvectl", *arguments])
        if done.returncode != 0:
            raise AssertionError(f"resolvectl failed: {done}")
        return done.stdout

    def _start_environments(self):
        self._daemons += start_environments()


def start_environments():
    """A namespace behind a link, and the nameservers in it: the processes, which are the caller's to end."""
    place = subprocess.Popen(["unshare", "--net", "sleep", "infinity"])
    daemons = [place]
    own = os.readlink("/proc/self/ns/net")
    machine.Machine.wait_for(lambda: os.readlink(f"/proc/{place.pid}/ns/net") != own, "the other network namespace")

    def there(*command):
        return ["nsenter", "--net", f"--target={place.pid}", *command]

    commands = [["ip", "link", "add", LINK, "type", "veth", "peer", "name", "environments"],
                ["ip", "link", "set", "environments", "netns", str(place.pid)],
                ["ip", "address", "add", "10.7.0.1/24", "dev", LINK], ["ip", "link", "set", LINK, "up"],
                there("ip", "link", "set", "lo", "up"), there("ip", "link", "set", "environments", "up"),
                there("ip", "address", "add", "10.7.0.2/24", "dev", "environments")]
    for address in (*NAMESERVERS.values(), OTHER_NAMESERVER):
        commands += [there("ip", "address", "add", f"{address}/32", "dev", "environments"),
                     ["ip", "route", "add", f"{address}/32", "via", "10.7.0.2"]]
    for command in commands:
        subprocess.run(command, check=True)
    served = [(NAMESERVERS[name], {domain: ANSWERS[name] for domain in DOMAINS}) for name in NAMESERVERS]
    served.append((OTHER_NAMESERVER, {OTHER_DOMAIN: OTHER_ANSWER}))
    for address, names in served:
        daemons.append(subprocess.Popen(
            there("dnsmasq", "--no-daemon", "--conf-file=/dev/null", "--no-resolv", "--no-hosts", "--pid-file=",
                  "--user=root", f"--listen-address={address}", "--bind-interfaces",
                  *(f"--address=/{domain}/{answer}" for domain, answer in names.items())),
            stderr=subprocess.DEVNULL))
        machine.Machine.wait_for(lambda: ask(f"x.{next(iter(names))}", address), f"the nameserver {address}")
    return daemons


def ask(name, server="127.0.0.53", timeout=2):
    """The IPv4 address that a nameserver gives for a name, or None."""
    number = random.randrange(65536)
    labels = b"".join(bytes([len(label)]) + label.encode() for label in name.split("."))
    query = struct.pack(">6H", number, 0x0100, 1, 0, 0, 0) + labels + b"\0" + struct.pack(">2H", 1, 1)
    with socket.socket(socket.AF_INET, socket.SOCK_DGRAM) as asking:
        asking.settimeout(timeout)
        try:
            asking.connect((server, 53))
            asking.send(query)
            answer = asking.recv(4096)
        except OSError:
            return None
    if len(answer) < 12 or struct.unpack(">H", answer[:2])[0] != number:
        return None
    status, count = answer[3] & 15, struct.unpack(">H", answer[6:8])[0]
    if status != 0 or count == 0:
        return None
    # The question comes back as it was; the first answer's name is a pointer to it, and its data stands behind ten bytes.
    kind, _, _, size = struct.unpack(">2HIH", answer[len(query) + 2:len(query) + 12])
    return socket.inet_ntoa(answer[len(query) + 12:len(query) + 16]) if (kind, size) == (1, 4) else None
