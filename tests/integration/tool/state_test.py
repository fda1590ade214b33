#!/usr/bin/env python3
"""The tool's commands about the per-user record, the sync decisions and the server switch.

Run like tool_test.py beside it. The record is an ordinary user's and the switch the superuser's: run as the superuser, the
tests take both parts; run as anybody else, those of the superuser are skipped.
"""

import json
import os
import plistlib
import pwd
import shutil
import subprocess
import unittest
from pathlib import Path

from tool_test import BUILD, PROGRAM, ToolTest

IS_SUPERUSER = os.geteuid() == 0
ORDINARY_USER = "nobody"
RECORD = "Library/Preferences/com.corvid.FirstRun.plist"
SYNC_SERVICE = "com.corvid.nimbus.service.accountsync"


class OrdinaryUserTest(ToolTest):
    """Calls the tool as somebody who is not the superuser, in a home of his own below the root."""

    def setUp(self):
        super().setUp()
        # The build folder may be the superuser's alone.
        for name in ("bin", "lib"):
            (self.folder / name).mkdir()
        self.program = shutil.copy(PROGRAM, self.folder / "bin/welcomer")
        shutil.copy(BUILD / "lib/libwelcomer.so.0", self.folder / "lib")
        self.user = {}
        if IS_SUPERUSER:
            entry = pwd.getpwnam(ORDINARY_USER)
            self.user = {"user": entry.pw_uid, "group": entry.pw_gid, "extra_groups": []}
            self.home = self.root / entry.pw_dir.lstrip("/")
            self.home.mkdir(parents=True, exist_ok=True)
            os.chown(self.home, entry.pw_uid, entry.pw_gid)
            self.folder.chmod(0o755)
        self.record = self.home / RECORD

    def call(self, *arguments):
        return subprocess.run([self.program, "--root", self.root, *map(str, arguments)], capture_output=True, text=True,
                              stdin=subprocess.DEVNULL, timeout=100, cwd=self.folder, **self.user)

    def stored(self):
        return plistlib.loads(self.record.read_bytes())

    def write_record(self, record, **options):
        self.write_in_library(self.record, record, **options)

    def write_in_library(self, file, content, **options):
        file.parent.mkdir(parents=True, exist_ok=True)
        file.write_bytes(content if isinstance(content, bytes) else plistlib.dumps(content, **options))
        if IS_SUPERUSER:
            for path in (file.parent.parent, file.parent, file):
                os.chown(path, self.user["user"], self.user["group"])


