"""A machine with systemd as its first process, for a test: a minimal system of its own, with processes, network and users.

Its files are a tree that is left as it is, with a layer in memory over it. The calling program puts itself into namespaces
of its own first (enter_namespaces), so that everything ends with it.
"""

import base64
import json
import os
import signal
import subprocess
import sys
import tempfile
import time
from pathlib import Path

import machine

# From a process that has every namespace of its own to the machine's first process. The devices are as a container has them.
BOOT = r"""
set -e
mount --make-rprivate /
echo $$ >"$2/cgroup.procs"
exec unshare --cgroup --mount --propagation private sh -ec '
    cd "$1"
    python=$2 start=$3
    mount -t proc proc proc
    # What it would set there is the kernel, which all machines share.
    mount --bind proc/sys proc/sys
    mount -o remount,bind,ro proc/sys
    mount -t sysfs -o ro sysfs sys
    mount -t cgroup2 cgroup2 sys/fs/cgroup
    mount -t tmpfs -o mode=755 tmpfs dev
    mount -t tmpfs -o mode=755 tmpfs run
    mount -t tmpfs -o mode=1777 tmpfs tmp
    for each in "null 3" "zero 5" "full 7" "random 8" "urandom 9"; do
        set -- $each
        mknod -m 666 "dev/$1" c 1 "$2"
    done
    mkdir dev/pts dev/shm
    mount -t devpts -o newinstance,ptmxmode=0666,mode=620,gid=5 devpts dev/pts
    mount -t tmpfs -o mode=1777 tmpfs dev/shm
    ln -s pts/ptmx dev/ptmx
    ln -s /proc/self/fd dev/fd
    hostname machine
    exec env -i container=lxc PATH=/usr/sbin:/usr/bin:/sbin:/bin "$python" -c "$start"
' sh "$1" "$3" "$4"
"""
# The folder that it is in becomes the root of the mount namespace, which in a chroot lies outside of it: whoever enters the
# machine is to be in there, and in a chroot nobody could make a user namespace.
START = """
import ctypes, os
library = ctypes.CDLL(None, use_errno=True)
here, outside = os.open(".", os.O_RDONLY), os.open("/proc/self/ns/mnt", os.O_RDONLY)
assert library.setns(outside, 0x20000) == 0, os.strerror(ctypes.get_errno())
os.fchdir(here)
assert library.mount(b".", b"/", None, 0x2000, None) == 0, os.strerror(ctypes.get_errno())
os.chroot(".")
os.closerange(3, 20)
os.execv("/lib/systemd/systemd", ["/lib/systemd/systemd", "--show-status=no"])
"""

# A target that brings the desktop's own up, as a desktop's session does.
SESSION = "test-session.target"
SESSION_UNIT = "[Unit]\nDescription=A desktop session\nBindsTo=graphical-session.target\n"
SECRETS = "org.freedesktop.secrets"


def enter_namespaces():
    """As a machine's, with the processes of this one alone in /proc."""
    machine.enter_namespaces()
    machine.mount("proc", "/proc", "proc")


def package_files(folder):
    """The packages in a folder, without those of debugging symbols."""
    return sorted(path for path in Path(folder).glob("*.deb") if "-dbgsym_" not in path.name)


def wait_for(condition, what, seconds=60, between=0.2):
    """Waits until something is so. Asking mostly costs a process on the machine: not too often."""
    end = time.monotonic() + seconds
    while not condition():
        if time.monotonic() > end:
            raise TimeoutError(f"waited {seconds} seconds for {what}")
        time.sleep(between)


