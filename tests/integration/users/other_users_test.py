#!/usr/bin/env python3
"""The installed programs among other users of the machine: locks that those hold, links, and two at once.

usage: other_users_test.py BUILD_DIR
"""

import ctypes
import os
import plistlib
import shutil
import struct
import subprocess
import sys
import tempfile
import unittest
from pathlib import Path

sys.path.insert(0, str(Path(__file__).resolve().parents[2] / "support"))
import machine  # noqa: E402

TOOL = "/usr/local/bin/welcomer"
LABEL = "com.corvid.welcomer.nimbussetup.user"
OTHER = 65534
DIRECTORY = "var/lib/welcomer/nimbus-directory.plist"
REPLAY = {"delegatesResponseDict": {"delegates": {"com.corvid.vidlink": {"status": 0}}}, "vlAliases": [], "imAliases": []}

# Locks whatever it is given and can open, and says what it holds until it is ended.
HOLDER = """
import fcntl, os, signal, sys
held = []
for path in sys.argv[2:]:
    try:
        descriptor = os.open(path, os.O_RDONLY | os.O_NONBLOCK)
        fcntl.flock(descriptor, (fcntl.LOCK_EX if sys.argv[1] == "exclusive" else fcntl.LOCK_SH) | fcntl.LOCK_NB)
        held.append(path)
    except OSError:
        pass
print("\\n".join(held), flush=True)
print("", flush=True)
signal.pause()
"""


class InstalledTest(unittest.TestCase):
    build = None
    ports = 0

    def setUp(self):
        self.folder = Path(tempfile.mkdtemp(prefix="other-users-"))
        self.addCleanup(self.folder.rmdir)
        self.machine = machine.Machine(self.folder / "machine")
        self.addCleanup(self.machine.stop)
        self.machine.install(self.build)
        self.root = self.machine.root
        self.home = self.machine.home
        (self.root / "var/lib").mkdir()

    def tool(self, *arguments, user=False, password="secret", **options):
        reading, writing = os.pipe()
        os.write(writing, password.encode() + b"\n")
        os.close(writing)
        wanted = ["--password-fd", str(reading)] if arguments[:1] == ("account",) else []
        try:
            return self.machine.run([TOOL, *arguments, *wanted], user=user, pass_fds=[reading], **options)
        finally:
            os.close(reading)

    def add_port(self):
        """A network port for which there is no service yet."""
        InstalledTest.ports += 1
        subprocess.run(["ip", "link", "add", f"eth{self.ports}", "type", "veth", "peer", "name", f"peer{self.ports}"],
                       check=True)

    def succeeds(self, result):
        self.assertEqual((result.returncode, result.stderr), (0, ""), result)
        return result.stdout

    def fails(self, result, status, reason):
        self.assertEqual((result.returncode, result.stdout), (status, ""), result)
        self.assertRegex(result.stderr, rf"\Awelcomer: [^\n]*{reason}[^\n]*\n\Z")

    def add_anna(self):
        """Somebody who can sign in, as whoever may read the machine's directory of users."""
        self.succeeds(self.tool("account", "add", "anna"))
        (self.root / DIRECTORY).chmod(0o644)

    def users(self, directory=None):
        return sorted(plistlib.loads((directory or self.root / DIRECTORY).read_bytes())["Users"])


