#!/usr/bin/env python3
"""What the installed tool shows of logins: from a real syslog file and from a real journal.

usage: seeing_test.py BUILD_DIR [TEST ...]
"""

import json
import os
import plistlib
import shutil
import signal
import sys
import tempfile
import time
import unittest
import xml.etree.ElementTree as ElementTree
from pathlib import Path

sys.path.insert(0, str(Path(__file__).resolve().parents[2] / "support"))
import machine  # noqa: E402

LABEL = "com.corvid.welcomer.nimbussetup.user"
ACCOUNT = "newcomer@nimbus.example"
TOOL = "/usr/local/bin/welcomer"
BUNDLE = "/usr/local/share/welcomer/setup-bundle"
REPLAY = {"delegatesResponseDict": {"delegates": {"com.corvid.nowhere": {"status": 0}}}}
JOURNAL = "0123456789abcdef0123456789abcdef"


class Seeing(unittest.TestCase):
    build = None

    def setUp(self):
        self.folder = Path(tempfile.mkdtemp(prefix="seeing-"))
        self.machine = machine.Machine(self.folder / "machine")
        self.machine.install(self.build)
        self.root = self.machine.root
        (self.root / "var/log").mkdir()
        replay = self.root / "tmp/replay.plist"
        replay.write_bytes(plistlib.dumps(REPLAY))
        replay.chmod(0o644)
        self.file = self.machine.home / "Library/LaunchAgents" / f"{LABEL}.plist"
        self.agents = []

    def tearDown(self):
        for agent in self.agents:
            agent.kill()
            agent.wait()
        self.machine.stop()
        shutil.rmtree(self.folder)

    def tool(self, *arguments, user=True):
        return self.machine.run([TOOL, *arguments], user=user)

    def json(self, *arguments, status=0, user=True):
        done = self.tool("--json", *arguments, user=user)
        self.assertEqual(done.returncode, status, done)
        return json.loads(done.stdout)

    def store(self):
        done = self.tool("replay", "store", "--account", ACCOUNT, "--file", "/tmp/replay.plist", "--bundle", BUNDLE)
        self.assertEqual(done.returncode, 0, done)
        self.program = plistlib.loads(self.file.read_bytes())["ProgramArguments"]

    def log_in(self, expected, **options):
        """Starts the agent as a login does, and waits for a line of it."""
        before = self.lines().count(expected)
        self.agents.append(self.machine.start(self.program, user=True, **options))
        self.machine.wait_for(lambda: self.lines().count(expected) > before, f"the line {expected!r}")
        return self.agents[-1]

    def follow_two_logins(self, between):
        self.store()
        followed = self.root / "tmp/followed"
        with open(followed, "w") as out:
            follower = self.machine.start([TOOL, "--json", "log", "--follow"], user=True, stdout=out)
        self.agents.append(follower)
        self.wait_until_it_sleeps(follower)
        self.log_in("delaying exit by two minutes")
        self.machine.wait_for(lambda: "delaying exit" in followed.read_text(), "the followed line")
        self.wait_until_it_sleeps(follower)
        between()
        self.assertEqual(self.machine.run(["/usr/bin/logger", "-t", "other", "hello"], user=True).returncode, 0)
        self.wait_until_it_sleeps(follower)
        self.assertNotIn("hello", followed.read_text())
        self.log_in("exiting").wait(timeout=60)  # which finds no item any more
        self.machine.wait_for(lambda: '"exiting"' in followed.read_text(), "the followed end")
        follower.send_signal(signal.SIGINT)
        self.assertEqual(follower.wait(timeout=60), -signal.SIGINT)
        lines = [json.loads(line)["message"] for line in followed.read_text().splitlines()]
        second = lines.index("Self destructing...", 1)
        self.assertEqual((lines[0], lines[-1]), ("Self destructing...", "exiting"))
        for login in (lines[:second], lines[second:]):
            self.assertEqual(len(login), len(set(login)))

    def wait_until_it_sleeps(self, process):
        """Returns when the process has not been awake for a while, not even to look around."""
        status = self.root / f"proc/{process.pid}/status"

        def sleeps():
            before = [line for line in status.read_text().splitlines() if "ctxt_switches" in line]
            time.sleep(2)
            return before == [line for line in status.read_text().splitlines() if "ctxt_switches" in line]

        self.machine.wait_for(sleeps, "the follower's sleep")

    def lines(self):
        """The messages of all logins, as root is shown them."""
        done = self.machine.run([TOOL, "--json", "log", "--last", "100", "--user", machine.USER])
        found = json.loads(done.stdout)["logins"] if done.returncode == 0 else []
        return [line["message"] for login in found for line in login["lines"]]

    def to_do(self, status):
        return [each["what"] for each in self.json("status", status=status)["toDo"]]