class BootedMachine:
    """root: its files, as the test sees them; what is on its /run, /tmp and /dev is seen from within alone."""

    def __init__(self, base):
        """base: the folder of a minimal system. It is not changed."""
        self._folder = Path(tempfile.mkdtemp(prefix="booted-machine-"))
        machine.mount("tmpfs", self._folder, "tmpfs")
        for name in ("changes", "work", "root", "cgroups"):
            (self._folder / name).mkdir(mode=0o755)
        self.root = self._folder / "root"
        machine.mount("overlay", self.root, "overlay", 0,
                      f"lowerdir={base},upperdir={self._folder}/changes,workdir={self._folder}/work")
        self.write("etc/systemd/user/" + SESSION, SESSION_UNIT)
        # Who logs out is gone at once, with all of their processes.
        self.write("etc/systemd/logind.conf.d/test.conf", "[Login]\nUserStopDelaySec=0\n")
        self._cgroups = self._folder / "cgroups"
        machine.mount("none", self._cgroups, "cgroup2")
        self._cgroup = self._cgroups / f"welcomer-machine-{os.getpid()}-{os.urandom(4).hex()}"
        self._process = None

    def write(self, name, text):
        """A file of the machine's, by its path there without the first slash."""
        (self.root / name).parent.mkdir(parents=True, exist_ok=True)
        (self.root / name).write_text(text, encoding="utf-8")

    def boot(self):
        """Starts the first process; returns when the system is up."""
        self._cgroup.mkdir()
        with open(self._folder / "console", "ab") as console:
            self._process = subprocess.Popen(
                ["unshare", "--mount", "--pid", "--net", "--uts", "--ipc", "--fork", "--kill-child", "sh", "-c", BOOT, "sh",
                 str(self.root), str(self._cgroup), sys.executable, START],
                stdin=subprocess.DEVNULL, stdout=console, stderr=console)
        children = Path(f"/proc/{self._process.pid}/task/{self._process.pid}/children")
        wait_for(lambda: self._alive() and children.read_text().split(), "the machine's first process")
        self._first = int(children.read_text().split()[0])
        wait_for(self._is_up, "the machine's start")

    def _alive(self):
        if self._process.poll() is not None:
            raise AssertionError("the machine has ended: " + (self._folder / "console").read_text())
        return True

    def _is_up(self):
        state = self._alive() and self.run(["systemctl", "is-system-running"]).stdout.strip()
        return state in ("running", "degraded")

    def _entered(self, command, user):
        identity = ["setpriv", "--reuid", user, "--regid", user, "--init-groups"] if user else []
        return ["nsenter", "--target", str(self._first), "--mount", "--pid", "--net", "--uts", "--ipc", "--cgroup",
                *identity, *map(str, command)]

    @staticmethod
    def _environment(user, environment):
        return {"PATH": "/usr/sbin:/usr/bin:/sbin:/bin", "LANG": "C.UTF-8", "HOME": f"/home/{user}" if user else "/root",
                **(environment or {})}

    def run(self, command, user=None, environment=None, **options):
        """A program on the machine, as root or as a user of the machine."""
        options.setdefault("input", "")
        return subprocess.run(self._entered(command, user), env=self._environment(user, environment),
                              **{"capture_output": True, "text": True, "timeout": 120, "check": False, **options})

    def must(self, command, user=None, **options):
        """What a program that has to succeed prints."""
        done = self.run(command, user, **options)
        if done.returncode != 0:
            raise AssertionError(f"{' '.join(map(str, command))} ended with {done.returncode}: {done.stdout}{done.stderr}")
        return done.stdout

    def install(self, packages):
        """Installs package files, whose dependencies are there."""
        there = [str(Path("/root") / Path(package).name) for package in packages]
        for package, name in zip(packages, there):
            (self.root / name[1:]).write_bytes(Path(package).read_bytes())
        self.must(["dpkg", "--install", *there], environment={"DEBIAN_FRONTEND": "noninteractive"})
        for name in there:
            (self.root / name[1:]).unlink()

    def add_user(self, name):
        """An ordinary user with a home folder."""
        self.must(["useradd", "--create-home", "--shell", "/bin/sh", name])

    def _entries(self, program, user):
        match = [f"_UID={self.user_id(user)}"] if user else []
        lines = self.must(["journalctl", "--quiet", "--output=json", f"SYSLOG_IDENTIFIER={program}", *match]).splitlines()
        return list(map(json.loads, lines))

    def records(self, program, user=None):
        """The journal's records of one program so far, in their order: (facility, priority, text)."""
        return [(int(entry["SYSLOG_FACILITY"]), int(entry["PRIORITY"]), entry["MESSAGE"])
                for entry in self._entries(program, user)]

    def seconds_between_records(self, program, user=None):
        """How long it took one program from its first record in the journal to its last one so far."""
        times = [int(entry["__MONOTONIC_TIMESTAMP"]) for entry in self._entries(program, user)]
        return (times[-1] - times[0]) / 1e6

    def process_of(self, program):
        """The number that a process of the machine which runs a program has here, or None."""
        for folder, _, _ in os.walk(self._cgroup):
            try:
                for number in Path(folder, "cgroup.procs").read_text().split():
                    if os.readlink(f"/proc/{number}/exe").endswith(f"/{program}"):
                        return int(number)
            except OSError:
                pass  # the process or the whole cgroup has ended
        return None

    def user_id(self, name):
        return int(self.must(["id", "-u", name]))

    def journal(self, *matches):
        """The texts of the journal that fit, in their order."""
        return self.must(["journalctl", "--quiet", "--output=cat", *matches]).splitlines()

    def enter_network(self):
        """Has the calling thread, and what it starts, be in the machine's network."""
        machine.enter_network(self._first)

    def reboot(self):
        """Returns when the system is up again."""
        self._switch_off()
        self.boot()

    def shut_down(self):
        """Ends every process of the machine and lets go of its files."""
        if self._process:
            self._switch_off()
        machine.unmount(self._folder)
        self._folder.rmdir()

    def _switch_off(self):
        # This signal has the machine switch off: units are stopped in their order.
        if self._process.poll() is None:
            os.kill(self._first, signal.SIGRTMIN + 4)
        try:
            self._process.wait(timeout=60)
        finally:
            self._process.kill()
            self._process.wait()
        wait_for(lambda: machine.remove_cgroups(self._cgroup), "the end of the machine's processes")


