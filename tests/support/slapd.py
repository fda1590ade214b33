"""A directory of a test's own: Debian's slapd as an ordinary process, on loopback addresses of the test's namespace."""

import base64
import os
import signal
import socket
import subprocess
import time
from pathlib import Path

BASE = "dc=nimbus,dc=example"
CONFIGURATION = """
include {tree}/etc/ldap/schema/core.schema
include {tree}/etc/ldap/schema/cosine.schema
include {tree}/etc/ldap/schema/inetorgperson.schema
modulepath {tree}/usr/lib/ldap
moduleload back_mdb.so
TLSCertificateFile {folder}/server.pem
TLSCertificateKeyFile {folder}/server.key
database mdb
suffix "{base}"
directory {data}
maxsize 268435456
index objectClass,uid eq
access to attrs=userPassword by anonymous auth by * none
access to attrs=description by self write by dn.exact="cn=searcher,{base}" read by * none
access to * by dn.exact="cn=searcher,{base}" read by * none
"""


def tree_of(*folders):
    """The first of some folders that slapd is unpacked in, or else the machine's root folder, where it is installed."""
    for folder in (*folders, "/"):
        if Path(folder, "usr/sbin/slapd").exists():
            return Path(folder)
    raise FileNotFoundError("slapd: scripts/fetch-package slapd FOLDER")


def environment_of(tree):
    """The variables that its programs run with: one of their libraries comes with them."""
    return {**os.environ, "LDAPNOINIT": "1",
            "LD_LIBRARY_PATH": ":".join(str(path.parent) for path in tree.glob("usr/lib/*/libslapi*.so.0"))}


def entry(name, attributes):
    """An entry of an LDIF file; a list has several values."""
    lines = [f"dn: {name}"]
    for attribute, values in attributes.items():
        lines += [f"{attribute}:: {base64.b64encode(value.encode()).decode()}"
                  for value in (values if isinstance(values, list) else [values])]
    return "\n".join(lines) + "\n"


class Slapd:
    """One server. What it serves is the same in each that is given the same entries."""

    def __init__(self, tree, folder, data, entries, ports):
        """tree: as tree_of() finds it. folder: with server.pem and server.key. data: a folder of its own. ports: for ldap and
        ldaps."""
        data.mkdir()
        self.address, self.secure_address = (f"{kind}://127.0.0.1:{port}" for kind, port in zip(("ldap", "ldaps"), ports))
        # An address that is not in the certificate.
        self.other_address = self.address.replace("127.0.0.1", "127.0.0.2")
        self._port = ports[0]
        self._configuration = data / "slapd.conf"
        self._configuration.write_text(CONFIGURATION.format(tree=tree, folder=folder, data=data, base=BASE), encoding="utf-8")
        self._program = tree / "usr/sbin/slapd"
        self._environment = environment_of(tree)
        subprocess.run([self._program, "-T", "add", "-q", "-f", self._configuration], input="\n".join(entries), check=True,
                       text=True, capture_output=True, env=self._environment)
        self._process = None

    def start(self):
        self._process = subprocess.Popen(
            [self._program, "-f", self._configuration, "-h", f"{self.address} {self.secure_address} {self.other_address}", "-d", "0"],
            stdin=subprocess.DEVNULL, stderr=subprocess.DEVNULL, env=self._environment)
        end = time.monotonic() + 60
        while True:
            try:
                socket.create_connection(("127.0.0.1", self._port)).close()
                return
            except ConnectionRefusedError:
                if time.monotonic() > end or self._process.poll() is not None:
                    raise
                time.sleep(0.02)

    def fall_silent(self):
        """Has it answer nothing more, without losing a connection."""
        self._process.send_signal(signal.SIGSTOP)

    def stop(self):
        if self._process:
            self._process.kill()
            self._process.wait()
            self._process = None