class State(OrdinaryUserTest):
    TEXTS = ["PreviousSystemVersion", "PreviousBuildVersion", "LastSeenCloudProductVersion", "LastSeenSyncProductVersion",
             "LastPreLoginTasksPerformedBuild", "LastPreLoginTasksPerformedVersion", "LastCacheCleanupProductVersion"]
    FLAGS = ["DidSeeCloudSetup", "DidSeeSyncSetup", "DidSeeSyncSetup2", "SkipFirstLoginOptimization",
             "LastCacheCleanupStillRunning", "RunNonInteractive", "ShowKeychainSyncGreeterAtLogin"]
    ORDER = ["PreviousSystemVersion", "PreviousBuildVersion", "DidSeeCloudSetup", "LastSeenCloudProductVersion",
             "DidSeeSyncSetup", "DidSeeSyncSetup2", "LastSeenSyncProductVersion", "LastPreLoginTasksPerformedBuild",
             "LastPreLoginTasksPerformedVersion", "SkipFirstLoginOptimization", "LastCacheCleanupProductVersion",
             "LastCacheCleanupStillRunning", "RunNonInteractive", "ShowKeychainSyncGreeterAtLogin"]

    def shown(self):
        return json.loads(self.succeeds(self.call("--json", "state", "show")))

    def test_a_record_that_is_not_there_shows_as_empty_and_is_not_made(self):
        document = self.shown()
        self.assertEqual(list(document["state"]), self.ORDER)
        self.assertEqual(document, {"loaded": True, "isNewUserAccount": True, "state": {
            **{text: None for text in self.TEXTS}, **{flag: False for flag in self.FLAGS}}})
        self.assertFalse(self.record.exists())

    def test_every_key_can_be_set_shown_and_removed(self):
        for key in self.ORDER:
            value = "true" if key in self.FLAGS else "10.9"
            self.assertIn(key, self.succeeds(self.call("state", "set", key, value)))
        expected = {**{text: "10.9" for text in self.TEXTS}, **{flag: True for flag in self.FLAGS}}
        self.assertEqual(self.stored(), expected)
        self.assertEqual(self.shown(), {"loaded": True, "isNewUserAccount": False, "state": expected})
        lines = self.succeeds(self.call("state", "show")).splitlines()
        self.assertEqual([line.split() for line in lines[1:15]], [[key, "true" if key in self.FLAGS else "10.9"]
                                                                 for key in self.ORDER])
        for key in self.ORDER:
            self.succeeds(self.call("state", "remove", key))
            if key in self.FLAGS:
                expected[key] = False
            else:
                del expected[key]
            self.assertEqual(self.stored(), expected)

    def test_a_flag_can_be_set_to_false(self):
        self.succeeds(self.call("state", "set", "RunNonInteractive", "true"))
        self.assertEqual(json.loads(self.succeeds(self.call("--json", "state", "set", "RunNonInteractive", "false"))),
                         {"key": "RunNonInteractive", "value": False})
        self.assertIs(self.stored()["RunNonInteractive"], False)

    def test_unknown_keys_are_refused(self):
        for arguments in (["set", "Nonsense", "1"], ["remove", "Nonsense"], ["set", "didSeeCloudSetup", "true"]):
            self.fails(self.call("state", *arguments), 2, "no key (Nonsense|didSeeCloudSetup)")
        self.assertFalse(self.record.exists())

    def test_values_of_the_wrong_type_are_refused(self):
        for value in ("1", "10.9", "", "TRUE", "maybe"):
            self.fails(self.call("state", "set", "DidSeeSyncSetup", value), 2, "DidSeeSyncSetup is true or false")
        self.fails(self.call("state", "seen", "mail"), 2, "mail")
        self.assertFalse(self.record.exists())

    def test_a_text_that_cannot_be_stored_is_a_failure(self):
        self.fails(self.call("state", "set", "PreviousBuildVersion", "\x01"), 1, "could not be stored")
        self.assertFalse(self.record.exists())

    def test_seen_records_the_running_version(self):
        (self.root / "etc").mkdir()
        (self.root / "etc/os-release").write_text('VERSION_ID="12"\n')
        self.succeeds(self.call("state", "seen", "cloud"))
        seen = {key: value for key, value in self.stored().items() if value is not False}
        self.assertEqual(seen, {"DidSeeCloudSetup": True, "LastSeenCloudProductVersion": "12"})
        self.succeeds(self.call("state", "seen", "sync"))
        seen = {key: value for key, value in self.stored().items() if value is not False}
        self.assertEqual(seen, {"DidSeeCloudSetup": True, "LastSeenCloudProductVersion": "12", "DidSeeSyncSetup": True,
                                "DidSeeSyncSetup2": True, "LastSeenSyncProductVersion": "12"})

    def test_keys_of_others_stay(self):
        self.write_record({"Others": [1, 2]}, fmt=plistlib.FMT_BINARY)
        self.succeeds(self.call("state", "set", "PreviousSystemVersion", "12"))
        self.assertEqual(self.stored()["Others"], [1, 2])
        self.assertTrue(self.record.read_bytes().startswith(b"<?xml"))

    def test_a_damaged_record_is_set_aside_and_the_tool_says_so(self):
        self.write_record(b"<plist><dict>")
        result = self.call("state", "set", "PreviousSystemVersion", "12")
        self.assertEqual(result.returncode, 0, result)
        self.assertRegex(result.stderr, r"\Awelcomer: the preferences com\.corvid\.FirstRun are damaged .*"
                                        r"FirstRun\.plist\.damaged.*\n\Z")
        self.assertEqual(Path(f"{self.record}.damaged").read_bytes(), b"<plist><dict>")
        self.assertEqual(self.stored()["PreviousSystemVersion"], "12")

    @unittest.skipUnless(IS_SUPERUSER, "needs the superuser")
    def test_the_superusers_record_is_not_loaded_and_writing_is_refused(self):
        record = self.root / pwd.getpwuid(0).pw_dir.lstrip("/") / RECORD
        record.parent.mkdir(parents=True)
        before = plistlib.dumps({"PreviousSystemVersion": "12", "RunNonInteractive": True})
        record.write_bytes(before)
        for arguments in (["set", "RunNonInteractive", "true"], ["remove", "RunNonInteractive"], ["seen", "cloud"],
                          ["seen", "sync"]):
            self.fails(self.run_below_root("state", *arguments), 1, "superuser's record is not loaded")
        self.assertEqual(record.read_bytes(), before)
        document = json.loads(self.succeeds(self.run_below_root("--json", "state", "show")))
        self.assertEqual((document["loaded"], document["state"]["PreviousSystemVersion"]), (False, None))
        self.assertIn("not loaded", self.succeeds(self.run_below_root("state", "show")))