class Session:
    """A user's login on a booted machine, as the login program makes one: PAM, logind, the user manager."""

    def __init__(self, on, user):
        self.machine, self.user = on, user
        uid = on.user_id(user)
        self._unit = f"login-of-{user}.service"
        self.environment = {"XDG_RUNTIME_DIR": f"/run/user/{uid}", "USER": user, "LOGNAME": user,
                            "DBUS_SESSION_BUS_ADDRESS": f"unix:path=/run/user/{uid}/bus"}
        on.must(["systemd-run", "--quiet", "--collect", f"--unit={self._unit}",
                 f"--property=User={user}", "--property=PAMName=login", "/bin/sleep", "infinity"])
        self._manager = f"user@{uid}.service"
        wait_for(
            lambda: self.systemctl("is-active", "default.target", check=False).stdout.strip() == "active", "the user manager")

    def run(self, command, environment=None, **options):
        """A program of the user's, in this login."""
        return self.machine.run(command, self.user, {**self.environment, **(environment or {})}, **options)

    def start(self, name, *command, written=b"", printed="/dev/null"):
        """A service of the session, for as long as it lasts.

        written: what it reads from its standard input. printed: the file that gets what it prints.
        """
        text = base64.b64encode(written).decode()
        self.run(["systemd-run", "--user", "--quiet", "--collect", f"--unit=test-{name}.service",
                  "--property=StandardInput=data", f"--property=StandardInputData={text}",
                  f"--property=StandardOutput=file:{printed}", *command], check=True)

    def systemctl(self, *arguments, check=True):
        return self.run(["systemctl", "--user", *arguments], check=check)

    def start_script(self, name, *arguments):
        """A script of the tests' own; returns the file of what it prints, once it is ready."""
        (self.machine.root / "usr/local/bin" / name).write_bytes((Path(__file__).parent / name).read_bytes())
        printed = self.machine.root / "home" / self.user / f".{name}.printed"
        printed.unlink(missing_ok=True)  # of an earlier login
        self.start(name, "/usr/bin/python3", "-B", f"/usr/local/bin/{name}", *arguments,
                   printed=f"/home/{self.user}/{printed.name}")
        wait_for(lambda: printed.exists() and "ready\n" in printed.read_text(), name)
        return printed

    def start_keyring(self, password, unlocked=True):
        self.start("keyring", "gnome-keyring-daemon", "--foreground", "--components=secrets",
                   "--unlock" if unlocked else "--start", written=password.encode())
        locked = ["gdbus", "call", "--session", "-d", SECRETS, "-o", "/org/freedesktop/secrets/collection/login", "-m",
                  "org.freedesktop.DBus.Properties.Get", "org.freedesktop.Secret.Collection", "Locked"]
        self.wait_for_name(SECRETS)
        wait_for(lambda: f"<{str(not unlocked).lower()}>" in self.run(locked).stdout, "the keyring")

    def wait_for_name(self, name):
        # Asked of the bus itself, which starts nobody for it.
        asked = ["gdbus", "call", "--session", "-d", "org.freedesktop.DBus", "-o", "/", "-m",
                 "org.freedesktop.DBus.NameHasOwner", name]
        wait_for(lambda: "true" in self.run(asked).stdout, name)

    def start_desktop(self):
        """The desktop comes up; returns when everything that it wants at once is there."""
        self.systemctl("start", SESSION)
        # The unit that the target only wants may still be on its way.
        wait_for(lambda: self.systemctl("list-jobs").stdout.startswith("No jobs"), "the session")

    def end(self):
        """Logs out; returns when the user manager has ended."""
        self.systemctl("stop", SESSION)
        self.machine.must(["systemctl", "stop", self._unit])
        wait_for(
            lambda: self.machine.run(["systemctl", "is-active", self._manager]).stdout.strip() in ("inactive", "failed"),
            "the end of the login")
