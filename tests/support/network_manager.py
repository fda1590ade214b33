"""A NetworkManager with a system bus of its own, for a program that has network and mount namespaces of its own."""

import os
import shutil
import signal
import subprocess
import time
from pathlib import Path

BUS = """<busconfig>
  <type>system</type>
  <listen>unix:path=/run/dbus/system_bus_socket</listen>
  <auth>EXTERNAL</auth>
  <policy context="default">
    <allow user="*"/><allow own="*"/>
    <allow send_type="method_call"/><allow send_type="signal"/>
    <allow send_requested_reply="true" send_type="method_return"/>
    <allow send_requested_reply="true" send_type="error"/>
    <allow receive_type="method_call"/><allow receive_type="signal"/>
    <allow receive_requested_reply="true" receive_type="method_return"/>
    <allow receive_requested_reply="true" receive_type="error"/>
  </policy>
</busconfig>
"""
MANAGER = """[main]
plugins=keyfile
dns=none
rc-manager=unmanaged
no-auto-default=*
auth-polkit=root-only
[keyfile]
path=/run/profiles
unmanaged-devices=interface-name:p-*
"""


def shell(command):
    return subprocess.run(["sh", "-ec", command], check=True, capture_output=True, text=True).stdout


def wait_for(condition, what, seconds=60):
    end = time.monotonic() + seconds
    while not condition():
        if time.monotonic() > end:
            raise TimeoutError(f"waited {seconds} seconds for {what}")
        time.sleep(0.05)


def succeeds(command):
    return subprocess.run(["sh", "-c", command], check=False, capture_output=True).returncode == 0


class NetworkManager:
    """Manages every link but those whose names begin with "p-", makes no profiles and leaves the name servers alone."""

    def __init__(self):
        shell("mount -t tmpfs tmpfs /run && mkdir -p /run/dbus /run/profiles /var/lib/NetworkManager && "
              "mount -t tmpfs tmpfs /var/lib/NetworkManager && mount -t sysfs -o ro sysfs /sys && ip link set lo up")
        Path("/run/bus.conf").write_text(BUS, encoding="utf-8")
        Path("/run/manager.conf").write_text(MANAGER, encoding="utf-8")
        self._daemons = [self._start(["dbus-daemon", "--config-file=/run/bus.conf", "--nofork", "--nopidfile"])]
        wait_for(lambda: os.path.exists("/run/dbus/system_bus_socket"), "the system bus")
        self._daemons.append(self._start(
            [shutil.which("NetworkManager", path="/usr/sbin:/usr/bin"), "--no-daemon", "--config=/run/manager.conf",
             "--config-dir=/run/none", "--system-config-dir=/run/none", "--intern-config=/run/intern.conf",
             "--state-file=/run/state", "--pid-file=/run/manager.pid"]))
        wait_for(lambda: succeeds("nmcli -t general status"), "NetworkManager")

    @staticmethod
    def _start(command):
        return subprocess.Popen(command, stdin=subprocess.DEVNULL, stdout=subprocess.DEVNULL,
                                stderr=subprocess.DEVNULL)

    @staticmethod
    def add_cable(device):
        """A device with something at the other end."""
        shell(f"ip link add {device} type veth peer name p-{device} && ip link set p-{device} up")
        wait_for(lambda: succeeds(f"nmcli -g GENERAL.STATE device show {device} | grep -q '^30\\|^100'"), device)

    def stop(self):
        for daemon in reversed(self._daemons):
            daemon.send_signal(signal.SIGTERM)
            daemon.wait(timeout=60)