class SyslogFile(Seeing):
    """Without a journal: rsyslogd writes a file, which the users of this machine may read."""

    template = "RSYSLOG_TraditionalFileFormat"

    def setUp(self):
        super().setUp()
        (self.root / "etc/rsyslog.conf").write_text("\n".join([
            'module(load="imuxsock")',
            f'*.* action(type="omfile" file="/var/log/syslog" template="{self.template}" fileCreateMode="0644")', ""]))
        self.machine._daemons.append(self.machine.start(
            ["/usr/sbin/rsyslogd", "-n", "-f", "/etc/rsyslog.conf", "-i", "/run/rsyslogd.pid"]))
        self.machine.wait_for(lambda: (self.root / "dev/log").exists(), "the system log's socket")

    def test_from_nothing_at_all_to_a_login_that_was_broken_off(self):
        seen = self.json("status")
        self.assertEqual((seen["waiting"]["item"], seen["waiting"]["agent"], seen["waiting"]["fit"], seen["lastLogin"],
                          seen["toDo"]), (False, False, True, None, []))

        self.store()
        seen = self.json("status")
        self.assertEqual((seen["waiting"]["item"], seen["waiting"]["agent"], seen["waiting"]["fit"],
                          seen["waiting"]["store"], seen["waiting"]["account"]), (True, True, True, "local file", ACCOUNT))

        definition = self.file.read_bytes()
        self.file.unlink()
        self.assertEqual(self.to_do(1), ["an item waits, but no agent will start for it"])
        shown = self.tool("status")
        self.assertEqual((shown.returncode, shown.stderr), (1, "welcomer: one thing is to be done\n"))
        self.assertIn("    advice: welcomer replay arm installs the agent", shown.stdout)
        self.file.write_bytes(definition)
        os.chown(self.file, machine.UID, machine.UID)

        agent = self.log_in("delaying exit by two minutes")
        seen = self.json("status", status=1)
        self.assertEqual((seen["lastLogin"]["end"], seen["lastLogin"]["account"]), ("running", ACCOUNT))
        self.assertIn("the agent still runs", self.tool("status").stdout)

        agent.kill()
        agent.wait()
        self.assertIn("the agent of the last login was ended before it was done", self.to_do(1))
        self.assertEqual(self.json("status", status=1)["lastLogin"]["end"], "unfinished")
        self.assert_log_and_picture()

    def assert_log_and_picture(self):
        # A second start, which finds no item and ends.
        self.log_in("exiting").wait(timeout=60)
        last = self.json("log")
        self.assertEqual((last["source"], len(last["logins"])), ("/var/log/syslog", 1))
        messages = [line["message"] for line in last["logins"][0]["lines"]]
        self.assertEqual((messages[0], messages[-1]), ("Self destructing...", "exiting"))
        self.assertEqual(self.json("status")["lastLogin"]["itemStatus"], 2)
        both = self.json("log", "--last", "2")["logins"]
        self.assertIn("delaying exit by two minutes", [line["message"] for line in both[0]["lines"]])
        self.assertEqual(both[0]["lines"][0]["seconds"], 0)
        self.assertEqual(len(self.json("log", "--since", "1h")["logins"]), 2)
        self.assertEqual(self.json("log", "--since", "2100-01-01")["logins"], [])
        self.assertEqual(self.tool("log", "--since", "soon").returncode, 2)
        shown = self.tool("log").stdout
        self.assertRegex(shown, r"\A\d{4}-\d\d-\d\d \d\d:\d\d:\d\d\n      0\.000  Self destructing\.\.\.\n")
        self.assert_picture()

    def assert_picture(self):
        drawn = self.tool("log", "--picture", "/tmp/login.svg")
        self.assertEqual(drawn.returncode, 0, drawn)
        picture = ElementTree.parse(self.root / "tmp/login.svg").getroot()
        self.assertEqual(picture.tag, "{http://www.w3.org/2000/svg}svg")
        self.assertIn(machine.USER, picture[0].text)
        self.assertEqual([each.name for each in (self.root / "tmp").glob("*.svg*")], ["login.svg"])
        self.assertEqual(self.tool("log", "--picture", "/var/log/login.svg").returncode, 1)

    def test_lines_are_followed_into_the_file_that_is_begun_anew(self):
        file = self.root / "var/log/syslog"
        self.machine.run(["/usr/bin/logger", "-t", "other", "the first line"])
        self.machine.wait_for(file.exists, "the file")

        def begin_anew():
            file.rename(self.root / "var/log/syslog.1")
            self.machine._daemons[-1].send_signal(signal.SIGHUP)

        self.follow_two_logins(begin_anew)

    def test_a_file_that_only_administrators_read_is_said_in_one_line(self):
        self.store()
        self.log_in("delaying exit by two minutes")
        (self.root / "var/log/syslog").chmod(0o600)
        done = self.tool("log")
        self.assertEqual((done.returncode, done.stdout), (1, ""))
        self.assertRegex(done.stderr, r'\Awelcomer: administrators alone read /var/log/syslog: "sudo welcomer log '
                                      rf'--user {machine.USER}" shows them\n\Z')


