"""The story of an organisation's users: they sign in over HTTPS, and the account server asks the organisation's directory."""

import concurrent.futures
import plistlib
import shutil
import tempfile
from pathlib import Path

import account_server
import slapd
from stories import PASSWORD, SET_UP, Story

HOST = "accounts.nimbus.example"
ADDRESS = f"https://{HOST}:8443"
LDAP_PORTS = (3890, 6360)
SEARCHER, SEARCHERS_PASSWORD = f"cn=searcher,{slapd.BASE}", "looking for people"
WRONG_PASSWORD = "wrong horse"
SERVER, GROUP = "welcomer-account-server", "welcomer-accounts"
# What an administrator has there for the account server, and for whoever asks it.
SERVER_SETTINGS = f"""
Certificate=/etc/welcomer/server.pem
Key=/etc/welcomer/server.key
Source=ldap
LdapServers=ldap://127.0.0.1:{LDAP_PORTS[0]}
LdapAuthority=/etc/welcomer/authority.pem
LdapBase={slapd.BASE}
LdapSearchName={SEARCHER}
LdapSearchPasswordFile=/etc/welcomer/ldap-password
LdapAttribute=mail mailAddress
LdapAttribute=mail delegates/com.corvid.chatter/aliases[]
LdapAttribute=mail delegates/com.corvid.vidlink/aliases[]
LdapValue=delegates/com.corvid.chatter/status:integer 0
LdapValue=delegates/com.corvid.vidlink/status:integer 0
LdapValue=delegates/com.corvid.deskmate/status:integer 0
"""
SETTINGS = f"AccountServer={ADDRESS}\nAccountServerAuthority=/etc/welcomer/authority.pem\n"
ENABLE = f"""
    cd /etc/welcomer
    chgrp {GROUP} server.key ldap-password
    chmod 640 server.key ldap-password
    systemctl enable --quiet --now {SERVER}.socket {SERVER}-tls.socket
"""


def entries(names):
    """The directory: who searches, and the users."""
    yield slapd.entry(slapd.BASE, {"objectClass": ["dcObject", "organization"], "o": "Nimbus", "dc": "nimbus"})
    yield slapd.entry(SEARCHER, {"objectClass": ["organizationalRole", "simpleSecurityObject"], "cn": "searcher",
                                 "userPassword": SEARCHERS_PASSWORD})
    for name in names:
        yield slapd.entry(f"uid={name},{slapd.BASE}",
                          {"objectClass": "inetOrgPerson", "uid": name, "cn": name, "sn": name, "userPassword": PASSWORD,
                           "mail": [f"{name}@nimbus.example", f"{name}@mail.nimbus.example"]})


class Organisation(Story):
    """One user is set up by the administrator, the other one in a session of their own."""

    names, administered = ("newcomer", "latecomer"), ("newcomer",)
    aliases = 2
    set_up, own_setup = SET_UP, ()
    slapd = None  # the folder that it is in

    def run(self):
        self.directory = None
        self.folder = Path(tempfile.mkdtemp(prefix="organisation-"))
        try:
            return super().run()
        finally:
            if self.directory:
                self.directory.stop()
            shutil.rmtree(self.folder)

    def install(self):
        super().install()
        account_server.make_certificate(self.folder, "authority")
        account_server.make_certificate(self.folder, "server", "authority", f"DNS:{HOST},IP:127.0.0.1")
        # In the machine's network, as another host is.
        with concurrent.futures.ThreadPoolExecutor(1) as pool:
            pool.submit(self._start_directory).result()
        for name in ("authority.pem", "server.pem", "server.key"):
            self.machine.write(f"etc/welcomer/{name}", (self.folder / name).read_text(encoding="ascii"))
        self.machine.write("etc/welcomer/ldap-password", SEARCHERS_PASSWORD + "\n")
        self.machine.write("etc/welcomer/account-server.conf", SERVER_SETTINGS)
        self.machine.write("etc/welcomer/platform.conf", SETTINGS)
        self.machine.write("etc/hosts", f"127.0.0.1 localhost {HOST}\n")
        self.machine.must(["sh", "-ec", ENABLE])

    def _start_directory(self):
        self.machine.enter_network()
        self.directory = slapd.Slapd(self.slapd, self.folder, self.folder / "directory", list(entries(self.names)), LDAP_PORTS)
        self.directory.start()

    def before_setup(self, newcomer, set_up):
        newcomer.refused = set_up(WRONG_PASSWORD)
        newcomer.installed_when_refused = newcomer.launch_agent.exists()

    def look_afterwards(self, newcomer):
        self.server_log = self.machine.journal("-t", SERVER)
        self.everything = "\n".join(self.machine.journal())
        directory = self.machine.root / account_server.DIRECTORY
        contents = directory.read_bytes()
        self.users_of_the_machine = list(plistlib.loads(contents).get("Users", ())) if contents else []
