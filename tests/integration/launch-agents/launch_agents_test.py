#!/usr/bin/env python3
"""The installed starter of launch agents at real logins: with a user manager, and in a session without one.

usage: launch_agents_test.py BUILD_DIR
"""

import configparser
import os
import plistlib
import shutil
import signal
import sys
import tempfile
import unittest
from pathlib import Path

sys.path.insert(0, str(Path(__file__).resolve().parents[2] / "support"))
import login as logins  # noqa: E402
import machine  # noqa: E402

PROGRAM = "/usr/local/libexec/welcomer-launch-agents"
UNIT = "welcomer-launch-agents.service"
# Leaves a line with its cgroup, its own and its session's process id, and its arguments; then does as its name says.
SCRIPT = """
session=$(cut -d' ' -f6 /proc/$$/stat)
group=$(grep '^0::' /proc/$$/cgroup)
printf '%s\\n' "$group $$ $session $(printf '[%s]' "$@")" >> /home/newcomer/out/"$0"
case $0 in
*bad) exit 3 ;;
*long) exec sleep 1000 ;;
esac
"""


class LaunchAgentsTest(unittest.TestCase):
    build = None

    def setUp(self):
        self.folder = Path(tempfile.mkdtemp(prefix="launch-agents-"))
        self.machine = machine.Machine(self.folder / "machine")
        self.machine.install(self.build)
        self.machine.enable_for_users(UNIT)
        self.machine.start_system_log()
        self.agents = self.machine.home / "Library/LaunchAgents"
        self.out = self.machine.home / "out"
        for folder in (self.agents.parent, self.agents, self.out):
            folder.mkdir()
            os.chown(folder, machine.UID, machine.UID)
        self.login = None

    def tearDown(self):
        if self.login:
            self.login.end()
        self.machine.stop()
        shutil.rmtree(self.folder)

    def add(self, label, *arguments, **others):
        path = self.agents / f"{label}.plist"
        path.write_bytes(plistlib.dumps({"Label": label, "RunAtLoad": True, "ProgramArguments":
                                         ["/bin/sh", "-c", SCRIPT, label, *arguments], **others}))
        os.chown(path, machine.UID, machine.UID)
        path.chmod(0o644)
        return path

    def runs(self, label):
        """What each run of an agent has left: (cgroup, process, session, arguments)."""
        path = self.out / label
        return [line.split(" ", 3) for line in path.read_text().splitlines()] if path.exists() else []

    def wait_for_runs(self, label, count=1):
        self.machine.wait_for(lambda: len(self.runs(label)) >= count, f"{count} run(s) of {label}")
        self.assertEqual(len(self.runs(label)), count)
        return self.runs(label)

    def log_in(self, **options):
        self.login = logins.Login(self.machine, **options)
        if self.login.manager:
            self.login.start_session()

    def log_out(self):
        self.login.end()
        self.login = None

    def records(self):
        return [record[2] for record in self.machine.log_records("welcomer-launch-agents")]

    def property(self, label, name):
        return self.login.systemctl("show", f"welcomer-agent-{label}.service", f"--property={name}",
                                    "--value").stdout.strip()

    def status(self, label):
        return " ".join(self.property(label, name) for name in ("ActiveState", "SubState", "Result", "ExecMainStatus"))

    def agent_units(self):
        listed = self.login.systemctl("list-units", "--all", "--plain", "--no-legend", "welcomer-agent-*").stdout
        return [line.split()[0] for line in listed.splitlines()]


