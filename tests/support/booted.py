"""A test's machine with a real systemd as its first process, a real journal, and users' real logins.

Everything lives in namespaces and a cgroup of its own, and ends with stop().
"""

import os
import signal
import subprocess
import tempfile
from pathlib import Path

import login
import machine

# Where /proc/sys could be written, the machine's first process would set the kernel up, which all machines share.
BOOT = """
root=$1
mount --make-rprivate /
umount -l "$root/proc"
mount -t proc proc "$root/proc"
mount --bind "$root/proc/sys" "$root/proc/sys"
mount -o remount,bind,ro "$root/proc/sys"
mount -t sysfs -o ro sysfs "$root/sys"
mount -t tmpfs -o mode=755 tmpfs "$root/run"
mount -t cgroup2 none "$root/sys/fs/cgroup"
mount -t devpts -o newinstance,ptmxmode=666 devpts "$root/dev/pts"
exec chroot "$root" env -i container=lxc PATH=/usr/local/sbin:/usr/local/bin:/usr/sbin:/usr/bin:/sbin:/bin \\
    /lib/systemd/systemd --unit=multi-user.target --log-target=journal --show-status=0
"""
# Of the machine's own services, those that a test's machine has no use for, or that reach beyond it.
MASKED = ("NetworkManager.service", "ModemManager.service", "systemd-logind.service", "systemd-udevd.service",
          "systemd-networkd.service", "systemd-timesyncd.service", "systemd-modules-load.service", "cron.service",
          "apt-daily.timer", "apt-daily-upgrade.timer", "dpkg-db-backup.timer", "e2scrub_all.timer", "fstrim.timer",
          "getty.target", "console-getty.service", "networking.service", "ssh.service", "rsyslog.service")


class BootedMachine(machine.Machine):
    def __init__(self, folder, with_keyring=False):
        super().__init__(folder, with_keyring)
        self.first = None
        for name in ("sys", "dev/pts", "dev/shm", "etc/pam.d", "etc/systemd/system", "var/log/journal"):
            (self.root / name).mkdir(parents=True)
        (self.root / "dev/shm").chmod(0o1777)
        (self.root / "dev/ptmx").symlink_to("pts/ptmx")
        (self.root / "etc/machine-id").write_text(os.urandom(16).hex() + "\n", encoding="ascii")
        for name in ("systemd-user", "other"):
            self._write(f"etc/pam.d/{name}", "".join(f"{kind} required pam_permit.so\n" for kind in
                                                      ("account", "auth", "session")))
        for name in MASKED:
            (self.root / "etc/systemd/system" / name).symlink_to("/dev/null")
        # The kernel's messages are those of all machines.
        self.add_to("etc/systemd/journald.conf.d", "[Journal]\nReadKMsg=no\n")
        # What the session's module of the login does elsewhere.
        self.add_to_unit("user@.service", "[Service]\nEnvironment=XDG_RUNTIME_DIR=/run/user/%i\n")
        self.add_to_unit("user-runtime-dir@.service", "[Service]\nExecStart=\nExecStart=/bin/install -d -m 0700 "
                         "-o %i -g %i /run/user/%i\nExecStop=\nExecStop=/bin/rm -rf /run/user/%i\n")

    def add_to_unit(self, unit, text):
        self.add_to(f"etc/systemd/system/{unit}.d", text)

    def add_to(self, folder, text, name="test.conf"):
        """Adds to a configuration that has a folder for that."""
        (self.root / folder).mkdir(parents=True, exist_ok=True)
        (self.root / folder / name).write_text(text, encoding="utf-8")

    def add_users(self):
        """The users of the machine's services, and of what is installed."""
        done = self.run(["/usr/bin/systemd-sysusers"])
        if done.returncode != 0:
            raise AssertionError(f"systemd-sysusers failed: {done}")

    def boot(self):
        self.add_users()
        self._cgroups = Path(tempfile.mkdtemp(prefix="booted-cgroups-"))
        machine.mount("none", self._cgroups, "cgroup2")
        self._cgroup = self._cgroups / f"welcomer-boot-{os.getpid()}-{os.urandom(4).hex()}"
        self._cgroup.mkdir()
        enter = ('echo $$ > "$1/cgroup.procs"; exec unshare --cgroup --mount --pid --ipc --uts --fork --kill-child '
                 'sh -ec "$2" sh "$3"')
        self._boot = subprocess.Popen(["sh", "-c", enter, "sh", str(self._cgroup), BOOT, str(self.root)],
                                      stdin=subprocess.DEVNULL, stdout=subprocess.DEVNULL, stderr=subprocess.DEVNULL)
        children = Path(f"/proc/{self._boot.pid}/task/{self._boot.pid}/children")
        self.wait_for(lambda: children.read_text().split(), "the machine's first process")
        self.first = int(children.read_text().split()[0])
        states = ("running", "degraded")
        self.wait_for(lambda: self.systemctl("is-system-running", check=False).stdout.strip() in states, "the boot")

    @property
    def inside(self):
        """The root as the booted machine sees it, with its own /run and /proc."""
        return Path(f"/proc/{self.first}/root")

    def _chroot(self, command, user):
        if self.first is None:
            return super()._chroot(command, user)
        identity = ["--setuid", str(machine.UID), "--setgid", str(machine.UID)] if user else []
        return ["nsenter", "--target", str(self.first), "--all", "--root", *identity, "--", "/usr/bin/env",
                "--chdir=/", *map(str, command)]

    def systemctl(self, *arguments, check=True):
        done = self.run(["/usr/bin/systemctl", *arguments])
        if check and done.returncode != 0:
            raise AssertionError(f"systemctl failed: {done}; {self.journal()}")
        return done

    def journal(self, *matches):
        """The lines of the whole journal that fit."""
        return self.run(["/usr/bin/journalctl", "--quiet", "--no-pager", "--output=cat", *matches]).stdout.splitlines()

    def stop(self):
        if self.first is not None:
            self._boot.send_signal(signal.SIGKILL)  # and with it all that it has started
            self._boot.wait(timeout=60)
            self.first = None
            self.wait_for(self._remove_cgroups, "the end of the machine's processes")
        super().stop()

    def _remove_cgroups(self):
        try:
            for folder, _, _ in sorted(os.walk(self._cgroup), reverse=True):
                os.rmdir(folder)
        except OSError:
            return False
        machine.unmount(self._cgroups)
        self._cgroups.rmdir()
        return True


class BootedLogin(login.Login):
    """A login of the user's on a booted machine: its user manager is one of the machine's services."""

    def __init__(self, on):
        self.machine = on
        self.runtime = Path(f"/run/user/{machine.UID}")
        self.manager = f"user@{machine.UID}.service"
        self.environment = {**on.environment(True), "XDG_RUNTIME_DIR": str(self.runtime), "USER": machine.USER,
                            "LOGNAME": machine.USER, "DBUS_SESSION_BUS_ADDRESS": f"unix:path={self.runtime}/bus"}
        on.systemctl("start", self.manager)

    def end(self):
        self.machine.systemctl("stop", self.manager)
        self.machine.wait_for(lambda: not (self.machine.inside / f"run/user/{machine.UID}").exists(), "the logout")