class Locks(InstalledTest):
    def setUp(self):
        super().setUp()
        self.machine.start_system_log()
        (self.root / "etc/resolv.conf").write_text("nameserver 127.0.0.1\n")

    def hold(self, kind, user=OTHER, below=("etc", "var", "home", "run")):
        """Has a user lock everything that this user can open.  result: the paths that are held"""
        paths = [str(path) for top in below for path in (self.root / top, *(self.root / top).rglob("*"))]
        inside = ["/" + str(Path(path).relative_to(self.root)) for path in paths]
        holder = subprocess.Popen(
            ["/usr/sbin/chroot", "--userspec", f"{user}:{user}", "--groups", "", str(self.root), "/usr/bin/python3", "-c",
             HOLDER, kind, *inside], stdin=subprocess.DEVNULL, stdout=subprocess.PIPE, text=True)

        def end():
            holder.kill()
            holder.wait()
            holder.stdout.close()

        self.addCleanup(end)
        held = []
        while line := holder.stdout.readline().rstrip("\n"):
            held.append(line)
        return held

    def log_out(self):
        """Whoever is logged in already is not signed in, and so not stored, again."""
        path = self.home / "Library/Accounts/Accounts.plist"
        accounts = plistlib.loads(path.read_bytes())
        del accounts["LoggedInAccount"]
        path.write_bytes(plistlib.dumps(accounts))

    def store_replay(self):
        replay = self.root / "tmp/replay.plist"
        replay.write_bytes(plistlib.dumps(REPLAY))
        replay.chmod(0o644)
        self.succeeds(self.machine.run(
            [TOOL, "replay", "store", "--account", "anna", "--file", "/tmp/replay.plist", "--bundle",
             "/usr/local/share/welcomer/setup-bundle"], user=True))

    def start_agent(self):
        agent = self.machine.start(["/usr/local/bin/wlnimbussetup" if (self.root / "usr/local/bin/wlnimbussetup").exists()
                                    else "/usr/local/libexec/wlnimbussetup", LABEL], user=True)

        def end():
            agent.kill()
            agent.wait()

        self.addCleanup(end)
        return agent

    def texts(self):
        return [text for _, _, text in self.machine.log_records("wlnimbussetup")]

    def test_what_others_lock_keeps_nobody_waiting(self):
        self.add_anna()
        self.add_port()
        self.succeeds(self.tool("network", "register"))
        self.succeeds(self.tool("account", "sign-in", "anna", user=True))
        self.store_replay()
        for folder in (self.home, self.home / "Library", *(self.home / "Library").iterdir()):
            if folder.name != "Locks":
                folder.chmod(0o755)  # as another program may have made them
        for kind in ("shared", "exclusive"):
            held = self.hold(kind)
            for path in ("/etc", "/var/lib/welcomer", f"/home/{machine.USER}/Library/Accounts"):
                if kind == "shared":
                    self.assertIn(path, held)
            self.assertFalse([path for path in held if "ocks/" in path], held)
            self.succeeds(self.tool("account", "add", "bert-" + kind))
            self.add_port()
            self.succeeds(self.tool("network", "register"))
            self.succeeds(self.tool("switch", "select", "Q1"))
            self.succeeds(self.tool("switch", "select", "Prod"))
            self.log_out()
            self.succeeds(self.tool("account", "sign-in", "anna", user=True))
            self.succeeds(self.tool("state", "set", "PreviousBuildVersion", kind, user=True))
        self.start_agent()
        self.machine.wait_for(lambda: "delaying exit by two minutes" in self.texts(), "the agent's linger")
        self.assertFalse([text for text in self.texts() if "ailed" in text or "could not" in text], self.texts())
        accounts = plistlib.loads((self.home / "Library/Accounts/Accounts.plist").read_bytes())
        self.assertTrue(accounts["Accounts"]["anna"]["Services"]["com.corvid.nimbus.service.contacts"]["Enabled"])
        self.assertEqual(self.users(), ["anna", "bert-exclusive", "bert-shared"])

    def test_no_lock_can_be_opened_by_others(self):
        self.add_anna()
        self.succeeds(self.tool("account", "sign-in", "anna", user=True))
        self.succeeds(self.tool("state", "set", "PreviousBuildVersion", "1", user=True))
        self.store_replay()
        for folder, owner, names in (
                (self.root / "var/lib/welcomer/locks", 0, {"welcomer"}),
                (self.home / "Library/Locks", machine.UID, {"Accounts", "Credentials", "Preferences"})):
            status = folder.lstat()
            self.assertEqual((oct(status.st_mode), status.st_uid), (oct(0o40700), owner))
            self.assertLessEqual(names, {path.name for path in folder.iterdir()})
            for path in folder.iterdir():
                status = path.lstat()
                self.assertEqual((oct(status.st_mode), status.st_uid, status.st_size), (oct(0o100600), owner, 0), path)

    def test_a_lock_that_its_owner_keeps_is_a_failure_in_one_line_after_ten_seconds(self):
        self.add_anna()
        self.succeeds(self.tool("account", "sign-in", "anna", user=True))
        self.succeeds(self.tool("state", "set", "PreviousBuildVersion", "1", user=True))
        self.store_replay()
        self.log_out()
        self.assertIn("/var/lib/welcomer/locks/welcomer", self.hold("exclusive", 0, ("var/lib/welcomer/locks",)))
        held = self.hold("exclusive", machine.UID, (f"home/{machine.USER}/Library/Locks",))
        for name in ("Accounts", "Credentials", "Preferences"):
            self.assertIn(f"/home/{machine.USER}/Library/Locks/{name}", held)
        reason = "locked by another process: waited 10 seconds"
        self.fails(self.tool("account", "add", "bert"), 1, f"cannot add bert: /var/lib/welcomer/locks/welcomer is {reason}")
        self.assertEqual(self.users(), ["anna"])
        self.add_port()
        self.fails(self.tool("network", "register"), 1, reason)
        library = f"/home/{machine.USER}/Library"
        self.fails(self.tool("account", "sign-in", "anna", user=True), 1, f"{library}/Locks/Accounts is {reason}")
        self.fails(self.tool("state", "set", "PreviousBuildVersion", "2", user=True), 1,
                   f"could not be stored: .*{library}/Locks/Preferences is {reason}")
        self.fails(self.tool("replay", "delete", user=True), 1, f"is {reason}")
        # The agent goes on without, and says so.
        self.start_agent()
        self.machine.wait_for(lambda: "delaying exit by two minutes" in self.texts(), "the agent's linger", 150)
        self.assertIn("Failed to delete replay keychain item: 18", self.texts())
        self.assertIn(f"The accounts could not be stored: {library}/Locks/Accounts is {reason}", self.texts())

    def test_of_many_that_add_one_user_one_succeeds(self):
        commands = [["/bin/sh", "-c", f"echo secret | {TOOL} account add {name} --password-fd 0"]
                    for name in ("anna", "bert") for _ in range(6)]
        processes = [self.machine.start(command, stdout=subprocess.PIPE, stderr=subprocess.PIPE, text=True)
                     for command in commands]
        results = [(*process.communicate(timeout=100), process.returncode) for process in processes]
        for begin, name in ((0, "anna"), (6, "bert")):
            own = sorted(results[begin:begin + 6], key=lambda each: each[2])
            self.assertEqual(own[0], (f"Added {name}, who can sign in from now on.\n", "", 0))
            self.assertEqual(own[1:], [("", f"welcomer: the user {name} exists already\n", 1)] * 5)
        self.assertEqual(self.users(), ["anna", "bert"])

    def test_names_that_are_refused(self):
        for name in ("", "-anna", "-", "an/na", "/", "an\tna", "anna\n", "an\x01na", "an\x7fna", "an\u0085na", "an\ufffena",
                     "an\udcffna"):
            with self.subTest(name):
                self.fails(self.add(name), 2, "user's name ")
        self.assertFalse((self.root / "var/lib/welcomer").exists())
        for name in ("anna", "änna", "an na", "anna-"):
            self.succeeds(self.add(name))
        self.assertEqual(self.users(), ["an na", "anna", "anna-", "änna"])

    def add(self, name):
        return self.machine.run(["/bin/sh", "-c", f'echo secret | exec {TOOL} account add --password-fd 0 -- "$1"', "sh",
                                 name])

    def test_what_cannot_be_stored_is_named_with_its_path_and_reason(self):
        self.fails(self.tool("account", "add", "anna", "--mail", "a\x01"), 1,
                   f"cannot add anna: cannot write /{DIRECTORY}: .*XML")
        self.add_anna()
        (self.home / "Library").mkdir(mode=0o700, exist_ok=True)
        os.chown(self.home / "Library", machine.UID, machine.UID)
        accounts = self.home / "Library/Accounts"
        shutil.rmtree(accounts, ignore_errors=True)
        accounts.write_text("in the folder's place")
        self.fails(self.tool("account", "sign-in", "anna", user=True), 1,
                   f"the account could not be stored .*/home/{machine.USER}/Library/Accounts: Not a directory")