class WithUserManager(LaunchAgentsTest):
    def test_each_agent_is_a_unit_of_its_own(self):
        self.add("org.example.long")
        self.add("org.example.other long")
        self.log_in()
        groups = [self.wait_for_runs(label)[0][0] for label in ("org.example.long", "org.example.other long")]
        self.assertRegex(groups[0], r"/app\.slice/welcomer-agent-org\.example\.long\.service$")
        self.assertRegex(groups[1], r"/app\.slice/welcomer-agent-org\.example\.other\\x20long\.service$")
        self.assertEqual(self.agent_units(), ["welcomer-agent-org.example.long.service",
                                              r"welcomer-agent-org.example.other\x20long.service"])
        self.assertEqual(self.records(), [])

    def test_arguments_reach_the_agent_as_they_stand(self):
        arguments = ["", "a b", "$HOME ${HOME} $$", "%h %%", "\"quoted' \\n", "é", ";"]
        self.add("one", *arguments)
        self.log_in()
        self.assertEqual(self.wait_for_runs("one")[0][3], "".join(f"[{each}]" for each in arguments))

    def test_an_administrator_can_disable_it(self):
        self.add("one")
        done = self.machine.run(["/usr/bin/systemctl", "--global", "disable", UNIT])
        self.assertEqual(done.returncode, 0, done)
        self.log_in()
        self.assertEqual(self.login.systemctl("is-active", UNIT, check=False).stdout.strip(), "inactive")
        self.assertEqual(self.login.systemctl("is-enabled", UNIT, check=False).stdout.strip(), "disabled")
        self.assertEqual(self.runs("one"), [])
        done = self.machine.run(["/usr/bin/systemctl", "--global", "preset", UNIT])
        self.log_out()
        self.log_in()
        self.wait_for_runs("one")

    def test_nothing_starts_before_the_session_is_up(self):
        self.add("one")
        self.login = logins.Login(self.machine)
        self.assertEqual(self.login.systemctl("is-active", UNIT, check=False).stdout.strip(), "inactive")
        self.assertEqual(self.runs("one"), [])
        self.login.start_session()
        self.wait_for_runs("one")

    def test_a_second_start_in_the_same_login_starts_nothing(self):
        self.add("one")
        self.log_in()
        self.wait_for_runs("one")
        self.add("two")
        again = self.login.run([PROGRAM])
        self.assertEqual((again.returncode, again.stdout, again.stderr), (0, "", ""))
        self.assertEqual((len(self.runs("one")), self.runs("two")), (1, []))
        self.assertEqual(self.agent_units(), ["welcomer-agent-one.service"])

    def test_the_next_login_starts_it_again(self):
        self.add("one")
        self.log_in()
        self.wait_for_runs("one")
        self.log_out()
        self.log_in()
        self.wait_for_runs("one", 2)

    def test_the_next_session_is_a_new_login_where_the_user_manager_lingers(self):
        self.add("one")
        self.log_in()
        self.wait_for_runs("one")
        self.login.end_session()
        self.assertEqual(list(self.login.runtime.glob("welcomer*")), [])
        self.login.start_session()
        self.wait_for_runs("one", 2)

    def test_agents_outlive_the_end_of_the_starters_unit(self):
        self.add("long")
        self.log_in()
        process = self.wait_for_runs("long")[0][1]
        self.login.systemctl("stop", UNIT)
        self.assertTrue((self.machine.root / "proc" / process).exists())
        self.assertEqual(self.agent_units(), ["welcomer-agent-long.service"])

    def test_how_an_agent_has_ended_can_be_asked_until_the_next_login(self):
        self.add("bad")
        self.add("good")
        self.log_in()
        ended = (("bad", "failed failed exit-code 3"), ("good", "active exited success 0"))
        for label, status in ended:
            self.wait_for_runs(label)
            self.machine.wait_for(lambda: self.status(label) == status, f"the end of {label}")
        self.assertEqual(self.agent_units(), ["welcomer-agent-bad.service", "welcomer-agent-good.service"])
        # Also where the user manager stays from one session to the next.
        before = self.property("good", "InvocationID")
        self.login.end_session()
        self.assertEqual([self.status(label) for label, _ in ended], [status for _, status in ended])
        self.login.start_session()
        for label, status in ended:
            self.wait_for_runs(label, 2)
            self.machine.wait_for(lambda: self.status(label) == status, f"the second end of {label}")
        self.assertNotEqual(self.property("good", "InvocationID"), before)
        self.assertEqual(self.records(), [])

    def test_an_agent_that_still_runs_is_not_started_twice(self):
        self.add("long")
        self.log_in()
        self.wait_for_runs("long")
        self.assertEqual(self.login.run([PROGRAM, "--end-of-login"]).returncode, 0)
        self.assertEqual(self.login.run([PROGRAM]).returncode, 0)
        self.machine.wait_for(lambda: self.records(), "the record of the refusal")
        self.assertRegex(self.records()[0], "^Failed to start launch agent long: .*welcomer-agent-long.service")
        self.assertEqual(len(self.runs("long")), 1)

    def test_the_manager_is_found_from_a_session_bus_that_it_is_not_on(self):
        self.add("one")
        self.login = logins.Login(self.machine)
        self.assertEqual(self.login.run(["/usr/bin/dbus-run-session", "--", PROGRAM]).returncode, 0)
        self.assertRegex(self.wait_for_runs("one")[0][0], r"/welcomer-agent-one\.service$")

    def test_a_manager_that_is_late_on_its_bus_is_waited_for(self):
        self.add("one")
        self.login = logins.Login(self.machine)
        # Whoever first connects starts the bus, and the manager joins it after that.
        self.login.systemctl("stop", "dbus.service")
        self.assertEqual(self.login.run([PROGRAM]).returncode, 0)
        self.assertRegex(self.wait_for_runs("one")[0][0], r"/welcomer-agent-one\.service$")

    def test_each_refused_file_costs_one_line(self):
        for name, change in (("a-foreign", lambda path: os.chown(path, 0, 0)),
                             ("b-group", lambda path: path.chmod(0o664)),
                             ("c-world", lambda path: path.chmod(0o646)),
                             ("d-nothing", lambda path: path.write_text("<plist>")),
                             ("e-backup", lambda path: path.rename(f"{path}~"))):
            change(self.add(name))
        self.add("good")
        self.log_in()
        self.wait_for_runs("good")
        begin = "Refusing launch agent /home/newcomer/Library/LaunchAgents/"
        self.machine.wait_for(lambda: len(self.records()) >= 5, "the records of five refusals")
        for record, end in zip(self.records(), (
                "a-foreign.plist: it belongs to another user", "b-group.plist: others may write to it",
                "c-world.plist: others may write to it", "d-nothing.plist: it is no property list: line 1, .*",
                "e-backup.plist~: it is no property list by its name"), strict=True):
            self.assertRegex(record, f"^{begin}{end}$")
        self.assertEqual([each.name for each in self.out.iterdir()], ["good"])
        self.assertEqual({record[:2] for record in self.machine.log_records("welcomer-launch-agents")},
                         {(115, "14.3")})


