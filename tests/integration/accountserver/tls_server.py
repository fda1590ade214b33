"""Account servers of a test's own: over TLS, with certificates from an authority of its own, and over Unix sockets."""

import json
import select
import socket
import ssl
import subprocess
import threading
from pathlib import Path

HOST = "accounts.example"
AN_AUTHORITY = "basicConstraints=critical,CA:TRUE"
CONFIGURATION = """[ca]
default_ca = own
[own]
database = {folder}/index
serial = {folder}/serial
new_certs_dir = {folder}
default_md = sha256
policy = any
unique_subject = no
x509_extensions = named
[any]
commonName = supplied
[named]
{extension}
"""


def openssl(*arguments):
    subprocess.run(["openssl", *map(str, arguments)], check=True, stdout=subprocess.DEVNULL, stderr=subprocess.DEVNULL)


class Authority:
    """Issues certificates; `certificate` is its own, for those who trust it."""

    def __init__(self, folder, issuer=None):
        """issuer: the authority that its certificate is from; its own, where there is none."""
        self.folder = Path(folder)
        self.folder.mkdir()
        (self.folder / "index").write_text("", encoding="ascii")
        (self.folder / "serial").write_text("01\n", encoding="ascii")
        if issuer:
            self.certificate, self._key = issuer.issue(self.folder.name, extension=AN_AUTHORITY)
            self._chain = Path(self.certificate).read_bytes()
        else:
            self.certificate, self._key = self.folder / "authority.pem", self.folder / "authority.key"
            openssl("req", "-x509", "-newkey", "ec", "-pkeyopt", "ec_paramgen_curve:P-256", "-nodes", "-days", "30",
                    "-subj", "/CN=test authority", "-addext", AN_AUTHORITY, "-keyout", self._key, "-out", self.certificate)
            self._chain = b""

    def issue(self, name, host=HOST, start="20200101000000Z", end="20490101000000Z", extension=None):
        """The files of a certificate for a host, and of its key."""
        base = self.folder / name
        openssl("req", "-newkey", "ec", "-pkeyopt", "ec_paramgen_curve:P-256", "-nodes", "-subj", f"/CN={name}",
                "-keyout", f"{base}.key", "-out", f"{base}.csr")
        self._ca(extension or f"subjectAltName=DNS:{host}", "-in", f"{base}.csr", "-out", f"{base}.pem", "-startdate", start,
                 "-enddate", end, "-notext")
        with open(f"{base}.pem", "ab") as certificates:
            certificates.write(self._chain)
        return f"{base}.pem", f"{base}.key"

    def revoke(self, certificate):
        self._ca(AN_AUTHORITY, "-revoke", certificate)

    def revocations(self, end="20490101000000Z"):
        """The list, as text, of what it has revoked so far."""
        path = self.folder / "revocations.pem"
        self._ca(AN_AUTHORITY, "-gencrl", "-crl_lastupdate", "20200101000000Z", "-crl_nextupdate", end, "-out", path)
        return path.read_text(encoding="ascii")

    def _ca(self, extension, *arguments):
        (self.folder / "ca.conf").write_text(CONFIGURATION.format(folder=self.folder, extension=extension), encoding="ascii")
        openssl("ca", "-batch", "-config", self.folder / "ca.conf", "-cert", self.certificate, "-keyfile", self._key,
                *arguments)

    def self_signed(self, host=HOST):
        base = self.folder / "self"
        openssl("req", "-x509", "-newkey", "ec", "-pkeyopt", "ec_paramgen_curve:P-256", "-nodes", "-days", "30",
                "-subj", "/CN=self", "-addext", f"subjectAltName=DNS:{host}", "-keyout", f"{base}.key", "-out", f"{base}.pem")
        return f"{base}.pem", f"{base}.key"


def answer(status, body, kind="application/json", fields=""):
    content = (body if isinstance(body, str) else json.dumps(body)).encode()
    head = f"HTTP/1.1 {status} Whatever\r\nContent-Type: {kind}\r\nContent-Length: {len(content)}\r\n{fields}\r\n"
    return head.encode() + content


def problem(status, name, **more):
    return answer(status, {"type": f"urn:welcomer:problem:{name}", "status": status, **more}, "application/problem+json")


