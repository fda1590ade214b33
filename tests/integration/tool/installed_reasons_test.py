#!/usr/bin/env python3
"""What the installed tool says when something fails: one line, with what failed, where, and the system's reason.

usage: installed_reasons_test.py BUILD_DIR
"""

import plistlib
import subprocess
import sys
import tempfile
import unittest
from pathlib import Path

sys.path.insert(0, str(Path(__file__).resolve().parents[2] / "support"))
import machine  # noqa: E402

TOOL = "/usr/local/bin/welcomer"
DIRECTORY = "var/lib/welcomer/nimbus-directory.plist"
NO_SPACE = "No space left on device"
READ_ONLY = "Read-only file system"


class ToolsReasons(unittest.TestCase):
    build = None

    @classmethod
    def setUpClass(cls):
        cls.folder = Path(tempfile.mkdtemp(prefix="tools-reasons-"))
        cls.machine = machine.Machine(cls.folder / "machine")
        cls.machine.install(cls.build)

    @classmethod
    def tearDownClass(cls):
        cls.machine.stop()
        cls.folder.rmdir()

    def disk(self, folder, pages):
        """A disk of its own in the machine's folder, for as long as the test runs."""
        path = self.machine.root / folder.lstrip("/")
        path.mkdir(parents=True, exist_ok=True)
        machine.mount("tmpfs", path, "tmpfs", 0, f"size={4 * pages}k,mode=0755")
        self.addCleanup(machine.unmount, path)
        return path

    def read_only(self, path):
        machine.mount("tmpfs", path, None, machine.MS_REMOUNT | machine.MS_RDONLY)

    def fails(self, result, pattern):
        """Nothing on stdout, one line on stderr."""
        self.assertEqual((result.returncode, result.stdout), (1, ""), result)
        self.assertRegex(result.stderr, rf"\Awelcomer: .*{pattern}.*\n\Z")
        self.assertEqual(result.stderr.count("\n"), 1, result)

    def try_story(self, temporary, *options):
        return self.machine.run(["/usr/bin/env", f"TMPDIR={temporary}", TOOL, *options, "try", "--time-lapse"])


