"""The installed account server on a test's machine: started as the service manager would, and asked over HTTP."""

import fcntl
import http.client
import json
import os
import plistlib
import re
import signal
import socket
import ssl
import subprocess
import uuid
from pathlib import Path

PROGRAM = "/usr/local/libexec/welcomer-account-server"
SOCKET = "run/welcomer-account-server.sock"
DIRECTORY = "var/lib/welcomer/nimbus-directory.plist"
PASSWORD = "right horse"


# Asks over the Unix socket of a machine as whoever runs it.
ASK = """
import http.client, socket, sys
class Connection(http.client.HTTPConnection):
    def connect(self):
        self.sock = socket.socket(socket.AF_UNIX)
        self.sock.connect("/run/welcomer-account-server.sock")
connection = Connection("localhost", timeout=60)
connection.request("POST", sys.argv[1], sys.argv[2], {"Content-Type": "application/json"})
answer = connection.getresponse()
print(answer.status, answer.read().decode())
"""


def ask_on(machine, user, path, members):
    """What a user of a booted machine is answered: the status, and the content if there is any."""
    status, body = machine.must(["python3", "-c", ASK, path, json.dumps(members)], user).split(" ", 1)
    return int(status), json.loads(body) if body.strip() else None


def make_certificate(folder, name="server", authority=None, places="DNS:localhost,IP:127.0.0.1"):
    """Makes a key and a certificate of places: of an authority, or one that is an authority itself. All in PEM."""
    key, certificate = folder / f"{name}.key", folder / f"{name}.pem"
    command = ["openssl", "req", "-x509", "-newkey", "ec", "-pkeyopt", "ec_paramgen_curve:P-256", "-nodes", "-days", "2",
               "-subj", f"/CN={name}", "-keyout", key, "-out", certificate]
    if authority:
        command += ["-CA", folder / f"{authority}.pem", "-CAkey", folder / f"{authority}.key",
                    "-addext", f"subjectAltName={places}", "-addext", "basicConstraints=critical,CA:FALSE"]
    else:
        command += ["-addext", "keyUsage=critical,keyCertSign"]
    subprocess.run([str(part) for part in command], check=True, capture_output=True)
    return key, certificate


def hash_of(password):
    """A hash of the least work that crypt() takes: a test checks thousands."""
    return subprocess.run(["openssl", "passwd", "-5", "-salt", f"rounds=1000${os.urandom(6).hex()}", "-stdin"], input=password,
                          check=True, capture_output=True, text=True).stdout.strip()


def write_directory(root, users):
    """Writes the directory file; each user has the password of the tests unless something else is given."""
    right = hash_of(PASSWORD)
    path = Path(root) / DIRECTORY
    path.parent.mkdir(parents=True, exist_ok=True)
    path.write_bytes(plistlib.dumps({"Users": {name: {"Password": right, **user} for name, user in users.items()}}))


def body_of(user="anna", password=PASSWORD, **members):
    """The members of a request; None leaves one out."""
    body = {"requestID": str(uuid.uuid4()), "user": user, "password": password, "delegatesRequest": {"delegates": {}},
            "machine": {"product": "Debian GNU/Linux", "version": "12", "locale": "C.UTF-8"}, **members}
    return {name: value for name, value in body.items() if value is not None}


class OverUnixSocket(http.client.HTTPConnection):
    def __init__(self, path, timeout=60):
        super().__init__("localhost", timeout=timeout)
        self._path = str(path)

    def connect(self):
        self.sock = socket.socket(socket.AF_UNIX)
        self.sock.settimeout(self.timeout)
        self.sock.connect(self._path)


class Answer:
    def __init__(self, response):
        self.status = response.status
        self.headers = response.headers
        self.bytes = response.read()
        self.kind = response.headers.get("Content-Type", "")

    @property
    def content(self):
        return plistlib.loads(self.bytes) if self.kind == "application/x-plist" else json.loads(self.bytes)

    @property
    def problem(self):
        return self.content["type"].removeprefix("urn:welcomer:problem:")

    def __repr__(self):
        return f"{self.status} {self.bytes[:300]!r}"


