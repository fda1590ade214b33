"""welcomer doctor, on this machine and below a root."""

import json
import os
import subprocess
import tempfile
import unittest

TOOL = os.path.join(os.environ["WELCOMER_BUILD"], "bin", "welcomer")


def doctor(*arguments, **variables):
    environment = {name: value for name, value in os.environ.items()
                   if name not in ("DBUS_SESSION_BUS_ADDRESS", "XDG_RUNTIME_DIR")}
    result = subprocess.run([TOOL, "doctor", *arguments], capture_output=True, text=True, timeout=60, check=False,
                            env={**environment, **variables})
    assert result.returncode == 0 and not result.stderr, result
    return result.stdout


def entry(text, interface):
    found = [each for each in json.loads(text)["backends"] if each["interface"] == interface]
    assert len(found) == 1, text
    return found[0]


class Doctor(unittest.TestCase):
    def test_without_a_bus_the_local_store_serves_and_there_is_advice(self):
        text = doctor("--json")
        self.assertEqual(entry(text, "CredentialStore")["backend"], "local file")
        self.assertEqual(entry(text, "CredentialStore")["reason"], "there is no session bus")
        self.assertIn("Secret Service", entry(text, "CredentialStore")["advice"])

    def test_every_line_for_people_names_the_backend_and_the_reason(self):
        self.assertIn("CredentialStore: local file (there is no session bus)\n    advice: ", doctor())

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

    def test_without_a_resolver_the_overrides_have_no_effect(self):
        with tempfile.TemporaryDirectory() as root:
            self.assertIn("have no effect", entry(doctor("--json", "--root", root), "resolver overrides")["reason"])
            os.makedirs(os.path.join(root, "run", "systemd", "resolve"))
            self.assertEqual(entry(doctor("--json", "--root", root), "resolver overrides")["backend"],
                             "systemd-resolved")


if __name__ == "__main__":
    unittest.main()
