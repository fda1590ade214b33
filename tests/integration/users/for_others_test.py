#!/usr/bin/env python3
"""Root works for another user with the installed tool (--user), and that user logs in.

usage: for_others_test.py BUILD_DIR
"""

import json
import os
import plistlib
import shutil
import signal
import socket
import sys
import tempfile
import unittest
from pathlib import Path

sys.path.insert(0, str(Path(__file__).resolve().parents[2] / "support"))
import machine  # noqa: E402

TOOL = "/usr/local/bin/welcomer"
LABEL = "com.corvid.welcomer.nimbussetup.user"
DIRECTORY = "var/lib/welcomer/nimbus-directory.plist"
SERVICE = "com.corvid.nimbus.service."
PASSWORD = "open sesame"
OTHER, OTHER_ID = "bert", 31998
CLOSED, CLOSED_ID = "daemon", 31997
HOMELESS, HOMELESS_ID = "carla", 31996
GROUP_ID = 31900  # of a group that the user is in, too
IDENTIFIERS = ["com.corvid.chatter", "com.corvid.storefront", "com.corvid.vidlink"]
REPLAY = {"delegatesResponseDict": {"delegates": {"com.corvid.vidlink": {"status": 0}}}, "vlAliases": [], "imAliases": []}


class ForOthersTest(unittest.TestCase):
    build = None

    @classmethod
    def setUpClass(cls):
        cls.folder = Path(tempfile.mkdtemp(prefix="for-others-"))
        cls.addClassCleanup(cls.folder.rmdir)
        cls.machine = machine.Machine(cls.folder / "machine")
        cls.addClassCleanup(cls.machine.stop)
        cls.machine.install(cls.build)
        cls.root = cls.machine.root
        cls.homes = {machine.USER: cls.machine.home, OTHER: cls.root / "home" / OTHER}
        cls.ids = {machine.USER: machine.UID, OTHER: OTHER_ID}
        cls.prepare()

    @classmethod
    def prepare(cls):
        with (cls.root / "etc/passwd").open("a") as passwd:
            passwd.write(f"{OTHER}:x:{OTHER_ID}:{OTHER_ID}::/home/{OTHER}:/bin/bash\n"
                         f"{CLOSED}:x:{CLOSED_ID}:{CLOSED_ID}::/home/{OTHER}:/usr/sbin/nologin\n"
                         f"{HOMELESS}:x:{HOMELESS_ID}:{HOMELESS_ID}::/home/{HOMELESS}:/bin/sh\n")
        with (cls.root / "etc/group").open("a") as group:
            group.write(f"{OTHER}:x:{OTHER_ID}:\nfriends:x:{GROUP_ID}:{machine.USER},somebody\n")
        plugins = cls.root / "System/Library/CoreServices/FirstRunPlugins"
        plugins.mkdir(parents=True)
        for plugin in (Path(cls.build) / "plugins").glob("*.ncdplugin"):
            (shutil.copytree if plugin.is_dir() else shutil.copy)(plugin, plugins / plugin.name)

    def setUp(self):
        """Fresh homes, and nobody who can sign in."""
        for user, home in self.homes.items():
            shutil.rmtree(home, ignore_errors=True)
            home.mkdir(mode=0o700)
            os.chown(home, self.ids[user], self.ids[user])
        shutil.rmtree(self.root / "var/lib", ignore_errors=True)
        (self.root / "var/lib").mkdir()
        self.write_for_root("answers.plist", {"Account": "anna"})
        self.write_for_root("replay.plist", REPLAY)

    def write_for_root(self, name, content):
        """A file that nobody but root can read, nor find."""
        path = self.root / "root" / name
        path.write_bytes(plistlib.dumps(content))
        path.chmod(0o600)

    def tool(self, *arguments, user=False, password=PASSWORD, before=(), **options):
        reading, writing = os.pipe()
        os.write(writing, password.encode() + b"\n")
        os.close(writing)
        asks = arguments[0] == "setup" and "--answers" in arguments or arguments[:2] in (
            ("account", "add"), ("account", "sign-in"))
        try:
            return self.machine.run([*before, TOOL, *arguments, *(["--password-fd", str(reading)] if asks else [])],
                                    user=user, pass_fds=[reading], **options)
        finally:
            os.close(reading)

    def add_anna(self):
        self.succeeds(self.tool("account", "add", "anna", "--mail", "anna@nimbus.example", "--alias", "+1 555 0100"))

    def set_up(self, user, *more, **options):
        return self.tool("setup", "--user", user, "--answers", "/root/answers.plist", *more, **options)

    def succeeds(self, result):
        self.assertEqual((result.returncode, result.stderr), (0, ""), result)
        return result.stdout

    def fails(self, result, status, reason):
        self.assertEqual((result.returncode, result.stdout), (status, ""), result)
        self.assertRegex(result.stderr, rf"\Awelcomer: [^\n]*{reason}[^\n]*\n\Z")

    def launch_agent(self, user):
        return self.homes[user] / "Library/LaunchAgents" / f"{LABEL}.plist"

    def outside(self):
        """Everything that is not below a user's home: what it is, whose, and what it holds."""
        found = {}
        for top in ("etc", "root", "var", "run", "tmp"):
            for path in (self.root / top, *(self.root / top).rglob("*")):
                if (self.root / "tmp/stage") not in (path, *path.parents):
                    status = path.lstat()
                    content = path.read_bytes() if path.is_file() and not path.is_symlink() else None
                    found[str(path)] = (status.st_mode, status.st_uid, status.st_gid, content)
        return found


