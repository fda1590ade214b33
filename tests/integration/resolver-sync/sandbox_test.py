#!/usr/bin/env python3
"""The installed unit of the resolver service: started by the real systemd as its own user, in its sandbox, it works.

usage: sandbox_test.py BUILD_DIR RESOLVED_DIR
"""

import re
import shutil
import subprocess
import sys
import tempfile
import unittest
from pathlib import Path

sys.path.insert(0, str(Path(__file__).resolve().parents[2] / "support"))
import booted  # noqa: E402
import machine  # noqa: E402
import resolver  # noqa: E402

UNIT, USER = "welcomer-resolver-sync.service", "welcomer-resolver"


class Sandbox(unittest.TestCase):
    build = resolved = None

    @classmethod
    def setUpClass(cls):
        cls.folder = Path(tempfile.mkdtemp(prefix="sandbox-"))
        cls.addClassCleanup(shutil.rmtree, cls.folder)
        cls.addClassCleanup(subprocess.run, ["ip", "link", "delete", resolver.LINK], check=False, capture_output=True)
        subprocess.run(["ip", "link", "set", "lo", "up"], check=True)
        cls.machine = booted.BootedMachine(cls.folder / "machine")
        cls.addClassCleanup(cls.machine.stop)
        cls.machine.install(cls.build)
        cls.install_resolver()
        done = cls.machine.run(["/usr/bin/systemctl", "preset", UNIT])
        assert done.returncode == 0, done
        cls.machine.boot()
        cls.was_enabled = cls.machine.systemctl("is-enabled", UNIT, check=False).stdout.strip()
        cls.was_active = cls.machine.systemctl("is-active", UNIT, check=False).stdout.strip()
        cls.machine.systemctl("start", "systemd-resolved.service")
        cls.machine.daemons_outside = resolver.start_environments()
        for daemon in cls.machine.daemons_outside:
            cls.addClassCleanup(daemon.wait)
            cls.addClassCleanup(daemon.terminate)

    @classmethod
    def install_resolver(cls):
        """systemd-resolved from its folder, where the machine's own would be."""
        root = cls.machine.root
        inside = root / resolver.RESOLVED.lstrip("/")
        inside.mkdir(parents=True)
        machine.mount(cls.resolved, inside, None, machine.MS_BIND)
        for source, target in (("usr/share/dbus-1/system.d", "etc/dbus-1/system.d"), ("usr/lib/sysusers.d", "etc/sysusers.d")):
            (root / target).mkdir(parents=True, exist_ok=True)
            for file in (Path(cls.resolved) / source).glob("*"):
                shutil.copy(file, root / target)
        unit = (Path(cls.resolved) / "lib/systemd/system/systemd-resolved.service").read_text(encoding="utf-8")
        unit = re.sub(r"^ExecStart=.*$", f"ExecStart={resolver.RESOLVED}/lib/systemd/systemd-resolved", unit, flags=re.M)
        (root / "etc/systemd/system/systemd-resolved.service").write_text(unit, encoding="utf-8")
        actions = cls.folder / "actions"
        shutil.copytree("/usr/share/polkit-1/actions", actions)
        for file in (Path(cls.resolved) / "usr/share/polkit-1/actions").glob("*"):
            shutil.copy(file, actions)
        machine.mount(actions, root / "usr/share/polkit-1/actions", None, machine.MS_BIND)
        (root / "etc/resolv.conf").write_text("nameserver 127.0.0.53\n", encoding="ascii")

    def select(self, name):
        selected = self.machine.run(["/usr/local/bin/welcomer", "switch", "select", name])
        self.assertEqual(selected.returncode, 0, selected)

    def wait_for_answer(self, name, answer):
        try:
            self.machine.wait_for(lambda: resolver.ask(name) == answer, f"{answer} for {name}", 30)
        except TimeoutError as error:
            raise AssertionError(f"{error}: {self.machine.journal('-u', UNIT)}") from error

    def status_of(self, process):
        text = (self.machine.inside / f"proc/{process}/status").read_text(encoding="ascii")
        return dict(line.split(":\t", 1) for line in text.splitlines() if ":\t" in line)

    def test_1_the_preset_leaves_it_disabled(self):
        self.assertEqual((self.was_enabled, self.was_active), ("disabled", "inactive"))

    def test_2_its_exposure_is_low(self):
        rated = self.machine.run(["/usr/bin/systemd-analyze", "security", "--offline=yes", "--threshold=20",
                                  f"/usr/local/lib/systemd/system/{UNIT}"])
        self.assertIn("Overall exposure level", rated.stdout)
        self.assertEqual(rated.returncode, 0, rated.stdout.splitlines()[-1])

    def test_3_it_runs_as_its_own_user_with_one_right_and_works(self):
        self.machine.systemctl("start", UNIT)
        process = self.machine.systemctl("show", UNIT, "--property=MainPID", "--value").stdout.strip()
        user = self.machine.run(["/usr/bin/id", "-u", USER]).stdout.strip()
        status = self.status_of(process)
        self.assertEqual(status["Uid"].split(), [user] * 4)
        self.assertEqual((status["CapEff"], status["CapBnd"]), (f"{1 << 12:016x}",) * 2)  # CAP_NET_ADMIN
        self.assertEqual((status["NoNewPrivs"], status["Seccomp"]), ("1", "2"))
        self.select("Nimbus1")
        for domain in resolver.DOMAINS:
            self.wait_for_answer(f"probe.{domain}", resolver.ANSWERS["Nimbus1"])
        forwarder, = [each for each in self.machine.run(["/usr/bin/pgrep", "-u", USER, "dnsmasq"]).stdout.split()]
        self.assertEqual(self.status_of(forwarder)["Uid"].split(), [user] * 4)
        report = self.machine.run(["/usr/local/bin/welcomer", "doctor"], user=True).stdout
        self.assertIn("the overrides have an effect", report)
        self.select("Nimbus2")
        self.wait_for_answer("probe.nimbus.example", resolver.ANSWERS["Nimbus2"])
        self.select("Prod")
        self.wait_for_answer("probe.nimbus.example", None)

    def test_4_its_end_leaves_nothing(self):
        self.machine.systemctl("start", UNIT)
        self.select("Nimbus1")
        self.wait_for_answer("probe.nimbus.example", resolver.ANSWERS["Nimbus1"])
        self.machine.systemctl("stop", UNIT)
        self.assertEqual(self.machine.systemctl("show", UNIT, "--property=Result", "--value").stdout.strip(), "success")
        self.assertFalse((self.machine.inside / "run/welcomer-resolver-sync").exists())
        self.assertEqual(self.machine.run(["/usr/bin/pgrep", "-u", USER]).stdout, "")
        self.assertNotIn("welcomer0", self.machine.run(["/bin/ip", "link"]).stdout)
        self.wait_for_answer("probe.nimbus.example", None)
        failures = [line for line in self.machine.journal("-t", "welcomer-resolver-sync") if "Failed" in line]
        self.assertEqual(failures, [])


if __name__ == "__main__":
    machine.enter_namespaces()
    machine.mount("proc", "/proc", "proc")
    Sandbox.build, Sandbox.resolved = sys.argv[1:]
    unittest.main(argv=sys.argv[:1], verbosity=2)
