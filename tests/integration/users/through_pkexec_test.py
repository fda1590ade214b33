#!/usr/bin/env python3
"""A graphical first run, which is no administrator's, sets up another user through a real pkexec and polkitd.

usage: through_pkexec_test.py BUILD_DIR
"""

import plistlib
import shutil
import sys
import unittest
from pathlib import Path

sys.path.insert(0, str(Path(__file__).resolve().parents[2] / "support"))
import machine  # noqa: E402
from for_others_test import OTHER, OTHER_ID, PASSWORD, TOOL, ForOthersTest  # noqa: E402

ACTION = "com.corvid.welcomer.setup-user"
RULE = f"""polkit.addRule(function(action, subject) {{
    if (action.id == "{ACTION}" && subject.user == "{machine.USER}") return polkit.Result.YES;
}});
"""
ANSWERS = plistlib.dumps({"Account": "anna"}).decode()
POLKITD = next((path for path in ("/usr/lib/polkit-1/polkitd", "/usr/libexec/polkitd") if Path(path).exists()), None)


class ThroughPkexec(ForOthersTest):
    @classmethod
    def prepare(cls):
        super().prepare()
        for program in ("/usr/bin/pkexec", POLKITD):
            if not program or not Path(program).exists():
                raise AssertionError("pkexec and polkitd are not installed")
        for name in ("passwd", "group"):
            own = [line for line in Path("/etc", name).read_text().splitlines()
                   if line.split(":")[0] in ("messagebus", "polkitd")]
            with (cls.root / "etc" / name).open("a") as file:
                file.write("\n".join(own) + "\n")
        actions = cls.root / "tmp/actions"
        actions.mkdir()
        for folder in ("/usr/share/polkit-1/actions", cls.root / "usr/local/share/polkit-1/actions"):
            shutil.copytree(folder, actions, dirs_exist_ok=True)
        assert (actions / f"{ACTION}.policy").exists()
        machine.mount(actions, cls.root / "usr/share/polkit-1/actions", None, machine.MS_BIND)
        rules = cls.root / "etc/polkit-1/rules.d"
        rules.mkdir(parents=True, exist_ok=True)
        (rules / "10-first-run.rules").write_text(RULE)
        (cls.root / "etc/pam.d").mkdir(exist_ok=True)
        (cls.root / "etc/pam.d/polkit-1").write_text("".join(
            f"{kind} required pam_permit.so\n" for kind in ("auth", "account", "session")))
        (cls.root / "run/dbus").mkdir(exist_ok=True)
        (cls.root / "var/run").symlink_to("../run")
        cls.daemon(["/usr/bin/dbus-daemon", "--system", "--nofork", "--nopidfile", "--nosyslog"])
        cls.machine.wait_for((cls.root / "run/dbus/system_bus_socket").exists, "the system bus")
        cls.daemon([POLKITD, "--no-debug"])
        ask = ["/usr/bin/dbus-send", "--system", "--print-reply", "--dest=org.freedesktop.DBus", "/",
               "org.freedesktop.DBus.GetNameOwner", "string:org.freedesktop.PolicyKit1"]
        cls.machine.wait_for(lambda: cls.machine.run(ask).returncode == 0, "the authority")

    def setUp(self):
        super().setUp()
        self.add_anna()

    @classmethod
    def daemon(cls, command):
        process = cls.machine.start(command)

        def end():
            process.terminate()
            process.wait(timeout=60)

        cls.addClassCleanup(end)

    def pkexec(self, *arguments, user=True, content=PASSWORD + "\n" + ANSWERS):
        """The tool through pkexec, which wants a parent that is not the first process."""
        given = self.root / "tmp/given"
        given.write_text(content)
        given.chmod(0o644)
        return self.machine.run(["/bin/sh", "-c", 'pkexec "$@" </tmp/given; exit $?', "sh", TOOL, *arguments], user=user)

    def set_up(self, *more, **options):
        return self.pkexec("setup", "--user", OTHER, "--answers", "-", "--password-fd", "0", *more, **options)

    def test_who_may_sets_up_another_user(self):
        self.assertIn("anna is set up.", self.succeeds(self.set_up()))
        for path in self.homes[OTHER].rglob("*"):
            self.assertEqual(path.lstat().st_uid, OTHER_ID, path)
        self.assertTrue(self.launch_agent(OTHER).exists())
        self.assertIn("Removed the replay item and the agent",
                      self.succeeds(self.pkexec("setup", "--cancel", "--user", OTHER)))

    def test_who_may_not_does_not(self):
        result = self.set_up(user=OTHER_ID)
        self.assertEqual((result.returncode, result.stdout), (127, ""), result)
        self.assertFalse((self.homes[OTHER] / "Library").exists())

    def test_the_right_is_for_this_alone(self):
        for arguments in (["account", "list"], ["replay", "show", "--user", OTHER], ["--json", "setup"]):
            self.assertEqual(self.pkexec(*arguments).returncode, 127, arguments)
        before = self.outside()
        self.fails(self.pkexec("setup", "--answers", "-"), 2, "through pkexec a setup is for another user: --user NAME")
        self.fails(self.pkexec("setup", "--cancel"), 2, "--user NAME")
        self.fails(self.pkexec("setup", "--user", OTHER, "account", "list"), 2, "account")
        for option in (("--bundle", "/usr/local/share/welcomer/setup-bundle"), ("--root", "/tmp")):
            self.fails(self.set_up(*option), 2, "through pkexec there is no --root, no --bundle")
        self.fails(self.pkexec("setup", "--user", OTHER, "--answers", "/etc/passwd"), 2, "no file for --answers but -")
        self.fails(self.pkexec("setup", "--user", "root", "--answers", "-"), 2, "root is root")
        self.assertEqual(self.outside(), before)


if __name__ == "__main__":
    machine.enter_namespaces()
    ThroughPkexec.build = sys.argv[1]
    unittest.main(argv=[sys.argv[0], *sys.argv[2:]], verbosity=2)