class SettingUp(ForOthersTest):
    def test_root_sets_up_two_users_and_each_logs_in(self):
        self.machine.start_system_log()
        self.add_anna()
        before = self.outside()
        for user in (machine.USER, OTHER):
            document = json.loads(self.succeeds(self.set_up(user, "--json")))
            self.assertEqual((document["account"], document["aliases"]),
                             ("anna", {name: ["+1 555 0100"] for name in ("com.corvid.chatter", "com.corvid.vidlink")}))
            self.assertEqual(document["atNextLogin"]["delegates"], IDENTIFIERS)
        self.assertEqual({path: kept for path, kept in self.outside().items() if path not in before or before[path] != kept},
                         {}, "nothing outside the homes has changed")
        self.assertEqual(oct((self.root / DIRECTORY).stat().st_mode), oct(0o100600))
        for user in (machine.USER, OTHER):
            with self.subTest(user):
                self.all_belongs_to(user)
                self.log_in(user)

    def all_belongs_to(self, user):
        files = [path for path in self.homes[user].rglob("*")]
        self.assertIn(self.launch_agent(user), files)
        self.assertIn("Credentials", {path.name for path in files})
        for path in files:
            status = path.lstat()
            self.assertEqual((status.st_uid, status.st_gid), (self.ids[user], self.ids[user]), path)
            others = 0o755 if "LaunchAgents" in str(path) else 0o700
            self.assertEqual(oct(status.st_mode & 0o777 & ~others), "0o0", path)
        accounts = plistlib.loads((self.homes[user] / "Library/Accounts/Accounts.plist").read_bytes())
        self.assertEqual(accounts["LoggedInAccount"], "anna")
        services = accounts["Accounts"]["anna"]["Services"]
        self.assertTrue(services[SERVICE + "documents"]["Enabled"])
        self.assertNotIn("Enabled", services[SERVICE + "contacts"])
        self.assertEqual(services[SERVICE + "mail"]["Properties"]["com.corvid.nimbus.property.mailEmailAddress"],
                         "anna@nimbus.example")

    def log_in(self, user):
        definition = plistlib.loads(self.launch_agent(user).read_bytes())
        before = len(self.machine.log_records("wlnimbussetup"))
        agent = self.machine.start(definition["ProgramArguments"], user=self.ids[user])

        def end():
            agent.kill()
            agent.wait()

        self.addCleanup(end)
        texts = lambda: [text for _, _, text in self.machine.log_records("wlnimbussetup")[before:]]
        self.machine.wait_for(lambda: "delaying exit by two minutes" in texts(), "the agent's linger")
        self.assertIn("Enabling post-login services for account anna", texts())
        self.assertFalse([text for text in texts() if "ailed" in text or "could not" in text], texts())
        for name in IDENTIFIERS:
            self.assertTrue([text for text in texts() if text.startswith(name) and "completed" in text], name)
        accounts = plistlib.loads((self.homes[user] / "Library/Accounts/Accounts.plist").read_bytes())
        self.assertTrue(accounts["Accounts"]["anna"]["Services"][SERVICE + "contacts"]["Enabled"])
        self.assertFalse(self.launch_agent(user).exists())
        self.fails(self.tool("replay", "show", "--user", user), 1, "no such item")

    def test_who_cannot_be_acted_for(self):
        self.add_anna()
        before = self.outside()
        self.fails(self.set_up("nobody-here"), 1, "there is no user nobody-here")
        self.fails(self.set_up("root"), 2, "root is root")
        self.fails(self.set_up(""), 2, "the user's name is empty")
        self.fails(self.set_up(CLOSED), 1, f"the user {CLOSED} cannot log in: the shell is /usr/sbin/nologin")
        self.fails(self.set_up(HOMELESS), 1, f"the user {HOMELESS} has no home folder /home/{HOMELESS}: No such file")
        for name in (OTHER, machine.USER):
            self.fails(self.tool("account", "status", "--user", name, user=True), 1, "only root can act for another user")
        self.fails(self.tool("network", "register", "--user", OTHER), 2, "--user")
        self.assertEqual(self.outside(), before)

    def test_what_is_refused_is_told_as_without_the_option(self):
        self.fails(self.set_up(OTHER), 1, "directory of users is missing or cannot be read")
        self.succeeds(self.tool("account", "add", "carl"))
        self.fails(self.set_up(OTHER), 1, "there is no such user")
        self.add_anna()
        self.fails(self.set_up(OTHER, password="wrong"), 1, "the password is wrong")
        self.fails(self.tool("setup", "--user", OTHER, "--answers", "/root/nothing.plist"), 1,
                   "/root/nothing.plist: No such file")
        self.fails(self.tool("replay", "show", "--user", OTHER), 1, "no such item")
        self.assertFalse(self.launch_agent(OTHER).exists())
        (self.root / DIRECTORY).write_text("damaged")
        self.fails(self.set_up(OTHER), 1, "directory of users is missing or cannot be read")

    def test_the_replay_item_and_the_accounts_of_another_user(self):
        self.add_anna()
        self.succeeds(self.tool("replay", "store", "--user", OTHER, "--account", "anna", "--file", "/root/replay.plist",
                                "--bundle", "/usr/local/share/welcomer/setup-bundle"))
        for options in ({"user": OTHER_ID}, {}):
            asked = [] if options else ["--user", OTHER]
            shown = json.loads(self.succeeds(self.tool("replay", "show", "--json", *asked, **options)))
            self.assertEqual(shown, {"account": "anna", "replay": REPLAY})
        self.fails(self.tool("replay", "show"), 1, "no such item")
        self.succeeds(self.tool("replay", "delete", "--user", OTHER))
        self.fails(self.tool("replay", "show", user=OTHER_ID), 1, "no such item")
        self.succeeds(self.tool("account", "sign-in", "anna", "--user", OTHER))
        for user, logged_in in ((OTHER, "anna"), (machine.USER, None)):
            status = json.loads(self.succeeds(self.tool("account", "status", "--json", "--user", user)))
            self.assertEqual(status["loggedIn"], logged_in)
            listed = json.loads(self.succeeds(self.tool("account", "list", "--json", "--user", user)))
            self.assertEqual(listed["accounts"], [{"name": "anna", "canSignIn": True, "hasAccount": logged_in == "anna",
                                                   "loggedIn": logged_in == "anna"}])
        services = json.loads(self.succeeds(self.tool("account", "services", "--json", "--user", OTHER)))
        self.assertEqual(services["account"], "anna")

    def test_the_record_and_the_services_of_another_user(self):
        self.add_anna()
        before = self.outside()
        record = lambda *asked, **options: json.loads(self.succeeds(self.tool("state", "show", "--json", *asked, **options)))
        key = "DidSeeCloudSetup"
        self.assertEqual((record("--user", OTHER)["loaded"], record("--user", OTHER)["state"][key]), (True, False))
        self.succeeds(self.tool("state", "set", key, "true", "--user", OTHER))
        self.assertEqual(record("--user", OTHER), record(user=OTHER_ID))
        self.assertTrue(record(user=OTHER_ID)["state"][key])
        self.assertFalse(record("--user", machine.USER)["state"][key])
        self.succeeds(self.tool("state", "remove", key, "--user", OTHER))
        self.assertFalse(record(user=OTHER_ID)["state"][key])
        self.succeeds(self.tool("state", "seen", "cloud", "--user", OTHER))
        self.assertTrue(record(user=OTHER_ID)["state"][key])
        self.fails(self.tool("state", "seen", "cloud"), 1, "the superuser's record is not loaded")

        self.succeeds(self.tool("account", "sign-in", "anna", "--user", OTHER))
        self.succeeds(self.tool("services", "enable", "--account", "anna", "--phase", "pre", "--user", OTHER))
        services = json.loads(self.succeeds(self.tool("account", "services", "--json", user=OTHER_ID)))["services"]
        self.assertIn("documents", {each["service"] for each in services if each["enabled"]})
        self.assertEqual(self.outside(), before)
        for path in self.homes[OTHER].rglob("*"):
            self.assertEqual(path.lstat().st_uid, OTHER_ID, path)