class SyslogFileWithISOTimes(SyslogFile):
    template = "RSYSLOG_FileFormat"


class Journal(Seeing):
    """A real journald."""

    persistent = True

    def setUp(self):
        super().setUp()
        (self.root / "run/systemd/journal").mkdir(parents=True)
        if self.persistent:
            (self.root / "var/log/journal").mkdir()
            (self.root / "run/systemd/journal/flushed").touch()
        (self.root / "sys/fs/cgroup").mkdir(parents=True)
        machine.mount("none", self.root / "sys/fs/cgroup", "cgroup2")
        (self.root / "etc/machine-id").write_text(JOURNAL + "\n")
        os.symlink("/run/systemd/journal/dev-log", self.root / "dev/log")
        self.start_journal()

    def start_journal(self):
        self.machine._daemons.append(self.machine.start(["/lib/systemd/systemd-journald"]))
        self.machine.wait_for(lambda: (self.root / "run/systemd/journal/dev-log").exists(), "the journal's socket")


class PersistentJournal(Journal):
    def test_the_users_own_logins_and_nobody_elses(self):
        self.assertEqual(self.json("status")["lastLogin"], None)
        self.store()
        agent = self.log_in("delaying exit by two minutes")
        seen = self.json("log")
        self.assertEqual((seen["source"], seen["note"], len(seen["logins"])), ("journal", None, 1))
        self.assertEqual(seen["logins"][0]["lines"][0]["seconds"], 0)
        self.assertEqual(self.json("status", status=1)["lastLogin"]["end"], "running")
        agent.kill()
        agent.wait()
        self.assertEqual(self.json("status", status=1)["lastLogin"]["end"], "unfinished")
        # Root has no login, and asks for whom it names.
        self.assertEqual(self.json("log", user=False)["logins"], [])
        self.assertEqual(len(self.json("log", "--user", machine.USER, user=False)["logins"]), 1)
        self.assertRegex(self.tool("log", "--user", "nobody-here", user=False).stderr, "there is no user nobody-here")
        self.assertRegex(self.tool("log", "--user", "root").stderr, "only root can ask")

    def test_lines_are_followed_as_they_come(self):
        self.follow_two_logins(lambda: None)