class Sync(OrdinaryUserTest):
    GOOD = {
        "internetIsReachable": True,
        "localUserAccountManager": {"secureMyDesk": True, "userName": "me", "password": "a secret"},
        "NimbusManager": {"mainAccountResponseDict": {}, "username": "cloud", "password": "b secret"},
        "wlloginhelper": {"seedKeychainComponents": True, "queryKeychainSyncStatus": {"status": 1}},
    }

    def destination(self, scenario, *more):
        file = self.folder / "scenario.plist"
        file.write_bytes(scenario if isinstance(scenario, bytes) else plistlib.dumps(scenario))
        return self.call("sync", "destination", "--scenario", file, *more)

    def decided(self, scenario, *more):
        return json.loads(self.succeeds(self.destination(scenario, "--json", *more)))

    def test_the_destination_with_the_calls_and_flags(self):
        self.assertEqual(self.decided(self.GOOD), {
            "result": True,
            "destination": 1,
            "name": "NimbusKeychainJoinExisting",
            "calls": [
                "SetupStateManager.isMiniGreeter: false",
                "localUserAccountManager.secureMyDesk: true",
                "SetupStateManager.networkingManager",
                "NimbusManager.creating: false",
                "SetupStateManager.isKeychainUpsellGreeter: false",
                "NimbusManager.abortSetup: false",
                "NimbusManager.mainAccountResponseDict: a response",
                "SetupStateManager.isMiniGreeter: false",
                "wlloginhelper.createKeychain:: me",
                "NimbusManager.mainAccountResponseDict: a response",
                "wlloginhelper.configureNimbusAccountForKeychainSyncKVS:password:bag: cloud, a response",
                "wlloginhelper.seedKeychainComponentsWithID:password: cloud: true",
                "NimbusManager.abortSetup: false",
                "wlloginhelper.queryKeychainSyncStatus: none: a dictionary",
                "wlloginhelper.isBackupEnabled: false",
                "NimbusManager.setBackupIsEnabled: false",
            ],
            "flags": {"backupIsEnabled": False, "isBackupNoCircleRecovery": False, "abortSyncSetup": False},
        })
        text = self.succeeds(self.destination(self.GOOD))
        self.assertIn("NimbusKeychainJoinExisting", text)
        self.assertNotIn("secret", text)

    def test_recovery_with_and_without_the_marker(self):
        scenario = {**self.GOOD, "wlloginhelper": {"seedKeychainComponents": True, "isBackupEnabled": True}}
        document = self.decided(scenario)
        self.assertEqual((document["destination"], document["name"]), (2, "NimbusKeychainVerifyNSC"))
        self.assertEqual(document["flags"]["isBackupNoCircleRecovery"], True)
        (self.root / "var/db").mkdir(parents=True)
        (self.root / "var/db/.WLFakeComplexRecovery").touch()
        self.assertEqual(self.decided(scenario)["name"], "NimbusKeychainVerifyComplexNSCRecovery")

    def test_a_rule_that_skips_also_when_only_checking(self):
        scenario = {**self.GOOD, "internetIsReachable": False}
        for more in ([], ["--check-only"]):
            document = self.decided(scenario, *more)
            self.assertEqual((document["result"], document["destination"], document["name"]), (False, 3, None))
            self.assertEqual(document["flags"]["abortSyncSetup"], True)
            self.assertIn("because the internet is not reachable.",
                          self.destination(scenario, "--verbose", *more).stderr)

    def test_only_checking_asks_for_no_destination(self):
        document = self.decided(self.GOOD, "--check-only")
        self.assertEqual((document["result"], document["destination"], document["name"]), (True, None, None))
        self.assertFalse([call for call in document["calls"] if call.startswith("wlloginhelper")])

    def test_an_abort_after_seeding(self):
        scenario = {**self.GOOD, "NimbusManager": {**self.GOOD["NimbusManager"], "abortSetupAfterSeeding": True}}
        document = self.decided(scenario)
        self.assertEqual((document["result"], document["destination"]), (False, 3))
        self.assertEqual(document["flags"]["abortSyncSetup"], False)

    def test_the_screen_lock_of_the_reduced_setup(self):
        for answer in (True, False):
            scenario = {**self.GOOD, "isMiniGreeter": True, "screenLockRequiresPassword": answer}
            self.assertEqual(self.decided(scenario)["result"], answer)

    def test_scenarios_that_make_no_sense(self):
        for scenario, pattern in (({**self.GOOD, "internet": True}, "internet means nothing"),
                                  ({"NimbusManager": {"create": True}}, "NimbusManager.create means nothing"),
                                  ({"NimbusManager": True}, "NimbusManager is of the wrong type"),
                                  ({"isMiniGreeter": []}, "isMiniGreeter is of the wrong type"),
                                  (plistlib.dumps([]), "no dictionary"), (b"{ a", "scenario.plist")):
            with self.subTest(pattern):
                self.fails(self.destination(scenario), 1, pattern)
        self.fails(self.call("sync", "destination"), 2, "--scenario")

    def test_the_upsell_of_a_user_who_is_not_logged_in(self):
        self.assertEqual(json.loads(self.succeeds(self.call("--json", "sync", "upsell"))),
                         {"offered": False, "reason": "nobody is logged in to a cloud account"})
        self.assertIn("not offered", self.succeeds(self.call("sync", "upsell")))
        self.assertFalse(self.record.exists())

    def test_the_upsell_of_a_user_who_is_logged_in_stores_nothing(self):
        def case(enabled, locked, record, offered, reason):
            self.write_in_library(self.home / "Library/Accounts/Accounts.plist", {
                "LoggedInAccount": "me@nimbus.example",
                "Accounts": {"me@nimbus.example": {"Services": {SYNC_SERVICE: {"Enabled": enabled}}}}})
            self.write_in_library(self.record.with_name("com.corvid.screensaver.plist"), {"askForPassword": locked})
            self.write_record(record)
            before = self.record.read_bytes()
            with self.subTest(enabled=enabled, locked=locked, record=record):
                self.assertEqual(json.loads(self.succeeds(self.call("--json", "sync", "upsell"))),
                                 {"offered": offered, "reason": reason})
                self.assertEqual(self.record.read_bytes(), before)

        case(True, True, {}, False, "Sync upsell skipped because sync is already enabled")
        case(False, False, {}, False, "Sync upsell skipped because screen lock is not enabled")
        case(False, True, {}, True, None)
        case(False, True, {"DidSeeSyncSetup": True, "DidSeeSyncSetup2": True}, False, "the user has seen it already")
        case(False, True, {"DidSeeSyncSetup": True}, True, None)
        self.assertIn("Keychain Sync Cert Change", self.call("--verbose", "sync", "upsell").stderr)