class Rights(ForOthersTest):
    def links(self, user):
        """What a user may lay in the home's way, with the entry that is to be written through it."""
        library = self.homes[user] / "Library"
        return {"the library": (library, "/root"),
                "accounts": (library / "Accounts", "/etc"),
                "credentials": (library / "Credentials", "/var/lib/welcomer"),
                "locks": (library / "Locks", "/var/lib/welcomer/locks"),
                "agents": (library / "LaunchAgents", "/etc"),
                "the agent": (library / "LaunchAgents" / f"{LABEL}.plist", "/etc/agent.plist"),
                "an agent that is there": (library / "LaunchAgents" / f"{LABEL}.plist", "/etc/passwd"),
                "the account file": (library / "Accounts/Accounts.plist", "/etc/passwd"),
                "a new account file": (library / "Accounts/Accounts.plist", "/etc/accounts.plist"),
                "the items": (library / "Credentials/Credentials.plist", "/etc/passwd")}

    def test_nothing_is_written_through_a_link_that_the_user_laid(self):
        self.add_anna()
        (self.root / "var/lib/welcomer/locks").mkdir(exist_ok=True)
        before = self.outside()
        for name, (link, aim) in self.links(OTHER).items():
            with self.subTest(name):
                self.machine.run(["/bin/rm", "-rf", f"/home/{OTHER}/Library"], user=OTHER_ID)
                self.machine.run(["/bin/mkdir", "-p", f"/{link.parent.relative_to(self.root)}"], user=OTHER_ID)
                self.machine.run(["/bin/ln", "-s", aim, f"/{link.relative_to(self.root)}"], user=OTHER_ID)
                self.assertTrue(link.is_symlink())
                result = self.set_up(OTHER)
                self.assertIn(result.returncode, (0, 1), result)
                self.assertEqual(len(result.stderr.splitlines()), result.returncode, result)
                self.assertEqual(self.outside(), before)
                for path in self.homes[OTHER].rglob("*"):
                    self.assertEqual(path.lstat().st_uid, OTHER_ID, path)

    def waiting(self, user, environment=()):
        """A command that waits for its password.  result: it, its own process's folder, and the password's pipe"""
        reading, writing = os.pipe()
        self.addCleanup(os.close, writing)
        process = self.machine.start(["/usr/bin/env", *environment, TOOL, "setup", "--user", user, "--answers",
                                      "/root/answers.plist", "--password-fd", str(reading)], pass_fds=[reading],
                                     stdout=-1, stderr=-1, text=True)
        os.close(reading)
        self.addCleanup(lambda: (process.kill(), process.communicate()))
        found = []

        def has_child():
            for status in (self.root / "proc").glob("[0-9]*/status"):
                try:
                    if f"\nPPid:\t{process.pid}\n" in status.read_text():
                        found.append(status.parent)
                except OSError:
                    pass  # it has ended meanwhile
            return found

        self.machine.wait_for(has_child, "the user's process")
        child = found[0]
        self.machine.wait_for(lambda: "\nUmask:\t0077\n" in (child / "status").read_text(), "the user's umask")
        return process, child, writing

    def test_the_process_is_the_users_for_good(self):
        self.add_anna()
        process, child, writing = self.waiting(machine.USER)
        status = dict(line.split(":\t", 1) for line in (child / "status").read_text().splitlines() if ":\t" in line)
        self.assertEqual(status["Uid"].split(), [str(machine.UID)] * 4)
        self.assertEqual(status["Gid"].split(), [str(machine.UID)] * 4)
        self.assertEqual(sorted(status["Groups"].split()), sorted([str(machine.UID), str(GROUP_ID)]))
        for name in ("CapInh", "CapPrm", "CapEff", "CapAmb"):
            self.assertEqual(int(status[name], 16), 0, name)
        self.assertEqual(status["NoNewPrivs"], "1")
        self.assertEqual(os.readlink(child / "cwd"), str(self.root))
        self.assertEqual((child / "status").stat().st_uid, 0, "it cannot be traced")
        for name in ("mem", "environ", "maps"):
            looked = self.machine.run(["/bin/cat", f"/proc/{child.name}/{name}"], user=True)
            self.assertIn("Permission denied", looked.stderr, name)
        os.write(writing, PASSWORD.encode() + b"\n")
        out, error = process.communicate(timeout=60)
        self.assertEqual((process.returncode, error), (0, ""))
        self.assertIn("anna is set up.", out)

    def test_whoever_ends_the_one_ends_the_other(self):
        self.add_anna()
        process, child, _ = self.waiting(OTHER)
        process.kill()
        process.wait()
        # Nobody waits for a process without a parent here, so that its entry may stay.
        self.machine.wait_for(lambda: not child.exists() or "\nState:\tZ" in (child / "status").read_text(),
                              "the end of the user's process")
        process, child, _ = self.waiting(OTHER)
        os.kill(int(child.name), signal.SIGKILL)
        self.assertEqual(process.wait(timeout=60), -signal.SIGKILL)
        self.assertFalse(self.launch_agent(OTHER).exists())

    def test_neither_the_callers_session_bus_nor_the_users_is_asked(self):
        self.add_anna()
        buses = []
        runtime = self.root / "run/user" / str(OTHER_ID)
        runtime.mkdir(parents=True)
        os.chown(runtime, OTHER_ID, OTHER_ID)
        for path in (self.root / "run/bus", runtime / "bus"):
            bus = socket.socket(socket.AF_UNIX)
            self.addCleanup(bus.close)
            bus.bind(str(path))
            path.chmod(0o666)
            bus.listen()
            bus.setblocking(False)
            buses.append(bus)
        self.succeeds(self.set_up(OTHER, before=("/usr/bin/env", "DBUS_SESSION_BUS_ADDRESS=unix:path=/run/bus",
                                                 f"XDG_RUNTIME_DIR=/run/user/{OTHER_ID}")))
        for bus in buses:
            self.assertRaises(BlockingIOError, bus.accept)
        self.succeeds(self.tool("replay", "show", user=OTHER_ID))


if __name__ == "__main__":
    machine.enter_namespaces()
    ForOthersTest.build = sys.argv[1]
    unittest.main(argv=[sys.argv[0], *sys.argv[2:]], verbosity=2)
