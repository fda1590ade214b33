"""A user's login on a test's machine: the real user manager, in a cgroup of its own."""

import os
import subprocess
import tempfile
from pathlib import Path

import machine

# A session that brings the desktop's target up, as a desktop's own session unit does.
SESSION = "test-session.target"
SESSION_UNIT = """[Unit]
Description=A desktop session
BindsTo=graphical-session.target
"""


class Login:
    """The user's processes from the start of the user manager to its end; the runtime folder comes and goes with it.

    with_manager=False: a session of a desktop without systemd, which has the runtime folder alone.
    """

    def __init__(self, on, with_manager=True, environment=None):
        self.machine = on
        self.runtime = on.root / "run/user" / str(machine.UID)
        self.environment = {**on.environment(True), "XDG_RUNTIME_DIR": f"/run/user/{machine.UID}",
                            "USER": machine.USER, "LOGNAME": machine.USER, **(environment or {})}
        self.manager = None
        self.runtime.mkdir(parents=True)
        self.runtime.chmod(0o700)
        os.chown(self.runtime, machine.UID, machine.UID)
        if with_manager:
            self._start_manager()

    def _start_manager(self):
        (self.machine.root / "run/systemd/system").mkdir(parents=True, exist_ok=True)
        self._cgroups = Path(tempfile.mkdtemp(prefix="login-cgroups-"))
        machine.mount("none", self._cgroups, "cgroup2")
        self._cgroup = self._cgroups / f"welcomer-login-{os.getpid()}-{os.urandom(4).hex()}"
        self._cgroup.mkdir()
        for name in ("", "cgroup.procs", "cgroup.subtree_control", "cgroup.threads"):
            os.chown(self._cgroup / name, machine.UID, machine.UID)
        inside = self.machine.root / "sys/fs/cgroup"
        inside.mkdir(parents=True, exist_ok=True)
        # The manager sees its own cgroup as the root of all, so that it rearranges nothing else.
        enter = ('echo $$ > "$1/cgroup.procs"; shift; exec unshare --cgroup --mount sh -c '
                 '\'mount -t cgroup2 none "$1"; shift; exec "$@"\' sh "$@"')
        command = self.machine._chroot(["/lib/systemd/systemd", "--user"], True)
        log = open(self.machine.root / "run/user-manager.log", "ab")
        self.manager = subprocess.Popen(
            ["sh", "-c", enter, "sh", str(self._cgroup), str(inside), *command], stdin=subprocess.DEVNULL, stderr=log,
            env={**self.environment, "SYSTEMD_LOG_TARGET": "console"})
        log.close()
        machine.Machine.wait_for(
            lambda: self.systemctl("is-active", "default.target", check=False).stdout.strip() == "active",
            "the user manager")

    def run(self, command, environment=None, **options):
        """A program of the user's, in this login."""
        return subprocess.run(self.machine._chroot(command, True), env={**self.environment, **(environment or {})},
                              **{"stdin": subprocess.DEVNULL, "capture_output": True, "text": True, "timeout": 60,
                                 "check": False, **options})

    def start(self, command, environment=None, **options):
        return subprocess.Popen(self.machine._chroot(command, True), env={**self.environment, **(environment or {})},
                                **{"stdin": subprocess.DEVNULL, **options})

    def systemctl(self, *arguments, check=True):
        return self.run(["/usr/bin/systemctl", "--user", *arguments], check=check)

    def start_session(self):
        """The desktop comes up; returns when everything that it wants at once is there."""
        folder = self.machine.home / ".config/systemd/user"
        folder.mkdir(parents=True, exist_ok=True)
        (folder / SESSION).write_text(SESSION_UNIT, encoding="utf-8")
        self.systemctl("daemon-reload")
        self.systemctl("start", SESSION)
        # The unit that the target only wants may still be on its way.
        machine.Machine.wait_for(lambda: self.systemctl("list-jobs").stdout.startswith("No jobs"), "the session")

    def end_session(self):
        self.systemctl("stop", "graphical-session.target", SESSION, check=False)
        self.systemctl("stop", SESSION)

    def end(self):
        if self.manager:
            self.manager.terminate()
            self.manager.wait(timeout=60)
            machine.Machine.wait_for(lambda: machine.remove_cgroups(self._cgroup), "the end of the login's processes")
            machine.unmount(self._cgroups)
            self._cgroups.rmdir()
        subprocess.run(["rm", "-rf", str(self.runtime)], check=True)