class Server:
    """Answers each request with what a function makes of it, (line, body) -> bytes, or pieces of them; one connection for
    each.

    Without a certificate it answers what is no HTTP as other such servers do, unless it is silent.
    """

    def __init__(self, reply, certificate=None, path=None, context=None, is_silent=False, hangs_up=False):
        self.requests, self.connections = [], 0
        self._is_silent, self._hangs_up = is_silent, hangs_up
        self._reply, self._context = reply, context
        if certificate:
            self._context = context or ssl.SSLContext(ssl.PROTOCOL_TLS_SERVER)
            self._context.load_cert_chain(*certificate)
        self._socket = socket.socket(socket.AF_UNIX if path else socket.AF_INET)
        self._socket.bind(str(path) if path else ("127.0.0.1", 0))
        self._socket.listen(64)
        self.port = None if path else self._socket.getsockname()[1]
        self._open = []
        self._thread = threading.Thread(target=self._serve, daemon=True)
        self._thread.start()

    def close(self):
        self._socket.shutdown(socket.SHUT_RDWR)
        self._thread.join(timeout=60)
        self._socket.close()

    def _serve(self):
        while True:
            try:
                connection, _ = self._socket.accept()
            except OSError:
                return
            self.connections += 1
            connection.settimeout(60)
            if self._hangs_up:
                connection.close()
                continue
            try:
                with self._context.wrap_socket(connection, server_side=True) if self._context else connection as stream:
                    self._serve_one(stream)
            except OSError:
                connection.close()

    def _serve_one(self, stream):
        data = b""
        while b"\r\n\r\n" not in data:
            more = stream.recv(65536)
            if not more:
                return
            data += more
            if data.startswith(b"\x16\x03") and not self._is_silent:
                stream.sendall(b"HTTP/1.1 400 Bad Request\r\n\r\n")
                return
        head, body = data.split(b"\r\n\r\n", 1)
        fields = dict(line.lower().split(": ", 1) for line in head.decode().split("\r\n")[1:])
        while len(body) < int(fields.get("content-length", 0)):
            body += stream.recv(65536)
        self.requests.append((head.decode(), body.decode()))
        reply = self._reply(head.decode().split("\r\n")[0], body.decode())
        for piece in [reply] if isinstance(reply, bytes) else reply:
            stream.sendall(piece)


class Proxy:
    """Connects whoever asks to the loopback address, whatever the host is called; or answers with another status.

    With `is_socks` it speaks SOCKS 5 in the place of HTTP, and its status is that protocol's.
    """

    def __init__(self, status=None, is_socks=False):
        self.asked = []  # "HOST:PORT"
        self.heads = []
        self._status, self._is_socks = status, is_socks
        self._socket = socket.create_server(("127.0.0.1", 0))
        self.port = self._socket.getsockname()[1]
        self._thread = threading.Thread(target=self._serve, daemon=True)
        self._thread.start()

    def close(self):
        self._socket.shutdown(socket.SHUT_RDWR)
        self._thread.join(timeout=60)
        self._socket.close()

    def _serve(self):
        while True:
            try:
                connection, _ = self._socket.accept()
            except OSError:
                return
            connection.settimeout(60)
            with connection:
                try:
                    target = self._socks(connection) if self._is_socks else self._http(connection)
                    if target:
                        self._tunnel(connection, target)
                except OSError:
                    pass

    def _http(self, connection):
        data = b""
        while b"\r\n\r\n" not in data:
            data += connection.recv(65536)
        head = data.decode()
        self.heads.append(head)
        method, target, _ = head.split("\r\n")[0].split(" ")
        assert method == "CONNECT", head
        self.asked.append(target)
        connection.sendall(f"HTTP/1.1 {self._status or 200} Whatever\r\n\r\n".encode())
        return None if self._status else int(target.split(":")[1])

    def _socks(self, connection):
        connection.recv(65536)  # the ways to prove who it is
        connection.sendall(b"\x05\x00")
        question = connection.recv(65536)
        assert question[3] == 3, "the proxy is to look up the name"
        name, port = question[5:5 + question[4]].decode(), int.from_bytes(question[-2:], "big")
        self.asked.append(f"{name}:{port}")
        connection.sendall(bytes([5, self._status or 0, 0, 1, 0, 0, 0, 0, 0, 0]))
        return None if self._status else port

    @staticmethod
    def _tunnel(connection, port):
        with socket.create_connection(("127.0.0.1", port), timeout=60) as server:
            ends = {connection: server, server: connection}
            while True:
                for end in select.select(ends, [], [], 60)[0]:
                    data = end.recv(65536)
                    if not data:
                        return
                    ends[end].sendall(data)
