"""welcomer doctor, on this machine and below a root."""

import fcntl
import json
import os
import re
import socket
import subprocess
import tempfile
import unittest
from pathlib import Path

TOOL = os.path.join(os.environ["WELCOMER_BUILD"], "bin", "welcomer")


def doctor(*arguments, **variables):
    environment = {name: value for name, value in os.environ.items()
                   if name not in ("DBUS_SESSION_BUS_ADDRESS", "XDG_RUNTIME_DIR")}
    result = subprocess.run([TOOL, "doctor", *arguments], capture_output=True, text=True, timeout=60, check=False,
                            env={**environment, **variables})
    # What is wrong on this machine is none of these tests' business, nor what is not installed below their roots.
    assert (result.returncode, result.stderr) == (0, "") or (
        result.returncode == 1 and re.fullmatch(r"welcomer: .* wrong\n", result.stderr)), result
    return result.stdout


def entry(text, interface):
    found = [each for each in json.loads(text)["backends"] if each["interface"] == interface]
    assert len(found) == 1, text
    return found[0]


class Doctor(unittest.TestCase):
    # Whether a keyring is installed here decides; tests/integration/desktop has both.
    WITHOUT_BUS = (("local file", "there is no session bus"),
                   ("none", "there is no session bus, so that the keyring cannot be asked"))

    def test_without_a_bus_there_is_advice(self):
        found = entry(doctor("--json"), "CredentialStore")
        self.assertIn((found["backend"], found["reason"]), self.WITHOUT_BUS)
        self.assertIn("Secret Service", found["advice"])

    def test_every_line_for_people_names_the_backend_and_the_reason(self):
        found = re.search(r"^CredentialStore: (.+) \((.+)\)\n    advice: ", doctor(), re.MULTILINE)
        self.assertIn(found.groups(), self.WITHOUT_BUS)

    def test_below_a_root_everything_is_local(self):
        with tempfile.TemporaryDirectory() as root:
            text = doctor("--json", "--root", root)
            for interface in ("CredentialStore", "AccountService", "RunLoop"):
                self.assertEqual(entry(text, interface)["reason"], "the desktop's services know no root but /")
                self.assertIsNone(entry(text, interface)["advice"])

    def test_a_user_manager_is_seen_by_its_socket(self):
        with tempfile.TemporaryDirectory() as runtime:
            self.assertEqual(entry(doctor("--json", XDG_RUNTIME_DIR=runtime), "launch service")["backend"],
                             "child processes")
            os.makedirs(os.path.join(runtime, "systemd", "private"))
            self.assertEqual(entry(doctor("--json", XDG_RUNTIME_DIR=runtime), "launch service")["backend"],
                             "user manager")


class ResolverOverrides(unittest.TestCase):
    """Below a root, with files in place of the services; tests/integration/resolver-sync has the real ones."""

    def setUp(self):
        folder = tempfile.TemporaryDirectory()
        self.addCleanup(folder.cleanup)
        self.root = Path(folder.name)
        for name in ("run/systemd/resolve", "run/welcomer-resolver-sync", "etc", "usr/sbin"):
            (self.root / name).mkdir(parents=True)
        self.forwarder = self.root / "usr/sbin/dnsmasq"
        self.forwarder.touch()

    def start_resolver(self):
        listener = socket.socket(socket.AF_UNIX)
        self.addCleanup(listener.close)
        listener.bind(str(self.root / "run/systemd/resolve/io.systemd.Resolve"))
        listener.listen()
        return listener

    def start_service(self, trouble=""):
        mark = (self.root / "run/welcomer-resolver-sync/state").open("w+", encoding="utf-8")
        self.addCleanup(mark.close)
        fcntl.lockf(mark, fcntl.LOCK_EX | fcntl.LOCK_NB)
        mark.write(trouble)
        mark.flush()
        return mark

    def look_up_through_the_resolver(self):
        (self.root / "etc/resolv.conf").write_text("# a stub\nnameserver 127.0.0.53\n")

    def check(self, backend, reason, advice):
        found = entry(doctor("--json", "--root", str(self.root)), "resolver overrides")
        self.assertEqual((found["backend"], found["reason"], found["advice"]), (backend, reason, advice))

    def test_with_everything_there_they_have_an_effect(self):
        self.start_resolver()
        self.start_service()
        self.look_up_through_the_resolver()
        self.check("systemd-resolved",
                   "systemd-resolved and welcomer-resolver-sync run: the overrides have an effect", None)

    def test_the_c_librarys_module_of_the_resolver_will_do(self):
        self.start_resolver()
        self.start_service()
        (self.root / "etc/resolv.conf").write_text("nameserver 192.0.2.1\n")
        (self.root / "etc/nsswitch.conf").write_text("hosts: files resolve [!UNAVAIL=return] dns\n")
        self.check("systemd-resolved",
                   "systemd-resolved and welcomer-resolver-sync run: the overrides have an effect", None)

    def test_without_a_resolver_they_have_none_though_its_folder_is_there(self):
        self.look_up_through_the_resolver()
        self.check("none", "systemd-resolved does not run: the overrides have no effect",
                   "install and start systemd-resolved, and enable welcomer-resolver-sync")

    def test_a_resolver_that_has_died_does_not_run(self):
        self.start_service()
        self.start_resolver().close()
        self.check("none", "systemd-resolved does not run: the overrides have no effect",
                   "install and start systemd-resolved")

    def test_without_the_service_they_have_none(self):
        self.start_resolver()
        self.look_up_through_the_resolver()
        self.check("none", "welcomer-resolver-sync does not run: the overrides have no effect",
                   "systemctl enable --now welcomer-resolver-sync")

    def test_a_service_that_has_died_does_not_run(self):
        self.start_resolver()
        self.start_service().close()
        self.check("none", "welcomer-resolver-sync does not run: the overrides have no effect",
                   "systemctl enable --now welcomer-resolver-sync")

    def test_what_keeps_the_service_from_its_work_is_the_reason(self):
        self.start_resolver()
        self.start_service("failed to start /usr/sbin/dnsmasq: No such file or directory")
        self.check("none", "welcomer-resolver-sync cannot route the overrides: failed to start /usr/sbin/dnsmasq: "
                   "No such file or directory", "see the system log of welcomer-resolver-sync; its forwarder is dnsmasq")

    def test_a_forwarder_that_is_missing_is_told_of_before_anything_has_tried_it(self):
        self.forwarder.unlink()
        self.look_up_through_the_resolver()
        self.check("none", "systemd-resolved does not run: the overrides have no effect", "install and start "
                   "systemd-resolved, and enable welcomer-resolver-sync; install dnsmasq-base, which it needs")
        self.start_resolver()
        self.check("none", "welcomer-resolver-sync does not run: the overrides have no effect",
                   "systemctl enable --now welcomer-resolver-sync; install dnsmasq-base, which it needs")
        self.start_service()
        self.check("none", "welcomer-resolver-sync cannot route the overrides: there is no /usr/sbin/dnsmasq",
                   "install dnsmasq-base")

    def test_names_that_are_looked_up_past_the_resolver_are_told_of(self):
        self.start_resolver()
        self.start_service()
        (self.root / "etc/resolv.conf").write_text("nameserver 192.0.2.1\n# nameserver 127.0.0.53\n")
        self.check("systemd-resolved",
                   "the overrides reach systemd-resolved, but programs do not look names up through it",
                   "link /etc/resolv.conf to /run/systemd/resolve/stub-resolv.conf, or install libnss-resolve")


if __name__ == "__main__":
    unittest.main()
