"""Hosts of a test's own on one network: each has its addresses, its /dev, /run and /var to itself, and its system log.

The program that makes them has put itself into namespaces of its own first (machine.enter_namespaces): whatever is
mounted and whatever runs ends with it.
"""

import concurrent.futures
import os
import shutil
import socket
import subprocess
import threading
from pathlib import Path

import machine

BRIDGE = "hosts"
# What programs on a host look into below /etc.
OF_THIS_MACHINE = ("passwd", "group", "ld.so.cache", "ssl/openssl.cnf")
MARK = b"so far"  # stands behind what a log had before
OWN_FOLDERS = {"dev": "/dev", "run": "/run", "lib": "/var/lib", "log": "/var/log", "certificates": "/etc/ssl/company"}


def install(build, folder, *components):
    """Installs components of a build tree, and gives where they are: each host has that as /usr/local."""
    for component in components:
        subprocess.run(["cmake", "--install", str(build), "--component", component], check=True, stdout=subprocess.DEVNULL,
                       env={**os.environ, "DESTDIR": str(folder)})
    return Path(folder) / "usr/local"


def ip(*commands):
    subprocess.run(["ip", "-batch", "-"], input="\n".join(commands), text=True, check=True)


class Network:
    """A bridge, and what its hosts have in common: /etc, and the installed programs."""

    def __init__(self, folder, installed, addresses):
        """addresses: of the hosts, by their full names."""
        self.folder, self.installed, self.addresses = Path(folder), installed, addresses
        ip("link set lo up", f"link add {BRIDGE} type bridge", f"link set {BRIDGE} up")
        self.etc = self.folder / "etc"
        for name in OF_THIS_MACHINE:
            outside, inside = Path("/etc") / name, self.etc / name
            inside.parent.mkdir(parents=True, exist_ok=True)
            if outside.is_dir():
                shutil.copytree(outside, inside)
            elif outside.exists():
                shutil.copy(outside, inside)
        (self.etc / "ssl/company").mkdir(parents=True)
        self.write("/etc/hosts", "127.0.0.1 localhost\n" + "".join(
            f"{address} {name} {name.partition('.')[0]}\n" for name, address in addresses.items()))
        self.write("/etc/nsswitch.conf", "passwd: files\ngroup: files\nhosts: files\n")
        self._hosts = []

    def write(self, path, text):
        """Writes a file of /etc, the same for all hosts."""
        assert path.startswith("/etc/"), path
        inside = self.etc / path.removeprefix("/etc/")
        inside.parent.mkdir(parents=True, exist_ok=True)
        inside.unlink(missing_ok=True)
        inside.write_text(text, encoding="utf-8")

    def add(self, name, address=None):
        self._hosts.append(Host(self, name, address or self.addresses[name], len(self._hosts)))
        return self._hosts[-1]

    def close(self):
        for host in self._hosts:
            host.close()
        ip(f"link delete {BRIDGE}")


class Host:
    def __init__(self, network, name, address, number):
        self.name, self.address = name, address
        self.root = network.folder / name
        self.root.mkdir()
        machine.mount("tmpfs", self.root, "tmpfs")
        for folder in OWN_FOLDERS:
            (self.root / folder).mkdir()
        for node, minor in (("null", 3), ("zero", 5), ("random", 8), ("urandom", 9)):
            os.mknod(self.root / "dev" / node, 0o020666, os.makedev(1, minor))
            (self.root / "dev" / node).chmod(0o666)
        self.certificates = self.root / "certificates"
        self._lines = []  # of its system log, as they came
        self._has_read = threading.Event()
        self._log = socket.socket(socket.AF_UNIX, socket.SOCK_DGRAM)
        self._log.bind(str(self.root / "dev/log"))
        (self.root / "dev/log").chmod(0o666)
        self._reader = threading.Thread(target=self._read_log, daemon=True)
        self._reader.start()
        mounts = {network.etc: "/etc", network.installed: "/usr/local",
                  **{self.root / folder: place for folder, place in OWN_FOLDERS.items()}}
        commands = [*(f"mount --bind '{source}' '{place}'" for source, place in mounts.items()), "echo mounted", "read cable",
                    "ip link set lo up", f"ip address add {address}/24 dev eth0", "ip link set eth0 up", "echo ready", "exec cat"]
        self._holder = subprocess.Popen(["unshare", "--net", "--mount", "sh", "-e", "-c", "\n".join(commands)],
                                        stdin=subprocess.PIPE, stdout=subprocess.PIPE, text=True)
        self._wait_for("mounted")
        self.process, self.cable = self._holder.pid, f"host{number}"
        ip(f"link add {self.cable} master {BRIDGE} type veth peer name eth0 netns {self.process}", f"link set {self.cable} up")
        self._holder.stdin.write("plugged in\n")
        self._holder.stdin.flush()
        self._wait_for("ready")

    def _wait_for(self, word):
        if self._holder.stdout.readline() != f"{word}\n":
            raise RuntimeError(f"the namespaces of {self.name} could not be made")

    def _read_log(self):
        while line := self._log.recv(65536):
            if line == MARK:
                self._has_read.set()
            else:
                self._lines.append(line.decode())

    def lines(self):
        """The lines of its system log so far."""
        self._has_read.clear()
        self._write_log(MARK)
        if not self._has_read.wait(60):
            raise TimeoutError(f"{self.name}: the log is not read")
        return list(self._lines)

    def _write_log(self, line):
        with socket.socket(socket.AF_UNIX, socket.SOCK_DGRAM) as writer:
            writer.sendto(line, self._log.getsockname())

    def command(self, *arguments):
        """The command line that runs a program there, in the same process."""
        return ["nsenter", "-t", str(self.process), "-n", "-m", "-r", "--", *map(str, arguments)]

    def run(self, *arguments, **options):
        """Runs a program to its end, which has to be a success; gives its output."""
        done = subprocess.run(self.command(*arguments), capture_output=True, text=True, timeout=300, **options)
        if done.returncode != 0:
            raise RuntimeError(f"{self.name}: {arguments} ended with {done.returncode}: {done.stdout}{done.stderr}")
        return done.stdout

    def start(self, *arguments, **options):
        return subprocess.Popen(self.command(*arguments), **{"stdin": subprocess.DEVNULL, **options})

    def here(self, task):
        """What a function gives that is called on this host's network."""
        with concurrent.futures.ThreadPoolExecutor(1, initializer=machine.enter_network, initargs=(self.process,)) as thread:
            return thread.submit(task).result()

    def listen(self, address, port, backlog):
        """A socket that takes connections, without an address those of all, as the service manager makes it."""
        if address or not socket.has_dualstack_ipv6():
            return self.here(lambda: socket.create_server((address, port), backlog=backlog))
        return self.here(lambda: socket.create_server(("", port), backlog=backlog, family=socket.AF_INET6, dualstack_ipv6=True))

    def cut_off(self):
        """Pulls its cable: nobody hears from it any more, and nobody is told."""
        ip(f"link set {self.cable} down")

    def close(self):
        ip(f"link delete {self.cable}")
        self._holder.stdin.close()
        self._holder.wait(timeout=60)
        self._holder.stdout.close()
        self._write_log(b"")  # the end of its lines
        self._reader.join()
        self._log.close()
        machine.unmount(self.root)
        self.root.rmdir()