class AccountServer:
    """One server with a Unix socket, a socket for TLS, one in the clear on the loopback address, and one for the figures."""

    def __init__(self, machine, settings="", name="", state=True, certificate=None):
        """settings: the file's text. state: whether there is a folder of the server's own."""
        self.machine, self.name = machine, name
        self.path = machine.root / f"{SOCKET}{name}"
        self.settings_file = machine.root / "etc/welcomer/account-server.conf"
        self.settings_file.parent.mkdir(parents=True, exist_ok=True)
        self.settings = settings
        self.environment = {"GLIBC_TUNABLES": "glibc.malloc.tcache_count=0"}  # as the unit has it
        if state:
            folder = machine.root / f"var/lib/welcomer-account-server{name}"
            folder.mkdir(parents=True)
            self.environment["STATE_DIRECTORY"] = "/" + str(folder.relative_to(machine.root))
        self.sockets = {"account": socket.socket(socket.AF_UNIX)}
        self.sockets["account"].bind(str(self.path))
        self.path.chmod(0o666)
        self.sockets["account"].listen(512)
        for use in (["tls"] if certificate else []) + ["clear", "metrics"]:
            self.sockets[use] = socket.create_server(("127.0.0.1", 0), backlog=512)
        self.certificate = certificate
        self.process = None

    def write_settings(self, settings):
        self.settings_file.write_text(settings, encoding="utf-8")

    def fail_to_start(self):
        """Starts it where that does not succeed, and gives what it says."""
        self.write_settings(self.settings)
        process = self._run({}, stderr=subprocess.PIPE, text=True)
        said = process.communicate(timeout=60)[1]
        assert process.returncode == 1, said
        return said

    def start(self, **options):
        self.write_settings(self.settings)
        ready = socket.socket(socket.AF_UNIX, socket.SOCK_DGRAM)
        notify = self.machine.root / f"run/notify{self.name}"
        notify.unlink(missing_ok=True)
        ready.bind(str(notify))
        ready.settimeout(60)
        self._notify = ready
        self.process = self._run({"NOTIFY_SOCKET": f"/run/notify{self.name}"}, **options)
        self.wait_for_notice("READY=1")

    def _run(self, variables, **options):
        variables = {"LISTEN_FDS": str(len(self.sockets)), "LISTEN_FDNAMES": ":".join(self.sockets), **self.environment, **variables}
        command = ["/usr/bin/env", *(f"{name}={value}" for name, value in variables.items()),
                   "/bin/sh", "-c", f"LISTEN_PID=$$ exec {PROGRAM}"]
        return self.machine.start(command, preexec_fn=self._hand_over, close_fds=False, **options)

    def wait_for_notice(self, text):
        while text not in self._notify.recv(4096).decode().split("\n"):
            pass

    def _hand_over(self):
        high = [fcntl.fcntl(each.fileno(), fcntl.F_DUPFD, 100) for each in self.sockets.values()]
        for place, number in enumerate(high, 3):
            os.dup2(number, place, inheritable=True)
            os.close(number)

    def reload(self):
        self.process.send_signal(signal.SIGHUP)
        self.wait_for_notice("RELOADING=1")
        self.wait_for_notice("READY=1")

    def stop(self):
        """Ends it, and gives its exit status."""
        self.process.terminate()
        status = self.process.wait(timeout=60)
        self._notify.close()
        return status

    def close(self):
        if self.process and self.process.poll() is None:
            self.stop()
        for each in self.sockets.values():
            each.close()

    def address(self, use):
        return self.sockets[use].getsockname()

    def connect(self, use="account"):
        """A connection for requests: `account` is the Unix socket."""
        if use == "account":
            return OverUnixSocket(self.path)
        host, port = self.address(use)
        if use == "tls":
            return http.client.HTTPSConnection(host, port, timeout=60,
                                               context=ssl.create_default_context(cafile=self.certificate))
        return http.client.HTTPConnection(host, port, timeout=60)

    def open(self, use="account"):
        """A bare connection."""
        if use == "account":
            bare = socket.socket(socket.AF_UNIX)
            bare.settimeout(60)
            bare.connect(str(self.path))
            return bare
        bare = socket.create_connection(self.address(use), timeout=60)
        if use == "tls":
            return ssl.create_default_context(cafile=self.certificate).wrap_socket(bare, server_hostname="127.0.0.1")
        return bare

    def request(self, method, path, body=None, headers=None, use="account"):
        connection = self.connect(use)
        try:
            connection.request(method, path, body, headers or {})
            return Answer(connection.getresponse())
        finally:
            connection.close()

    def post(self, path, members, use="account", headers=None, form="json"):
        plain = json.dumps(members).encode() if form == "json" else plistlib.dumps(members)
        kind = "application/json" if form == "json" else "application/x-plist"
        return self.request("POST", path, plain, {"Content-Type": kind, **(headers or {})}, use)

    def authenticate(self, user="anna", password=PASSWORD, use="account", headers=None, form="json", **members):
        return self.post("/v1/authenticate", body_of(user, password, **members), use, headers, form)

    def accept_terms(self, user, terms, password=PASSWORD, use="account"):
        return self.post("/v1/accept-terms", body_of(user, password, delegatesRequest=None, terms=terms), use)

    def figures(self):
        """Every figure by its name with its labels."""
        text = self.request("GET", "/metrics", use="metrics").bytes.decode()
        lines = [line.rsplit(" ", 1) for line in text.splitlines() if not line.startswith("#")]
        return {name.removeprefix("welcomer_account_"): float(value) for name, value in lines}

    def memory_holds(self, text):
        """Whether a text is anywhere in the server's memory."""
        process = Path(f"/proc/{self.process.pid}")
        with open(process / "maps", encoding="ascii") as maps, open(process / "mem", "rb", buffering=0) as memory:
            for line in maps:
                area = re.match(r"([0-9a-f]+)-([0-9a-f]+) r", line)
                if not area or "[v" in line:  # what the kernel shows there cannot be read
                    continue
                begin, end = (int(place, 16) for place in area.groups())
                memory.seek(begin)
                if text.encode() in memory.read(end - begin):
                    return True
        return False
