#!/usr/bin/env python3
"""The installed tool and proxies between it and the account server.

usage: proxies_test.py BUILD_DIR SUITE
"""

import subprocess

from account_server_case import AccountServerTest, main
from tls_server import HOST, Proxy


class Proxies(AccountServerTest):
    GNOME = ("XDG_CURRENT_DESKTOP=GNOME", "GSETTINGS_BACKEND=keyfile")

    def setUp(self):
        self.server = self.serve(certificate=self.certificate)
        self.settle(self.server)

    def tearDown(self):
        super().tearDown()
        subprocess.run(["rm", "-rf", str(self.root / "root/.config")], check=True)

    def proxy(self, *arguments, **options):
        proxy = Proxy(*arguments, **options)
        self.addCleanup(proxy.close)
        return proxy

    def write_desktop_settings(self, kind, port):
        """As the desktop's settings have them after somebody has entered a proxy of this kind."""
        settings = self.root / "root/.config/glib-2.0/settings/keyfile"
        settings.parent.mkdir(parents=True)
        settings.write_text(f"[system/proxy]\nmode='manual'\n[system/proxy/{kind}]\nhost='127.0.0.1'\nport={port}\n",
                            encoding="ascii")

    def goes_through(self, proxy, *variables):
        done = self.sign_in(variables=variables)
        self.assertEqual((done.returncode, done.stderr), (0, ""), done)
        self.assertEqual(proxy.asked, [f"{HOST}:{self.server.port}"] * 2)
        self.assertEqual(len(self.server.requests), 2)
        for head in proxy.heads:
            self.assertNotIn("anna", head)

    def test_the_desktop_says_which(self):
        proxy = self.proxy()
        self.write_desktop_settings("https", proxy.port)
        self.goes_through(proxy, *self.GNOME)

    def test_one_that_speaks_socks(self):
        proxy = self.proxy(is_socks=True)
        self.write_desktop_settings("socks", proxy.port)
        self.goes_through(proxy, *self.GNOME)

    def test_the_environment_says_which_where_there_is_no_desktop(self):
        proxy = self.proxy()
        self.goes_through(proxy, f"https_proxy=http://127.0.0.1:{proxy.port}")

    def test_the_environment_says_which_where_the_desktop_says_nothing(self):
        proxy = self.proxy()
        self.goes_through(proxy, *self.GNOME, f"https_proxy=http://127.0.0.1:{proxy.port}")

    def test_a_host_that_the_environment_leaves_out_needs_none(self):
        proxy = self.proxy()
        done = self.sign_in(variables=[f"https_proxy=http://127.0.0.1:{proxy.port}", f"no_proxy={HOST}"])
        self.assertEqual((done.returncode, proxy.asked), (0, []), done)

    def test_a_unix_socket_has_none(self):
        proxy = self.proxy()
        path = self.root / "run/unproxied"
        self.serve(path=path)
        self.addCleanup(path.unlink)
        self.settle(AccountServer="unix:/run/unproxied")
        self.write_desktop_settings("https", proxy.port)
        variables = [f"{name}=http://127.0.0.1:{proxy.port}" for name in ("http_proxy", "https_proxy", "all_proxy")]
        done = self.sign_in(variables=[*self.GNOME, *variables])
        self.assertEqual((done.returncode, proxy.asked), (0, []), done)

    def test_one_that_refuses(self):
        for status, connections, text in (
                (403, 1, f"the network's proxy does not connect to {HOST}:{self.server.port} (HTTP status 403): ask who runs "
                         "the network"),
                (407, 1, "the network's proxy wants a name and a password (HTTP status 407): give them in the network's "
                         "settings"),
                (502, 3, f"the network's proxy does not connect to {HOST}:{self.server.port} (HTTP status 502): ask who runs "
                         "the network")):
            with self.subTest(status):
                proxy = self.proxy(status)
                self.assertEqual(self.reason(self.server, [f"https_proxy=http://127.0.0.1:{proxy.port}"]), text)
                self.assertEqual((len(proxy.asked), self.server.connections), (connections, 0))

    def test_one_that_refuses_in_socks(self):
        proxy = self.proxy(2, is_socks=True)  # not allowed by its rules
        self.write_desktop_settings("socks", proxy.port)
        self.assertRegex(self.reason(self.server, self.GNOME),
                         rf"^the network's proxy does not connect to {HOST}:{self.server.port} \(.*\): ask who runs the network$")
        self.assertEqual(self.server.connections, 0)

    def test_one_that_is_not_there(self):
        proxy = Proxy()
        proxy.close()
        text = ": Connection refused: look at the proxy in the network's settings"
        self.assertEqual(self.reason(self.server, [f"https_proxy=http://127.0.0.1:{proxy.port}"]),
                         f"the network's proxy cannot be reached at 127.0.0.1 port {proxy.port}" + text)
        self.assertRegex(self.reason(self.server, ["https_proxy=http://nowhere.example:3128"]),
                         r"^the name of the network's proxy is not found \(.*nowhere.example\): look at the proxy in")
        self.write_desktop_settings("https", proxy.port)
        self.assertEqual(self.reason(self.server, self.GNOME),
                         f"the network's proxy cannot be reached at 127.0.0.1 port {proxy.port}" + text)


if __name__ == "__main__":
    main()