class JournalOfAUnit(Journal):
    """The agent as a unit of the user's manager, as the journal sees it: by its cgroup."""

    unit = f"welcomer-agent-{LABEL}.service"

    def setUp(self):
        self.own = Path("/proc/self/cgroup").read_text().split("::", 1)[1].strip()
        super().setUp()

    def start_journal(self):
        cgroups = self.root / "sys/fs/cgroup"
        self.top = cgroups / f"welcomer-seeing-{os.getpid()}-{os.urandom(4).hex()}"
        self.service = (self.top / "user.slice" / f"user-{machine.UID}.slice" / f"user@{machine.UID}.service" /
                        "app.slice" / self.unit)
        self.service.mkdir(parents=True)
        # The journal takes the first process's cgroup for the root of all.
        (self.top / "init.scope").mkdir()
        self.enter(self.top / "init.scope")
        units = self.root / f"run/user/{machine.UID}/systemd/units"
        units.mkdir(parents=True)
        (units / f"invocation:{self.unit}").symlink_to("ab" * 16)
        super().start_journal()

    @staticmethod
    def enter(cgroup):
        (cgroup / "cgroup.procs").write_text("0")

    def tearDown(self):
        for process in [*self.agents, *self.machine._daemons]:
            process.kill()
            process.wait()
        self.enter(self.root / "sys/fs/cgroup" / self.own.lstrip("/"))
        self.machine.wait_for(lambda: machine.remove_cgroups(self.top), "the end of the test's processes")
        super().tearDown()

    def test_what_a_program_of_the_unit_says_is_of_that_login(self):
        self.store()
        self.log_in("delaying exit by two minutes", preexec_fn=lambda: self.enter(self.service))
        # It stays until it has been heard: the journal does not know the unit of a program that is gone.
        self.agents.append(self.machine.start(
            ["/usr/bin/python3", "-c", "import syslog, time; syslog.openlog('helper'); "
             "syslog.syslog('started by a plug-in'); time.sleep(600)"], user=True,
            preexec_fn=lambda: self.enter(self.service)))
        elsewhere = self.machine.run(["/usr/bin/logger", "-t", "helper", "started by somebody else"], user=True)
        self.assertEqual(elsewhere.returncode, 0)
        self.machine.wait_for(lambda: "started by a plug-in" in self.lines(), "the plug-in's line")
        lines = self.json("log")["logins"][0]["lines"]
        self.assertEqual([line["message"] for line in lines if line["program"] == "helper"], ["started by a plug-in"])
        self.assertIn("[helper] started by a plug-in", self.tool("log").stdout)


class VolatileJournal(Journal):
    persistent = False

    def test_it_is_root_who_reads_it_and_the_user_is_told_so(self):
        self.store()
        self.log_in("delaying exit by two minutes")
        done = self.tool("log")
        self.assertEqual((done.returncode, done.stdout), (1, ""))
        self.assertEqual(done.stderr.count("\n"), 1)
        self.assertRegex(done.stderr, "administrators alone read them")
        self.assertEqual(len(self.json("log", "--user", machine.USER, user=False)["logins"]), 1)
        self.assertIn("administrators alone read them", self.tool("status").stdout)


if __name__ == "__main__":
    machine.enter_namespaces()
    Seeing.build = sys.argv[1]
    unittest.main(argv=sys.argv[:1] + sys.argv[2:], verbosity=2)
