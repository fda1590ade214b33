"""Machines of a test's own: each has its network, its processes and its /etc to itself, and ends with the test.

Needs root.
"""

import json
import shutil
import subprocess
from pathlib import Path


class NetworkSpace:
    """A network, process and mount namespace. It goes away with close(), and with the program that made it."""

    def __init__(self, etc=None):
        """etc: a folder to be this machine's /etc, or None for that of the machine outside."""
        bind = f"mount --bind '{etc}' /etc && " if etc else ""
        self._holder = subprocess.Popen(
            ["unshare", "--net", "--mount", "--pid", "--fork", "--mount-proc", "--kill-child", "sh", "-c",
             f"{bind}ip link set lo up && echo ready && exec cat"],
            stdin=subprocess.PIPE, stdout=subprocess.PIPE, text=True)
        if self._holder.stdout.readline() != "ready\n":
            raise RuntimeError("the namespaces could not be made")
        children = Path(f"/proc/{self._holder.pid}/task/{self._holder.pid}/children").read_text(encoding="ascii")
        self.process = int(children.split()[0])
        self._started = []

    def close(self):
        self._holder.stdin.close()  # its first process ends, and all others with it
        self._holder.wait()
        self._holder.stdout.close()
        for process in self._started:
            process.wait()
            process.stderr.close()

    def command(self, *arguments):
        """The command line that runs a program inside."""
        return ["nsenter", "-t", str(self.process), "-n", "-m", "-p", "-r", "--", *map(str, arguments)]

    def run(self, *arguments, **options):
        return subprocess.run(self.command(*arguments), capture_output=True, text=True, stdin=subprocess.DEVNULL,
                              timeout=100, **options)

    def shell(self, commands):
        """Shell commands on this network, in everything else outside; they have to succeed."""
        return subprocess.run(["nsenter", "-t", str(self.process), "-n", "--", "sh", "-e", "-c", commands], check=True,
                              stdout=subprocess.PIPE, text=True, timeout=100).stdout

    def ip(self, *arguments):
        """What `ip -json` answers."""
        return json.loads(self.shell("ip -json " + " ".join(arguments)) or "[]")

    def start(self, *arguments, until):
        """Starts a program that stays; back when its stderr has said something."""
        process = subprocess.Popen(self.command(*arguments), stderr=subprocess.PIPE, text=True, stdin=subprocess.DEVNULL)
        self._started.append(process)
        said = ""
        while until not in said:
            line = process.stderr.readline()
            if not line:
                raise RuntimeError(f"{arguments[0]} ended: {said}")
            said += line
        return process

    def connect(self, device, other, other_device):
        """A cable from a device here to one there; both are up, and without an address."""
        self.shell(f"ip link add {device} type veth peer name {other_device} netns {other.process}; "
                   f"ip link set {device} up")
        other.shell(f"ip link set {other_device} up")

    def start_name_server(self, folder, *options):
        """dnsmasq, which knows no name but those in the options."""
        return self.start("dnsmasq", "--keep-in-foreground", "--log-facility=-", "--conf-file=/dev/null", "--pid-file=",
                          "--user=root", "--no-resolv", "--no-hosts", "--no-ping", "--local=/#/",
                          f"--dhcp-leasefile={folder}/leases", *options, until="started, version")


def make_etc(folder):
    """A folder for a machine's /etc: this machine's, with nothing that points out of it."""
    shutil.copytree("/etc", folder, symlinks=True)
    for name, text in (("resolv.conf", "# no servers\n"), ("hosts", "127.0.0.1 localhost\n"),
                       ("nsswitch.conf", "passwd: files\ngroup: files\nhosts: files dns\n")):
        (folder / name).unlink(missing_ok=True)
        (folder / name).write_text(text, encoding="ascii")