def without_openat2(number):
    """A filter of system calls that answers the kernel's own way below a root with an error number."""
    libc = ctypes.CDLL(None, use_errno=True)
    steps = [(0x20, 0, 0, 0),            # the number of the call
             (0x15, 0, 1, 437),          # openat2?
             (0x06, 0, 0, 0x00050000 | number),
             (0x06, 0, 0, 0x7FFF0000)]   # allowed
    code = ctypes.create_string_buffer(b"".join(struct.pack("HBBI", *step) for step in steps))
    program = ctypes.create_string_buffer(struct.pack("HxxxxxxP", len(steps), ctypes.addressof(code)))

    def install():
        if libc.prctl(38, 1, 0, 0, 0) != 0 or libc.prctl(22, 2, program, 0, 0) != 0:
            os._exit(99)

    install.keep = code
    return install


class BelowRoot(InstalledTest):
    """Below --root links lead to where they lead in that system."""

    def setUp(self):
        super().setUp()
        self.dir = self.root / "srv/image"
        self.dir.mkdir(parents=True)
        self.outside = self.root / "outside"
        for name in ("lib/welcomer", "etc", "home/Library"):
            (self.outside / name).mkdir(parents=True)

    def below(self, *arguments, **options):
        return self.tool(*arguments, "--root", "/srv/image", **options)

    def snapshot(self):
        return sorted((str(path), path.is_file() and path.read_bytes()) for path in self.outside.rglob("*"))

    def ways(self):
        """By the kernel, and by hand, where the kernel or a filter refuses the call."""
        return {"kernel": {}, "ENOSYS": {"preexec_fn": without_openat2(38)}, "EPERM": {"preexec_fn": without_openat2(1)}}

    def test_nothing_is_read_or_written_outside(self):
        for way, options in self.ways().items():
            with self.subTest(way):
                shutil.rmtree(self.dir)
                self.dir.mkdir()
                (self.dir / "outside/lib").mkdir(parents=True)
                (self.dir / "outside/etc").mkdir()
                (self.dir / "var").symlink_to("/outside")
                (self.dir / "etc").symlink_to("../../../outside/etc")
                (self.dir / "outside/home").mkdir()
                (self.dir / "root").symlink_to("/outside/home")
                before = self.snapshot()
                self.add_port()
                self.succeeds(self.below("account", "add", "anna", **options))
                self.succeeds(self.below("account", "sign-in", "anna", **options))
                self.succeeds(self.below("network", "register", **options))
                self.succeeds(self.below("switch", "select", "Q1", **options))
                self.assertEqual(self.succeeds(self.below("switch", "show", **options)), "Q1\n")
                self.assertEqual(self.snapshot(), before)
                below = self.dir / "outside"
                self.assertEqual(self.users(below / "lib/welcomer/nimbus-directory.plist"), ["anna"])
                self.assertTrue((below / "lib/welcomer/network.plist").exists())
                self.assertTrue((below / "home/Library/Accounts/Accounts.plist").exists())
                self.assertEqual(len(list((below / "etc/resolver").iterdir())), 4)

    def test_the_story_is_not_told_outside(self):
        (self.outside / "System").mkdir()
        (self.dir / "System").symlink_to("/outside/System")
        before = self.snapshot()
        result = self.machine.run([TOOL, "try", "--time-lapse", "--root", "/srv/image"])
        self.assertEqual(result.returncode, 1)
        self.assertRegex(result.stderr, r"\Awelcomer: a link leads from /srv/image/System[^\n]* out of /srv/image\n\Z")
        self.assertEqual(self.snapshot(), before)

    def test_a_link_to_what_is_not_there_is_not_followed_out(self):
        (self.dir / "var").symlink_to("/outside")  # which only the machine has
        before = self.snapshot()
        for options in self.ways().values():
            self.fails(self.below("account", "add", "anna", **options), 1, "/srv/image/var/lib/welcomer")
        self.assertEqual(self.snapshot(), before)

    def test_plug_ins_come_from_below(self):
        plugins = "System/Library/CoreServices/FirstRunPlugins"
        example = next((self.root / "usr/local").rglob("Vidlink.ncdplugin"))
        (self.outside / "plugins").mkdir()
        copy = shutil.copytree if example.is_dir() else shutil.copy
        copy(example, self.outside / "plugins/Vidlink.ncdplugin")
        (self.dir / plugins).parent.mkdir(parents=True)
        (self.dir / plugins).symlink_to("/outside/plugins")
        for way, options in self.ways().items():
            with self.subTest(way):
                self.assertNotIn("vidlink", self.succeeds(self.below("plugins", "list", **options)).lower())
        shutil.copytree(self.outside / "plugins", self.dir / "outside/plugins")
        for way, options in self.ways().items():
            with self.subTest(way):
                self.assertIn("com.corvid.vidlink", self.succeeds(self.below("plugins", "list", **options)))


if __name__ == "__main__":
    machine.enter_namespaces()
    InstalledTest.build = sys.argv[1]
    unittest.main(argv=[sys.argv[0], *sys.argv[2:]], verbosity=2)
