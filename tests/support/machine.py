"""A small machine of its own for a test: a root folder with the real programs in it, a real system log, a user's home.

The calling program puts itself into namespaces of its own first (enter_namespaces), so that every mount and every
process ends with it. Needs root, or sudo without a question.
"""

import ctypes
import os
import shutil
import subprocess
import sys
import tempfile
import time
from pathlib import Path

CLONE_NEWNET = 0x40000000
MNT_DETACH = 2
MS_BIND, MS_REC, MS_PRIVATE, MS_RDONLY, MS_REMOUNT = 0x1000, 0x4000, 0x40000, 0x1, 0x20

USER, UID = "newcomer", 31999

_libc = ctypes.CDLL(None, use_errno=True)


def enter_namespaces():
    """Restarts this program as the first process of its own mount, process and network namespaces."""
    if os.geteuid() != 0:
        os.execvp("sudo", ["sudo", "-n", sys.executable, *sys.argv])
    if os.environ.get("WELCOMER_TEST_NAMESPACES") != "entered":
        os.environ["WELCOMER_TEST_NAMESPACES"] = "entered"
        os.execvp("unshare", ["unshare", "--mount", "--pid", "--net", "--fork", "--kill-child",
                              sys.executable, *sys.argv])
    mount("none", "/", None, MS_REC | MS_PRIVATE)


def mount(source, target, kind=None, flags=0, options=None):
    encode = lambda text: None if text is None else str(text).encode()
    if _libc.mount(encode(source), encode(target), encode(kind), flags, encode(options)) != 0:
        number = ctypes.get_errno()
        raise OSError(number, f"mount {source} on {target}: {os.strerror(number)}")


def unmount(target):
    """Lets go of everything mounted on and below a folder."""
    if _libc.umount2(str(target).encode(), MNT_DETACH) != 0:
        number = ctypes.get_errno()
        raise OSError(number, f"umount {target}: {os.strerror(number)}")


def enter_network(process):
    """Has the calling thread, and what it starts, be in the network of another process."""
    with open(f"/proc/{process}/ns/net", "rb") as namespace:
        if _libc.setns(namespace.fileno(), CLONE_NEWNET) != 0:
            number = ctypes.get_errno()
            raise OSError(number, f"entering the network of {process}: {os.strerror(number)}")


def remove_cgroups(top):
    """Removes a cgroup and those below it. False while there is one with a process: it goes once the last one has ended."""
    try:
        for folder, _, _ in sorted(os.walk(top), reverse=True):
            os.rmdir(folder)
    except OSError:
        return False
    return True


