#!/usr/bin/env python3
"""The layer check finds what it is there to find."""

import unittest

import house

check_layers = house.load("check-layers")


class CheckLayers(unittest.TestCase):
    def findings(self, files):
        return house.findings_in(lambda tree: check_layers.check(tree)[0], files)

    def assert_one(self, files, text):
        findings = self.findings(files)
        self.assertEqual(len(findings), 1, findings)
        self.assertIn(text, findings[0])

    def test_lower_floors_are_allowed(self):
        self.assertEqual(
            self.findings({
                "log/A.cpp": '#include "text/B.h"\n#include <string>\n#include "log/A.h"\n',
                "log/A.h": "",
                "text/B.h": "",
                "tests/T.cpp": '#include "log/A.h"\n#include <gtest/gtest.h>\n',
            }), [])

    def test_upwards_is_found(self):
        self.assert_one({"text/A.h": '#include "log/B.h"\n', "log/B.h": ""}, "not below")

    def test_sideways_is_found(self):
        self.assert_one({"plugins/A.h": '#include "handoff/B.h"\n', "handoff/B.h": ""}, "not below")

    def test_a_cycle_within_a_folder_is_found(self):
        self.assert_one({"log/A.h": '#include "log/B.h"\n', "log/B.h": '#include "log/A.h"\n'}, "include cycle")

    def test_a_backend_that_includes_the_system_is_found(self):
        self.assert_one({"backends/local/A.h": '#include "log/B.h"\n', "log/B.h": ""}, "backends/local/ includes")

    def test_the_sides_have_floors_of_their_own(self):
        names = ("posix/P", "network/N", "accountserver/A", "local/LocalL", "desktop/D", "simulated/S")
        headers = {f"backends/{name}.h": "" for name in names}
        allowed = {"posix": (), "network": (), "accountserver": (), "simulated": (), "local": ("posix", "network"),
                   "desktop": ("posix", "network", "accountserver", "local")}
        for name in names:
            side = name.split("/")[0]
            for other in names:
                aim = other.split("/")[0]
                source = {f"backends/{side}/A.cpp": f'#include "backends/{other}.h"\n'}
                with self.subTest(side=side, aim=aim):
                    found = self.findings({**headers, **source})
                    self.assertEqual(len(found), 0 if aim == side or aim in allowed[side] else 1, found)

    def test_the_desktop_sees_only_what_the_embedded_default_shows(self):
        source = {"backends/desktop/A.cpp": '#include "backends/local/accounts/AccountFile.h"\n'}
        self.assert_one({"backends/local/accounts/AccountFile.h": "", **source}, "shows of itself")

    def test_what_asks_for_a_platform_lies_below_what_builds_it(self):
        for side in ("local", "desktop"):
            source = {f"backends/{side}/A.cpp": '#include "backends/Backends.h"\n'}
            self.assertEqual(self.findings({"backends/Backends.h": "", **source}), [])

    def test_no_tool_includes_another(self):
        source = {"tools/welcomer/A.cpp": '#include "tools/resolver-sync/B.h"\n#include "tools/shared/C.h"\n'}
        self.assert_one({"tools/resolver-sync/B.h": "", "tools/shared/C.h": "", **source}, "another program")

    def test_only_a_program_chooses_a_backend(self):
        backend = {"backends/Backends.h": ""}
        use = '#include "backends/Backends.h"\n'
        self.assertEqual(self.findings({**backend, "agent/main.cpp": use, "tools/welcomer/main.cpp": use}), [])
        self.assert_one({**backend, "agent/Agent.cpp": use}, "chooses a backend")
        self.assert_one({**backend, "tools/welcomer/commands/TryCommand.cpp": use}, "chooses a backend")

    def test_tools_use_the_base_on_the_kernel_and_nobody_else_does(self):
        base = {"backends/posix/A.h": "", "backends/local/B.h": ""}
        self.assertEqual(self.findings({**base, "tools/one/C.cpp": '#include "backends/posix/A.h"\n'}), [])
        self.assert_one({**base, "agent/C.cpp": '#include "backends/posix/A.h"\n'}, "chooses a backend")
        self.assert_one({**base, "tools/one/C.cpp": '#include "backends/local/B.h"\n'}, "chooses a backend")

    def test_tools_read_addresses_as_the_backends_do_and_nobody_else_reaches_there(self):
        text = {"backends/network/IPv4Text.h": "", "backends/network/StoredConfiguration.h": ""}
        self.assertEqual(self.findings({**text, "tools/one/C.cpp": '#include "backends/network/IPv4Text.h"\n'}), [])
        self.assert_one({**text, "agent/C.cpp": '#include "backends/network/IPv4Text.h"\n'}, "chooses a backend")
        self.assert_one({**text, "tools/one/C.cpp": '#include "backends/network/StoredConfiguration.h"\n'},
                        "chooses a backend")

    def test_only_a_program_chooses_simulated_time(self):
        time = {"backends/simulated/VirtualTime.h": ""}
        use = '#include "backends/simulated/VirtualTime.h"\n'
        self.assertEqual(self.findings({**time, "tools/welcomer/main.cpp": use}), [])
        self.assert_one({**time, "tools/welcomer/commands/TryCommand.cpp": use}, "chooses a backend")

    def test_a_program_does_not_reach_past_backends_h(self):
        self.assert_one({"backends/local/A.h": "", "agent/main.cpp": '#include "backends/local/A.h"\n'},
                        "chooses a backend")

    def test_system_headers_on_the_inner_floors_are_found(self):
        self.assert_one({"handoff/A.cpp": "#include <unistd.h>\n"}, "standard library alone")
        self.assert_one({"agent/A.cpp": "#include <sys/stat.h>\n"}, "standard library alone")
        self.assertEqual(self.findings({"backends/local/A.cpp": "#include <unistd.h>\n"}), [])

    def test_a_tools_rooms_include_what_is_below_them(self):
        tool = "tools/welcomer"
        files = {f"{tool}/{room}/A.h": "" for room in ("terminal", "cli", "login", "story", "commands")}
        def use(room):
            return f'#include "{tool}/{room}/A.h"\n'
        self.assertEqual(self.findings({**files, f"{tool}/main.cpp": use("commands") + use("terminal"),
                                        f"{tool}/login/B.cpp": use("cli"),
                                        f"{tool}/story/B.cpp": use("story") + use("login") + use("cli") + use("terminal")}), [])
        self.assert_one({**files, f"{tool}/login/B.cpp": use("story")}, "room story/ is not below login/")
        self.assert_one({**files, f"{tool}/terminal/B.cpp": use("cli")}, "room cli/ is not below terminal/")
        self.assert_one({**files, f"{tool}/cli/B.cpp": use("commands")}, "room commands/ is not below cli/")
        self.assert_one({**files, f"{tool}/other/B.cpp": use("cli")}, "tools/welcomer/other is none of the rooms")

    def test_a_missing_file_is_found(self):
        self.assert_one({"log/A.cpp": '#include "A.h"\n'}, "not in the tree")

    def test_an_empty_tree_is_found(self):
        self.assert_one({}, "no source files")


if __name__ == "__main__":
    unittest.main()