class WithoutUserManager(LaunchAgentsTest):
    def start(self, *before, **options):
        started = self.login.run([*before, PROGRAM], **options)
        self.assertEqual((started.returncode, started.stdout), (0, ""))

    def check_outlives_the_starter(self):
        _, process, session, _ = self.wait_for_runs("long")[0]
        self.assertEqual(process, session)
        self.assertTrue((self.machine.root / "proc" / process).exists())
        os.kill(int(process), signal.SIGKILL)

    def test_without_a_bus_an_agent_is_a_child_that_outlives_the_starter(self):
        self.add("long", "$HOME", "%h")
        self.log_in(with_manager=False)
        self.start()
        self.check_outlives_the_starter()
        self.assertEqual(self.runs("long")[0][3], "[$HOME][%h]")

    def test_on_a_bus_without_a_user_manager_too(self):
        self.add("long")
        self.log_in(with_manager=False)
        self.start("/usr/bin/dbus-run-session", "--")
        self.check_outlives_the_starter()

    def test_a_second_start_in_the_same_login_starts_nothing(self):
        self.add("one")
        self.log_in(with_manager=False)
        self.start()
        self.wait_for_runs("one")
        self.add("two")
        self.start()
        self.assertEqual((len(self.runs("one")), self.runs("two")), (1, []))
        self.log_out()
        self.log_in(with_manager=False)
        self.start()
        self.wait_for_runs("one", 2)

    def test_of_many_starts_at_once_one_starts_the_agents(self):
        self.add("one")
        self.log_in(with_manager=False)
        starts = [self.login.start([PROGRAM]) for _ in range(8)]
        self.assertEqual([start.wait(timeout=60) for start in starts], [0] * 8)
        self.wait_for_runs("one")

    def test_a_login_without_a_runtime_folder_starts_them_and_says_so(self):
        self.add("one")
        self.log_in(with_manager=False)
        self.start(environment={"XDG_RUNTIME_DIR": ""})
        self.wait_for_runs("one")
        self.machine.wait_for(lambda: self.records(), "the record")
        self.assertEqual(self.records(), ["Launch agents may start more than once: this login has no runtime folder"])

    def test_an_agent_whose_program_is_missing_costs_one_line(self):
        self.add("one", ProgramArguments=["/missing/program"])
        self.add("two")
        self.log_in(with_manager=False)
        self.start()
        self.wait_for_runs("two")
        self.machine.wait_for(lambda: self.records(), "the record")
        self.assertEqual(self.records(), ["Failed to start launch agent one: No such file or directory"])

    def test_the_autostart_entry_starts_it_where_systemd_does_not_run_the_session(self):
        self.add("one")
        entry = configparser.ConfigParser(interpolation=None)
        entry.optionxform = str
        entry.read(self.machine.root / "etc/xdg/autostart/welcomer-launch-agents.desktop")
        self.assertEqual(entry["Desktop Entry"]["Type"], "Application")
        self.assertEqual(entry["Desktop Entry"]["X-systemd-skip"], "true")
        self.log_in(with_manager=False)
        self.assertEqual(self.login.run(entry["Desktop Entry"]["Exec"].split()).returncode, 0)
        self.wait_for_runs("one")

    def test_another_argument_is_a_mistake(self):
        self.log_in(with_manager=False)
        refused = self.login.run([PROGRAM, "--start-of-login"])
        self.assertEqual((refused.returncode, refused.stdout), (2, ""))
        self.assertIn("usage:", refused.stderr)


if __name__ == "__main__":
    machine.enter_namespaces()
    LaunchAgentsTest.build = sys.argv.pop(1)
    unittest.main(verbosity=2)
