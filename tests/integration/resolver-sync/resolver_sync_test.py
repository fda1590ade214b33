#!/usr/bin/env python3
"""The installed service and the real systemd-resolved: files in /etc/resolver take effect, and leave nothing behind.

usage: resolver_sync_test.py BUILD_DIR RESOLVED_DIR
"""

import json
import os
import shutil
import signal
import subprocess
import sys
import tempfile
import unittest
from pathlib import Path

sys.path.insert(0, str(Path(__file__).resolve().parents[2] / "support"))
import resolver  # noqa: E402

PROGRAM = "/usr/local/libexec/welcomer-resolver-sync"
STRANGER = 31998  # another user of the machine


def links():
    return set(os.listdir("/proc/sys/net/ipv4/conf")) - {"all", "default", "lo", resolver.LINK}


class OnAMachine(unittest.TestCase):
    build = resolved = None

    def setUp(self):
        self.folder = Path(tempfile.mkdtemp(prefix="resolver-sync-"))
        self.addCleanup(subprocess.run, ["ip", "link", "delete", resolver.LINK], check=False, capture_output=True)
        self.machine = resolver.ResolverMachine(self.folder / "machine", self.resolved, self.with_resolver())
        self.machine.install(self.build)
        self.machine.start_system_log()
        self.overrides = self.machine.root / "etc/resolver"
        self.service = None

    def with_resolver(self):
        return "without_the_resolver" not in self.id()

    def tearDown(self):
        if self.service:
            self.end_service()
        self.machine.stop()
        shutil.rmtree(self.folder)

    def start_service(self):
        self.service = self.machine.start([PROGRAM], stderr=subprocess.DEVNULL)

    def end_service(self):
        self.service.terminate()
        self.assertEqual(self.service.wait(timeout=60), 0)
        self.service = None

    def write(self, name, text):
        self.overrides.mkdir(exist_ok=True)
        (self.overrides / name).write_text(text, encoding="utf-8")

    def select(self, name):
        selected = self.machine.run(["/usr/local/bin/welcomer", "switch", "select", name])
        self.assertEqual(selected.returncode, 0, selected)

    def wait_for_answer(self, name, answer):
        self.machine.wait_for(lambda: resolver.ask(name) == answer, f"{answer} for {name}")

    def wait_until_nothing_is_left(self):
        self.machine.wait_for(lambda: not links(), "the end of the link")
        self.machine.wait_for(lambda: not self.forwarders(), "the end of the forwarder")
        self.machine.wait_for(lambda: not (self.machine.root / "run/welcomer-resolver-sync/forwarder").exists(),
                              "the end of the folder")

    def forwarders(self):
        found = []
        for process in Path("/proc").glob("[0-9]*"):
            try:
                if b"--listen-address=127.0.77.1" in (process / "cmdline").read_bytes():
                    found.append(int(process.name))
            except OSError:
                pass
        return found

    def start_as_another_user(self, program, *arguments):
        process = self.machine.start(["/usr/bin/python3", "-c", program, *arguments], user=STRANGER,
                                     stdout=subprocess.PIPE, stderr=subprocess.DEVNULL, text=True)
        self.addCleanup(process.wait)
        self.addCleanup(process.stdout.close)
        self.addCleanup(process.kill)
        return process

    def diagnosis(self):
        result = self.machine.run(["/usr/local/bin/welcomer", "--json", "doctor"], user=True)
        self.assertEqual(result.returncode, 0, result)
        [found] = [each for each in json.loads(result.stdout)["backends"] if each["interface"] == "resolver overrides"]
        return found["reason"]

    def records(self):
        return [record[2] for record in self.machine.log_records("welcomer-resolver-sync")]


