#!/usr/bin/env python3
"""The installed tool and account servers that it must not trust, or cannot reach.

usage: distrust_test.py BUILD_DIR SUITE
"""

import ssl

from account_server_case import AccountServerTest, main, right
from tls_server import HOST, Authority, Server, answer


class WithoutTrust(AccountServerTest):
    def refuses_certificate(self, certificate, text):
        server = self.serve(certificate=certificate)
        self.assertIn(f"the certificate of {HOST}:{server.port} {text}", self.reason(server))
        self.assertEqual(server.requests, [], "no password is sent")

    def test_an_authority_that_is_not_known(self):
        other = Authority(self.folder / "other")
        self.refuses_certificate(other.issue("right"), "is from an authority that is not known")

    def test_a_certificate_that_is_its_own_authority(self):
        self.refuses_certificate(self.authority.self_signed(), "is from an authority that is not known")

    def test_a_login_page_that_answers_in_the_servers_place(self):
        portal = Authority(self.folder / "portal")
        for certificate, text in ((portal.issue("portal", host="portal.example"), "is from an authority that is not known"),
                                  (self.authority.issue("known", host="portal.example"), "is for another host")):
            server = self.serve(lambda *_: answer(302, "", fields="Location: https://portal.example/\r\n"),
                                certificate=certificate)
            said = self.reason(server)
            self.assertIn(text, said)
            self.assertIn(": a login page of this network may stand in between, or the ", said)
            self.assertEqual(server.requests, [])

    def test_a_certificate_for_another_host(self):
        self.refuses_certificate(self.authority.issue("other", host="other.example"), "is for another host")

    def test_a_certificate_that_has_expired(self):
        self.refuses_certificate(self.authority.issue("old", end="20200201000000Z"), "has expired by this machine's clock")

    def test_a_certificate_of_the_future(self):
        self.refuses_certificate(self.authority.issue("new", start="20480101000000Z"),
                                 "is not valid yet by this machine's clock")

    def with_revocations(self, server, *lists):
        (self.root / "etc/revocations.pem").write_text("".join(lists), encoding="ascii")
        return self.reason(server, AccountServerRevocations="/etc/revocations.pem")

    def test_a_certificate_that_its_authority_has_revoked(self):
        revoking = Authority(self.folder / "revoking")
        (self.root / "etc/revoking.pem").write_bytes(revoking.certificate.read_bytes())
        good, bad = revoking.issue("good"), revoking.issue("bad")
        revoking.revoke(bad[0])
        (self.root / "etc/revocations.pem").write_text(revoking.revocations(), encoding="ascii")
        settings = {"AccountServerAuthority": "/etc/revoking.pem", "AccountServerRevocations": "/etc/revocations.pem"}
        server = self.serve(certificate=bad)
        self.assertEqual(self.reason(server, **settings), f"the certificate of {HOST}:{server.port}, or that of its authority, "
                         "has been revoked: ask who runs the server")
        self.assertEqual((server.requests, server.connections), ([], 1), "no password is sent, and nothing is tried again")
        self.settle(self.serve(certificate=good), **settings)
        self.assertEqual(self.sign_in().returncode, 0)

    def test_a_certificate_from_an_authority_that_is_revoked(self):
        between = Authority(self.folder / "between", issuer=self.authority)
        server = self.serve(certificate=between.issue("below"))
        self.assertEqual(self.with_revocations(server, self.authority.revocations()),
                         f"the certificate of {HOST}:{server.port} is from an authority of which /etc/revocations.pem has no "
                         "list of what it has revoked: add it, or change the setting AccountServerRevocations")
        self.authority.revoke(between.certificate)
        self.assertIn("or that of its authority, has been revoked",
                      self.with_revocations(server, self.authority.revocations(), between.revocations()))
        self.assertEqual(server.requests, [])

    def test_a_list_of_what_is_revoked_that_is_old_or_none(self):
        server = self.serve(certificate=self.certificate)
        self.assertRegex(self.with_revocations(server, self.authority.revocations(end="20200202000000Z")),
                         f"^the list in /etc/revocations.pem of what the authority of {HOST}:{server.port} has revoked is not "
                         "of today by this machine's clock, which says .*: set the clock, or get the authority's newest list$")
        self.assertEqual(self.with_revocations(server, "nothing"),
                         "the list of what is revoked in /etc/revocations.pem cannot be read")
        self.assertEqual(server.requests, [])

    def test_authorities_that_cannot_be_read(self):
        server = self.serve(certificate=self.certificate)
        self.assertEqual(self.reason(server, AccountServerAuthority="/etc/nothing.pem"),
                         "the authorities in /etc/nothing.pem cannot be read")

    def test_a_server_that_offers_old_tls_alone(self):
        context = ssl.SSLContext(ssl.PROTOCOL_TLS_SERVER)
        context.set_ciphers("ALL:@SECLEVEL=0")
        context.minimum_version = ssl.TLSVersion.TLSv1
        context.maximum_version = ssl.TLSVersion.TLSv1_1
        server = self.serve(certificate=self.certificate, context=context)
        self.assertIn("does not offer TLS 1.2 or newer", self.reason(server))
        self.assertEqual(server.requests, [])

    def test_a_server_without_tls(self):
        server = self.serve()
        self.assertIn("does not speak TLS there", self.reason(server))
        self.assertEqual(server.requests, [])

    def test_a_redirect(self):
        other = self.serve()
        server = self.serve(lambda *_: answer(307, "", fields=f"Location: http://{HOST}:{other.port}/\r\n"),
                            certificate=self.certificate)
        self.assertIn(f"sends on to http://{HOST}:{other.port}/, where no password is sent",
                      self.reason(server))
        self.assertEqual(other.connections, 0)

    def test_a_login_page_of_the_network(self):
        server = self.serve(lambda *_: answer(200, "<html>", "text/html"), certificate=self.certificate)
        self.assertIn("a login page of this network may stand in between", self.reason(server))

    def test_a_server_that_is_not_there(self):
        server = Server(right)
        server.close()
        self.assertEqual(self.reason(server), f"no server can be reached at {HOST}:{server.port}: Connection refused")

    def test_a_name_that_is_not_found(self):
        self.assertIn("the name of nowhere.example is not found", self.reason(AccountServer="https://nowhere.example"))

    def test_a_machine_without_a_network(self):
        self.assertIn("there is no network connection to 192.0.2.1: Network is unreachable",
                      self.reason(AccountServer="https://192.0.2.1"))

    def test_a_server_that_is_silent(self):
        server = self.serve(is_silent=True)
        self.assertEqual(self.reason(server, AccountServerConnectSeconds="1", AccountServerSeconds="2"),
                         f"no connection to {HOST}:{server.port} within 1 s: look at the network")

    def test_a_missing_module_lets_nobody_in(self):
        modules = list(self.root.glob("usr/local/lib/**/accountserver.so"))
        self.assertEqual(len(modules), 1)
        hidden = modules[0].rename(modules[0].with_suffix(".away"))
        try:
            self.assertIn("the module accountserver.so cannot be used", self.reason(AccountServer="https://192.0.2.1"))
        finally:
            hidden.rename(modules[0])


if __name__ == "__main__":
    main()