class Try(ToolsReasons):
    def test_a_disk_that_is_full_at_once(self):
        self.disk("/tmp/full", 4)
        self.fails(self.try_story("/tmp/full", "--json"),
                   rf"cannot write /tmp/full/welcomer-try\.\w+/System/\S+\.ncdplugin: {NO_SPACE}")

    def test_wherever_in_the_story_the_disk_is_full(self):
        installed = self.machine.root / "usr/local"
        examples = [path for folder in (*installed.glob("lib*/**/welcomer/examples/plugins"),
                                        installed / "share/welcomer/setup-bundle")
                    for path in folder.rglob("*") if path.is_file()]
        for path in examples:
            # As a package has them; what is no library or program stays as it is.
            subprocess.run(["strip", path], check=False, stderr=subprocess.DEVNULL)
        pages = sum(-(-path.stat().st_size // 4096) for path in examples) - 3
        failures = 0
        while True:
            path = self.disk("/tmp/full", pages)
            result = self.try_story("/tmp/full", "--json")
            if result.returncode == 0:
                break
            with self.subTest(result.stderr):
                # The credential store tells no more than that.
                self.fails(result, rf"(/\S+: {NO_SPACE}|the credential store cannot be written|"
                                   "the account could not be stored)")
            self.assertEqual(list(path.iterdir()), [], "the temporary folder is gone")
            failures += 1
            self.assertLess(failures, 100)
            pages += 1
        self.assertGreater(failures, 3, "one for each file that the story writes")

    def test_a_folder_for_temporary_files_that_is_missing_or_cannot_be_written(self):
        self.fails(self.try_story("/tmp/missing"),
                   "cannot make a temporary folder in /tmp/missing: No such file or directory")
        self.read_only(self.disk("/tmp/only", 4))
        self.fails(self.try_story("/tmp/only"), f"cannot make a temporary folder in /tmp/only: {READ_ONLY}")
        self.fails(self.machine.run([TOOL, "--root", "/tmp/only", "--json", "try", "--time-lapse"]),
                   f"cannot make the folder /tmp/only/root: {READ_ONLY}")


class Network(ToolsReasons):
    FILE = "/var/lib/welcomer/network.plist"
    NOT_CONFIGURED = "The network could not be configured. .* \\(.*"
    APPLY = [TOOL, "network", "apply", "--choice", "lan", "--method", "Manual", "--ip", "192.0.2.7", "--subnet",
             "255.255.255.0", "--warning-type", "3"]

    @classmethod
    def setUpClass(cls):
        super().setUpClass()
        # This process has a network of its own.
        subprocess.run(["ip", "link", "add", "eth7", "type", "veth", "peer", "name", "peer7"], check=True)

    def test_a_full_disk(self):
        disk = self.disk("/var/lib/welcomer", 1)
        (disk / "fill").write_bytes(bytes(4096))
        reason = f"the configuration could not be stored .cannot write {self.FILE}: {NO_SPACE}"
        self.fails(self.machine.run(self.APPLY), self.NOT_CONFIGURED + reason)
        self.fails(self.machine.run([TOOL, "network", "register"]), reason)

    def test_a_disk_that_cannot_be_written(self):
        self.read_only(self.disk("/var/lib/welcomer", 1))
        reason = rf"the configuration could not be stored .cannot .* /var/lib/welcomer\S*: {READ_ONLY}"
        self.fails(self.machine.run(self.APPLY), self.NOT_CONFIGURED + reason)
        self.fails(self.machine.run([TOOL, "network", "register"]), reason)

    def test_a_configuration_that_makes_no_sense_names_the_device(self):
        apply = [word.replace("192.0.2.7", "nonsense") for word in self.APPLY]
        self.fails(self.machine.run(apply),
                   self.NOT_CONFIGURED + r"an address, .* makes no sense \(eth7: address \"nonsense\"\)")


class Switch(ToolsReasons):
    def test_a_folder_that_cannot_be_changed(self):
        names = self.machine.run([TOOL, "switch", "list"]).stdout.replace("*", " ").split()
        other = next(name for name in names if name != "Prod")
        etc = self.machine.root / "etc"
        machine.mount(etc, etc, None, machine.MS_BIND)
        self.addCleanup(machine.unmount, etc)
        machine.mount(etc, etc, None, machine.MS_BIND | machine.MS_REMOUNT | machine.MS_RDONLY)
        self.fails(self.machine.run([TOOL, "switch", "select", other]),
                   rf"cannot switch to {other}: .*cannot remove /etc/resolver: {READ_ONLY}")


class SignIn(ToolsReasons):
    """An answer of the server's that decides about success and cannot be read is none that says so."""

    def setUp(self):
        path = self.machine.root / DIRECTORY
        if path.exists():
            path.unlink()
        self.with_password("account", "add", "anna")
        # Signing in reads the directory as the user.
        self.directory = plistlib.loads(path.read_bytes())

    def with_password(self, *arguments):
        return self.machine.run(["/bin/sh", "-c", f'printf "secret\\n" | {TOOL} "$@" --password-fd 0', "sh", *arguments])

    def sign_in(self, **values):
        self.directory["Users"]["anna"].update(values)
        (self.machine.root / DIRECTORY).write_bytes(plistlib.dumps(self.directory))
        return self.with_password("account", "sign-in", "anna")

    def test_an_account_error_that_is_no_number(self):
        for error, shown in (({"code": 0}, r"\{code = 0\}"), ("none", "none"), ([0], r"\(0\)")):
            with self.subTest(error):
                self.fails(self.sign_in(AccountError=error), f"the server's account error is no number: {shown}")

    def test_an_account_error_of_true_is_a_number(self):
        self.fails(self.sign_in(AccountError=True), "the password is wrong")

    def test_a_status_that_is_no_zero(self):
        for status in (True, "fine", {}, [0], 2):
            with self.subTest(status):
                self.fails(self.sign_in(Response={"status": status}), "the server answered with a status other than 0")

    def test_a_response_that_is_none(self):
        self.fails(self.sign_in(Response="fine"), "the server's directory of users is missing or cannot be read")

    def test_a_failure_that_cannot_be_read(self):
        self.fails(self.sign_in(Fails="certainly"), "the server gave no reason")


if __name__ == "__main__":
    machine.enter_namespaces()
    ToolsReasons.build = sys.argv[1]
    unittest.main(argv=[sys.argv[0], *sys.argv[2:]], verbosity=2)