class ResolverSync(OnAMachine):
    def test_a_cloud_name_leads_to_the_chosen_environment_and_after_prod_no_longer(self):
        self.start_service()
        self.select("Nimbus1")
        for domain in resolver.DOMAINS:
            self.wait_for_answer(f"probe.{domain}", resolver.ANSWERS["Nimbus1"])
            self.wait_for_answer(domain, resolver.ANSWERS["Nimbus1"])
        looked_up = self.machine.run(["/usr/bin/getent", "ahostsv4", "probe.nimbus.example"])
        self.assertIn(resolver.ANSWERS["Nimbus1"], looked_up.stdout)
        # Also names that the resolver knows from the environment before.
        self.select("Nimbus2")
        for domain in resolver.DOMAINS:
            self.wait_for_answer(f"probe.{domain}", resolver.ANSWERS["Nimbus2"])
        self.select("Prod")
        for domain in resolver.DOMAINS:
            self.wait_for_answer(f"probe.{domain}", None)
        self.wait_until_nothing_is_left()
        self.assertEqual(self.records(), [])

    def test_the_tool_tells_an_ordinary_user_whether_they_have_an_effect(self):
        idle = "welcomer-resolver-sync does not run: the overrides have no effect"
        works = "systemd-resolved and welcomer-resolver-sync run: the overrides have an effect"
        self.assertEqual(self.diagnosis(), idle)
        self.start_service()
        self.machine.wait_for(lambda: self.diagnosis() == works, "the running service")
        # Of two services the first one serves.
        second = self.machine.run([PROGRAM])
        self.assertEqual(second.returncode, 1)
        self.assertEqual(self.diagnosis(), works)
        self.machine.stop_resolver()
        self.assertEqual(self.diagnosis(), "systemd-resolved does not run: the overrides have no effect")
        self.machine.start_resolver()
        self.machine.wait_for(lambda: self.diagnosis() == works, "the running resolver")
        self.service.kill()
        self.service.wait(timeout=60)
        self.assertEqual(self.diagnosis(), idle)
        self.start_service()
        self.machine.wait_for(lambda: self.diagnosis() == works, "the next service")
        self.end_service()
        self.assertEqual(self.diagnosis(), idle)
        self.assertFalse((self.machine.root / "run/welcomer-resolver-sync/state").exists())

    def test_other_names_are_not_asked_of_the_environment(self):
        self.start_service()
        self.select("Nimbus1")
        self.wait_for_answer("probe.nimbus.example", resolver.ANSWERS["Nimbus1"])
        self.assertIsNone(resolver.ask("probe.unrelated.example"))
        settings = self.machine.resolvectl("status", "welcomer0")
        self.assertIn("-DefaultRoute -LLMNR -mDNS -DNSOverTLS DNSSEC=no", settings)

    def test_a_folder_that_is_there_at_the_start_counts(self):
        self.select("Nimbus2")
        self.start_service()
        self.wait_for_answer("probe.online.example", resolver.ANSWERS["Nimbus2"])

    def test_files_of_other_origin_count_beside_ours(self):
        self.start_service()
        self.select("Nimbus1")
        self.write(resolver.OTHER_DOMAIN, f"nameserver {resolver.OTHER_NAMESERVER}\n")
        self.wait_for_answer(f"probe.{resolver.OTHER_DOMAIN}", resolver.OTHER_ANSWER)
        self.wait_for_answer("probe.nimbus.example", resolver.ANSWERS["Nimbus1"])
        (self.overrides / resolver.OTHER_DOMAIN).unlink()
        self.wait_for_answer(f"probe.{resolver.OTHER_DOMAIN}", None)
        self.wait_for_answer("probe.nimbus.example", resolver.ANSWERS["Nimbus1"])

    def test_an_inner_domain_may_have_another_nameserver(self):
        self.start_service()
        self.write("outer", f"domain nimbus.example\nnameserver {resolver.NAMESERVERS['Nimbus1']}\n")
        self.write("inner", f"domain services.nimbus.example\nnameserver {resolver.NAMESERVERS['Nimbus2']}\n")
        self.wait_for_answer("a.services.nimbus.example", resolver.ANSWERS["Nimbus2"])
        self.wait_for_answer("a.nimbus.example", resolver.ANSWERS["Nimbus1"])

    def test_a_burst_of_changes_ends_in_the_final_state(self):
        self.start_service()
        for count in range(60):
            shutil.rmtree(self.overrides, ignore_errors=True)
            for domain in resolver.DOMAINS:
                self.write(domain, f"domain {domain}\nnameserver {resolver.NAMESERVERS[f'Nimbus{count % 2 + 1}']}\n")
        for domain in resolver.DOMAINS:
            self.wait_for_answer(f"probe.{domain}", resolver.ANSWERS["Nimbus2"])
        for count in range(60):
            self.write("online.example", "nameserver 192.0.2.1\n")
            shutil.rmtree(self.overrides)
        self.wait_until_nothing_is_left()
        self.assertIsNone(resolver.ask("probe.online.example"))

    def test_a_folder_that_is_moved_away_and_back_counts_each_time(self):
        self.start_service()
        self.write("online.example", "nameserver 192.0.2.1\n")
        self.wait_for_answer("a.online.example", resolver.ANSWERS["Nimbus1"])
        aside = self.overrides.with_name("aside")
        self.overrides.rename(aside)
        self.wait_until_nothing_is_left()
        (aside / "online.example").write_text("nameserver 192.0.2.2\n")
        aside.rename(self.overrides)
        self.wait_for_answer("a.online.example", resolver.ANSWERS["Nimbus2"])
        self.write("online.example", "nameserver 192.0.2.1\n")
        self.wait_for_answer("a.online.example", resolver.ANSWERS["Nimbus1"])

    def test_the_end_of_the_service_leaves_nothing(self):
        self.start_service()
        self.select("Nimbus1")
        self.wait_for_answer("probe.nimbus.example", resolver.ANSWERS["Nimbus1"])
        self.end_service()
        self.assertEqual((links(), self.forwarders()), (set(), []))
        self.assertFalse((self.machine.root / "run/welcomer-resolver-sync").exists())
        self.assertIsNone(resolver.ask("probe.nimbus.example"))
        self.assertTrue((self.overrides / "nimbus.example").exists())

    def test_a_service_that_was_killed_is_followed_by_one_that_works(self):
        self.select("Nimbus1")
        self.start_service()
        self.wait_for_answer("probe.nimbus.example", resolver.ANSWERS["Nimbus1"])
        self.service.kill()
        self.service.wait(timeout=60)
        # The service manager ends what is left of a service's processes before it starts it anew.
        for process in self.forwarders():
            os.kill(process, signal.SIGKILL)
        self.machine.wait_for(lambda: not self.forwarders(), "the end of the forwarder")
        self.start_service()
        self.select("Nimbus2")
        self.wait_for_answer("probe.nimbus.example", resolver.ANSWERS["Nimbus2"])

    def test_a_forwarder_that_dies_is_replaced(self):
        self.start_service()
        self.select("Nimbus1")
        self.wait_for_answer("probe.nimbus.example", resolver.ANSWERS["Nimbus1"])
        [before] = self.forwarders()
        os.kill(before, signal.SIGKILL)
        self.machine.wait_for(lambda: self.forwarders() not in ([], [before]), "another forwarder")
        self.wait_for_answer("fresh.nimbus.example", resolver.ANSWERS["Nimbus1"])
        self.assertEqual(self.records(), ["The forwarder for the resolver's overrides has ended"])

    def test_a_restart_of_the_resolver_keeps_the_overrides(self):
        self.start_service()
        self.select("Nimbus1")
        self.wait_for_answer("probe.nimbus.example", resolver.ANSWERS["Nimbus1"])
        self.machine.stop_resolver()
        self.machine.start_resolver()
        self.wait_for_answer("probe.nimbus.example", resolver.ANSWERS["Nimbus1"])

    def test_without_the_resolver_it_says_so_and_waits_for_it(self):
        self.select("Nimbus1")
        self.start_service()
        self.machine.wait_for(lambda: self.records(), "the record")
        self.assertEqual(self.records(), ["The resolver's overrides have no effect: systemd-resolved does not run"])
        self.assertEqual((links(), self.forwarders()), (set(), []))
        self.machine.start_resolver()
        self.wait_for_answer("probe.nimbus.example", resolver.ANSWERS["Nimbus1"])
        self.assertEqual(len(self.records()), 1)

    def test_a_file_that_says_nothing_costs_one_line_and_no_other_file(self):
        self.start_service()
        self.write("broken.example", "nameserver nowhere\n")
        self.write("online.example", "nameserver 192.0.2.1\n")
        self.wait_for_answer("a.online.example", resolver.ANSWERS["Nimbus1"])
        self.write("online.example", "nameserver 192.0.2.2\n")
        self.wait_for_answer("a.online.example", resolver.ANSWERS["Nimbus2"])
        self.assertEqual([record for record in self.records() if "broken" in record],
                         ['Refusing resolver override /etc/resolver/broken.example: "nowhere" is no address'])

    def test_one_file_that_no_name_system_takes_costs_only_itself(self):
        self.start_service()
        self.write("online.example", "nameserver 192.0.2.1\n")
        self.wait_for_answer("a.online.example", resolver.ANSWERS["Nimbus1"])
        long, nul = "x" * 64 + ".example", "nul.example"
        self.write("long", f"domain {long}\nnameserver 192.0.2.1\n")
        self.write("nul", f"domain {nul}\nnameserver 192.0.2.1\0.example\n")
        self.write("more", "domain nimbus.example\nnameserver 192.0.2.2\n")
        self.wait_for_answer("a.nimbus.example", resolver.ANSWERS["Nimbus2"])
        self.assertEqual(resolver.ask("b.online.example"), resolver.ANSWERS["Nimbus1"])
        self.machine.wait_for(lambda: len(self.records()) >= 2, "the records")
        self.assertEqual(self.records(), [f'Refusing resolver override /etc/resolver/long: "{long}" is no domain',
                                          r'Refusing resolver override /etc/resolver/nul: "192.0.2.1\0.example" is no '
                                          "address"])

    def test_a_lock_of_another_user_keeps_no_service_from_starting(self):
        self.start_service()
        self.select("Nimbus1")
        self.wait_for_answer("probe.nimbus.example", resolver.ANSWERS["Nimbus1"])
        locking = ("import fcntl, time; file = open('/run/welcomer-resolver-sync/state'); "
                   "fcntl.flock(file, fcntl.LOCK_EX); print('flock', flush=True); "
                   "fcntl.lockf(file, fcntl.LOCK_SH | fcntl.LOCK_NB); print('lockf', flush=True); time.sleep(1000)")
        other = self.start_as_another_user(locking)
        self.assertEqual(other.stdout.readline(), "flock\n")
        self.service.kill()
        self.service.wait(timeout=60)
        # The whole file can be locked for reading once its holder is gone.
        again = self.start_as_another_user(locking.replace("fcntl.flock(file, fcntl.LOCK_EX)", "pass"))
        self.assertEqual([again.stdout.readline() for _ in range(2)], ["flock\n", "lockf\n"])
        for process in self.forwarders():
            os.kill(process, signal.SIGKILL)
        self.machine.wait_for(lambda: not self.forwarders(), "the end of the forwarder")
        self.start_service()
        self.select("Nimbus2")
        self.wait_for_answer("probe.nimbus.example", resolver.ANSWERS["Nimbus2"])


if __name__ == "__main__":
    resolver.enter_namespaces()
    OnAMachine.build, OnAMachine.resolved = sys.argv[1:3]
    unittest.main(argv=[sys.argv[0], *sys.argv[3:]], verbosity=2)