class Machine:
    """A root folder on a tmpfs. Programs and libraries are this machine's own; everything else is fresh."""

    def __init__(self, folder, with_keyring=False):
        """with_keyring: whether a session bus can start this machine's Secret Service."""
        self.root = Path(folder)
        self.root.mkdir(parents=True, exist_ok=True)
        mount("tmpfs", self.root, "tmpfs")
        for name in ("usr", "bin", "sbin", "lib", "lib32", "lib64", "libx32"):
            self._same_as_outside(name)
        for name, mode in (("dev", 0o755), ("etc", 0o755), ("home", 0o755), ("proc", 0o555), ("root", 0o700),
                           ("run", 0o755), ("tmp", 0o1777), ("var", 0o755)):
            (self.root / name).mkdir()
            (self.root / name).chmod(mode)
        mount("proc", self.root / "proc", "proc")
        for name, minor in (("null", 3), ("zero", 5), ("random", 8), ("urandom", 9)):
            path = self.root / "dev" / name
            os.mknod(path, 0o020666, os.makedev(1, minor))
            path.chmod(0o666)
        secrets = self.root / "usr/share/dbus-1/services/org.freedesktop.secrets.service"
        if not with_keyring and secrets.exists():
            mount("/dev/null", secrets, None, MS_BIND)
        self._write("etc/passwd", f"root:x:0:0:root:/root:/bin/sh\n{USER}:x:{UID}:{UID}::/home/{USER}:/bin/sh\n")
        self._write("etc/group", f"root:x:0:\n{USER}:x:{UID}:\n")
        self._write("etc/nsswitch.conf", "passwd: files\ngroup: files\nhosts: files\n")
        for name in ("ld.so.cache", "ld.so.conf", "alternatives"):
            if (Path("/etc") / name).exists():
                subprocess.run(["cp", "-a", f"/etc/{name}", str(self.root / "etc")], check=True)
        self.home = self.root / "home" / USER
        self.home.mkdir(mode=0o755)
        os.chown(self.home, UID, UID)
        self._daemons = []

    def _same_as_outside(self, name):
        outside, inside = Path("/") / name, self.root / name
        if outside.is_symlink():
            inside.symlink_to(os.readlink(outside))
        elif outside.is_dir():
            inside.mkdir()
            mount(outside, inside, None, MS_BIND | MS_REC)
            mount(outside, inside, None, MS_BIND | MS_REMOUNT | MS_RDONLY)

    def _write(self, name, text):
        (self.root / name).write_text(text, encoding="utf-8")

    def install(self, build):
        """Installs a build tree where it says that it is installed."""
        stage = self.root / "stage"
        subprocess.run(["cmake", "--install", str(build)], check=True, stdout=subprocess.DEVNULL,
                       env={**os.environ, "DESTDIR": str(stage)})
        for folder in sorted(stage.iterdir()):
            if folder.name == "usr":
                mount(stage / "usr" / "local", self.root / "usr" / "local", None, MS_BIND)
            else:
                subprocess.run(["cp", "-a", str(folder), str(self.root)], check=True)

    def enable_for_users(self, *units):
        """Has user units be wanted, or not, as the presets say: what the installation of a package does."""
        done = self.run(["/usr/bin/systemctl", "--global", "preset", *units])
        if done.returncode != 0:
            raise AssertionError(f"the presets failed: {done}")

    def start_system_log(self):
        """A real rsyslogd on /dev/log. Its records are read with log_records()."""
        self._write("etc/rsyslog.conf", "\n".join([
            'module(load="imuxsock")',
            'template(name="record" type="string" string="%pri% %syslogfacility%.%syslogseverity% '
            '%programname% [%msg%]\\n")',
            '*.* action(type="omfile" file="/run/records" template="record" asyncWriting="off")', ""]))
        self._daemons.append(self.start(["/usr/sbin/rsyslogd", "-n", "-f", "/etc/rsyslog.conf", "-i", "/run/rsyslogd.pid"]))
        self.wait_for(lambda: (self.root / "dev/log").exists(), "the system log's socket")

    def log_records(self, program):
        """The records of one program so far: (priority, "facility.severity", text)."""
        records = self.root / "run/records"
        if not records.exists():
            return []
        found = []
        for line in records.read_text(encoding="utf-8").splitlines():
            priority, names, name, text = line.split(" ", 3)
            if name == program:
                # The system log keeps the blank that separates a record's tag from its text.
                found.append((int(priority), names, text[1:-1].removeprefix(" ")))
        return found

    def _chroot(self, command, user):
        number = UID if user is True else user  # any other user of the machine by number
        identity = ["--userspec", f"{number}:{number}", "--groups", ""] if user else []
        return ["/usr/sbin/chroot", *identity, str(self.root), *map(str, command)]

    def environment(self, user):
        return {"PATH": "/usr/local/bin:/usr/bin:/bin", "LANG": "C.UTF-8",
                "HOME": f"/home/{USER}" if user else "/root"}

    def start(self, command, user=False, **options):
        return subprocess.Popen(self._chroot(command, user), env=self.environment(user),
                                stdin=subprocess.DEVNULL, **options)

    def run(self, command, user=False, timeout=60, **options):
        return subprocess.run(self._chroot(command, user), env=self.environment(user), stdin=subprocess.DEVNULL,
                              timeout=timeout, capture_output=True, text=True, check=False, **options)

    @staticmethod
    def wait_for(condition, what, seconds=60):
        end = time.monotonic() + seconds
        while not condition():
            if time.monotonic() > end:
                raise TimeoutError(f"waited {seconds} seconds for {what}")
            time.sleep(0.02)

    def stop(self):
        for daemon in self._daemons:
            daemon.terminate()
        for daemon in self._daemons:
            daemon.wait(timeout=60)
        self._daemons.clear()
        self._unmount()

    def _unmount(self):
        """Lets go of everything mounted below the root, which leaves an empty folder, and removes that."""
        unmount(self.root)
        self.root.rmdir()


def for_class(case, build, name):
    """A machine with what a build installs, for as long as a class of tests lasts: case.machine, in case.folder.

    name: what the folder's begins with.
    """
    case.folder = Path(tempfile.mkdtemp(prefix=f"{name}-"))
    case.addClassCleanup(shutil.rmtree, case.folder)
    case.machine = Machine(case.folder / "machine")
    case.addClassCleanup(case.machine.stop)
    case.machine.install(build)