class Switch(OrdinaryUserTest):
    NAMES = ["Prod", "Nimbus1", "Nimbus2", "Nimbus3", "Nimbus4", "Q1", "Q2", "Q3", "Q4"]

    def setUp(self):
        super().setUp()
        self.resolver = self.root / "etc/resolver"
        self.resolver.parent.mkdir()

    def test_anybody_may_look(self):
        self.assertEqual(json.loads(self.succeeds(self.call("--json", "switch", "list"))),
                         {"servers": self.NAMES, "current": "Prod"})
        self.assertEqual(self.succeeds(self.call("switch", "list")).splitlines(),
                         ["* Prod"] + ["  " + name for name in self.NAMES[1:]])
        self.assertEqual(self.succeeds(self.call("switch", "show")), "Prod\n")
        self.assertEqual(json.loads(self.succeeds(self.call("--json", "switch", "show"))),
                         {"current": "Prod", "isPointedToProd": True, "canChangeConfiguration": False})

    def test_an_ordinary_user_cannot_select(self):
        for name in ("Prod", "Nimbus1"):
            self.fails(self.call("switch", "select", name), 1, "only the superuser can switch")
        self.assertFalse(self.resolver.exists())

    @unittest.skipUnless(IS_SUPERUSER, "needs the superuser")
    def test_the_superuser_selects_and_returns(self):
        for name in ("Nimbus3", "Q4"):
            self.assertIn(name, self.succeeds(self.run_below_root("switch", "select", name)))
            self.assertEqual(self.succeeds(self.run_below_root("switch", "show")), name + "\n")
            self.assertIn("* " + name, self.succeeds(self.run_below_root("switch", "list")))
            self.assertEqual(len(list(self.resolver.iterdir())), 4)
        self.succeeds(self.run_below_root("switch", "select", "Prod"))
        self.assertFalse(self.resolver.exists())

    @unittest.skipUnless(IS_SUPERUSER, "needs the superuser")
    def test_a_failure_says_why(self):
        shutil.rmtree(self.resolver.parent)
        self.fails(self.run_below_root("switch", "select", "Q1"), 1,
                   "cannot switch to Q1: SwitchController failed to create /etc/resolver: .*No such file")

    def test_an_environment_that_is_none(self):
        for name in ("Nowhere", "prod", ""):
            self.fails(self.call("switch", "select", name), 2, "there is no environment " + name)

    def test_overrides_of_other_origin_are_unknown(self):
        self.resolver.mkdir()
        (self.resolver / "online.example").write_text("nameserver 203.0.113.1\n")
        self.assertIn("Unknown", self.succeeds(self.call("switch", "show")))
        self.assertEqual(json.loads(self.succeeds(self.call("--json", "switch", "show")))["current"], None)


if __name__ == "__main__":
    unittest.main()
