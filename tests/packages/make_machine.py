#!/usr/bin/env python3
"""Makes the minimal system that the packages' tests boot: Debian 12 with systemd, the buses, and a desktop's services.

usage: make_machine.py FOLDER

Needs root, debootstrap, and the network, for the archive that this machine's own packages come from. What is there already
and was made from the same list is left as it is.
"""

import os
import shutil
import subprocess
import sys
from pathlib import Path

RELEASE = "bookworm"
# What a machine with users needs.
SYSTEM = "systemd systemd-sysv libpam-systemd dbus dbus-user-session polkitd pkexec iproute2 procps python3".split()
# What the packages depend on, and what the tests start as a desktop would.
PACKAGES = """libcurl4 libedit2 libelf1 libgnutls30 libldap-2.5-0 libmicrohttpd12 libmnl0 libnm0 libsecret-1-0 psmisc dnsmasq-base
    gnome-keyring gnome-online-accounts libglib2.0-bin python3-gi""".split()
# What a test installs, if it is to be there: the package files wait where apt keeps those that it has fetched.
FETCHED = ["systemd-resolved"]


def archive():
    """Where apt has this release from."""
    command = ["apt-get", "indextargets", "--format", "$(RELEASE) $(REPO_URI)", "Created-By: Packages"]
    for line in subprocess.run(command, check=True, capture_output=True, text=True).stdout.splitlines():
        release, address = line.split(" ", 1)
        if release == RELEASE:
            return address
    sys.exit(f"make_machine: apt has no source of {RELEASE}")


def run(*command):
    done = subprocess.run(command, stdin=subprocess.DEVNULL, capture_output=True, text=True)
    if done.returncode != 0:
        sys.exit(f"make_machine: {command[0]} failed:\n" + "\n".join((done.stdout + done.stderr).splitlines()[-15:]))


def apt_get(folder, *arguments):
    run("unshare", "--mount", "--pid", "--fork", "--kill-child", "sh", "-ec",
        'mount --make-rprivate / && mount -t proc proc "$0/proc" && mount -t tmpfs tmpfs "$0/tmp"'
        ' && DEBIAN_FRONTEND=noninteractive exec chroot "$0" apt-get -qq --no-install-recommends "$@"',
        str(folder), *arguments)


def make(folder):
    # What it mounts in there goes with its own namespace.
    run("unshare", "--mount", "debootstrap", "--variant=minbase", f"--include={','.join(SYSTEM)}", RELEASE, str(folder), archive())
    # Like this one, the machine may reach the network through a proxy, for as long as it is made.
    shutil.copy("/etc/resolv.conf", folder / "etc/resolv.conf")
    shutil.copytree("/etc/apt/apt.conf.d", folder / "etc/apt/apt.conf.d", dirs_exist_ok=True)
    (folder / "etc/dpkg/dpkg.cfg.d/unsafe-io").write_text("force-unsafe-io\n")
    apt_get(folder, "install", *PACKAGES)
    apt_get(folder, "clean")
    apt_get(folder, "install", "--download-only", *FETCHED)
    shutil.rmtree(folder / "var/lib/apt/lists")
    (folder / "var/lib/apt/lists/partial").mkdir(parents=True)
    (folder / "etc/resolv.conf").write_text("")


def main():
    if os.geteuid() != 0:
        os.execvp("sudo", ["sudo", "-n", sys.executable, "-B", *sys.argv])
    folder = Path(sys.argv[1])
    mark = folder.with_suffix(".made")
    recipe = " ".join([RELEASE, *SYSTEM, *PACKAGES, *FETCHED])
    if mark.exists() and mark.read_text(encoding="utf-8") == recipe:
        return
    mark.unlink(missing_ok=True)
    shutil.rmtree(folder, ignore_errors=True)
    folder.mkdir(parents=True)
    make(folder)
    mark.write_text(recipe, encoding="utf-8")


if __name__ == "__main__":
    main()
