"""A fleet: a front, three account servers, two directories that replicate to each other, and where the machines are.

Everything is set as docs/deploying.md has it.
"""

import base64
import configparser
import contextlib
import fcntl
import hashlib
import http.client
import os
import resource
import shutil
import socket
import subprocess
import time
from pathlib import Path

import account_server
import hosts
import machine
import page
import slapd

BASE = "dc=company,dc=example"
PEOPLE = f"ou=people,{BASE}"
FRONT = "accounts.company.example"
SERVERS = [f"accounts{number}.company.example" for number in (1, 2, 3)]
DIRECTORIES = [f"ldap{number}.company.example" for number in (1, 2)]
UNPRIVILEGED = 65534  # stands for welcomer-accounts, which this machine may not have
MODULES = "/usr/lib/ldap"  # of slapd, where it is installed
RESTART_SECONDS = 1   # RestartSec= of the unit


def install(build, folder):
    """Installs what a fleet's servers need."""
    return hosts.install(build, folder, "library", "account-server")


def wait_for(condition, what, seconds=60):
    machine.Machine.wait_for(condition, what, seconds)


def answers(host, port):
    """Whether somebody takes connections there."""
    try:
        host.here(lambda: socket.create_connection((host.address, port), timeout=5).close())
        return True
    except OSError:
        return False


def hash_of(password):
    """As a directory keeps it, and checks within microseconds."""
    salt = os.urandom(8)
    return "{SSHA}" + base64.b64encode(hashlib.sha1(password.encode() + salt).digest() + salt).decode()


def mail_of(user):
    return f"{user}@company.example"


def password_of(user):
    return f"the horse of {user}"


def user_name(number):
    return f"user{number:06}"


def entries(users):
    """The directory's text: who looks after it, and so many users."""
    yield slapd.entry(BASE, {"objectClass": ["dcObject", "organization"], "o": "Company", "dc": "company"})
    for name, password in (("welcomer", "searching"), ("replicator", "replicating")):
        yield slapd.entry(f"cn={name},{BASE}", {"objectClass": ["organizationalRole", "simpleSecurityObject"], "cn": name,
                                                "userPassword": hash_of(password)})
    yield slapd.entry(PEOPLE, {"objectClass": "organizationalUnit", "ou": "people"})
    for name in map(user_name, range(users)):
        yield slapd.entry(f"uid={name},{PEOPLE}", {"objectClass": "inetOrgPerson", "uid": name, "cn": name, "sn": name,
                                                   "mail": mail_of(name), "userPassword": hash_of(password_of(name))})


class Directory:
    """One of the LDAP servers."""

    def __init__(self, host, tree):
        """tree: the folder that slapd is unpacked in."""
        self.host = host
        self._program, self._environment = tree / "usr/sbin/slapd", slapd.environment_of(tree)
        (host.root / "lib/ldap").mkdir()
        self.process = None

    def _run(self, tool, *options, **more):
        return self.host.run(self._program, "-T", tool, "-f", "/etc/ldap/slapd.conf", *options, env=self._environment, **more)

    def fill(self, text):
        self._run("add", "-q", "-w", "-S", "1", input=text)

    def fill_as(self, other):
        """Has the same entries as another one: those of its files."""
        shutil.copytree(other.host.root / "lib/ldap", self.host.root / "lib/ldap", dirs_exist_ok=True)

    def start(self):
        self.process = self.host.start(self._program, "-f", "/etc/ldap/slapd.conf", "-h",
                                       f"ldap://{self.host.name} ldapi://%2frun%2fldapi", "-d", "0", stderr=subprocess.DEVNULL,
                                       env=self._environment)
        wait_for(lambda: answers(self.host, 389), f"{self.host.name}")

    def kill(self):
        self.process.kill()
        self.process.wait()

    end = kill

    def entry(self, user):
        """What it has of a user."""
        return self._run("cat", "-a", f"(uid={user})")

    def change(self, text):
        """Changes entries, as root of that host may."""
        self.host.run("ldapmodify", "-Q", "-Y", "EXTERNAL", "-H", "ldapi://%2frun%2fldapi", input=text)


class Server:
    """One of the account servers, with the sockets of its installed units and a service manager that starts it again."""

    def __init__(self, host, installed):
        self.host = host
        units = installed / "lib/systemd/system"
        self.sockets = {}
        for unit in ("tls", "metrics"):
            parser = configparser.ConfigParser(strict=False)
            parser.read(units / f"welcomer-account-server-{unit}.socket")
            options = parser["Socket"]
            address, _, port = options["ListenStream"].rpartition(":")
            listening = host.listen(address, int(port), int(options.get("Backlog", "4096")))
            listening.setsockopt(socket.IPPROTO_TCP, socket.TCP_NODELAY, options.get("NoDelay") == "yes")
            self.sockets[options["FileDescriptorName"]] = listening
        self.process = None
        self.runs = []  # where in the log each run begins, and how it ended: "killed", "stopped" or None

    def start(self):
        notify = self.host.root / "run/notify"
        notify.unlink(missing_ok=True)
        with socket.socket(socket.AF_UNIX, socket.SOCK_DGRAM) as ready:
            ready.bind(str(notify))
            notify.chmod(0o666)
            ready.settimeout(60)
            self.runs.append([len(self.host.lines()), None])
            variables = {"LISTEN_FDS": len(self.sockets), "LISTEN_FDNAMES": ":".join(self.sockets),
                         "GLIBC_TUNABLES": "glibc.malloc.tcache_count=0", "NOTIFY_SOCKET": "/run/notify"}
            self.process = self.host.start(
                "/usr/bin/env", "-i", *(f"{name}={value}" for name, value in variables.items()), "/bin/sh", "-c",
                f"LISTEN_PID=$$ exec setpriv --reuid {UNPRIVILEGED} --regid {UNPRIVILEGED} --clear-groups "
                f"{account_server.PROGRAM}", preexec_fn=self._hand_over, close_fds=False)
            while "READY=1" not in ready.recv(4096).decode().split("\n"):
                pass

    def _hand_over(self):
        high = [fcntl.fcntl(each.fileno(), fcntl.F_DUPFD, 100) for each in self.sockets.values()]
        for place, number in enumerate(high, 3):
            os.dup2(number, place, inheritable=True)
            os.close(number)

    def kill(self):
        """Ends it in the middle of whatever it does."""
        self.process.kill()
        self.process.wait()
        self.runs[-1][1] = "killed"

    def stop(self):
        """Has it end when what is under way has its answer."""
        self.process.terminate()
        status = self.process.wait(timeout=60)
        self.runs[-1][1] = "stopped"
        assert status == 0, f"{self.host.name} ended with {status}"

    def end(self):
        if self.process and self.process.poll() is None:
            self.kill()
        for each in self.sockets.values():
            each.close()

    def start_again(self):
        time.sleep(RESTART_SECONDS)
        self.start()

    def figures(self):
        """Every figure by its name with its labels."""
        def ask():
            connection = http.client.HTTPConnection("127.0.0.1", self.sockets["metrics"].getsockname()[1], timeout=60)
            connection.request("GET", "/metrics")
            text = connection.getresponse().read().decode()
            connection.close()
            return text

        lines = [line.rsplit(" ", 1) for line in self.host.here(ask).splitlines() if not line.startswith("#")]
        return {name.removeprefix("welcomer_account_"): float(value) for name, value in lines}

    def log(self):
        """The lines of each run, as (how it ended, lines)."""
        lines = self.host.lines()
        ends = [begin for begin, _ in self.runs[1:]] + [None]
        return [(how, lines[begin:end]) for (begin, how), end in zip(self.runs, ends)]


class Front:
    def __init__(self, host, tree):
        """tree: the folder that nginx is unpacked in."""
        self.host, self._program = host, tree / "usr/sbin/nginx"
        for folder in ("lib/nginx", "log/nginx"):
            (host.root / folder).mkdir()

    def start(self):
        self.process = self.host.start(self._program, "-g", "daemon off;")
        wait_for(lambda: answers(self.host, 443), "the front")

    def workers(self):
        children = Path(f"/proc/{self.process.pid}/task/{self.process.pid}/children").read_text(encoding="ascii")
        return [int(number) for number in children.split()]

    def given_up(self):
        """How often it has waited too long for a server's answer."""
        lines = (self.host.root / "log/nginx/access.log").read_text(encoding="ascii").splitlines()
        return sum(line.count("504") for line in (line.split(" ", 1)[1] for line in lines))

    def kill_worker(self):
        """Ends one of those that have the connections; the master starts another one."""
        os.kill(self.workers()[0], 9)

    def end(self):
        self.process.terminate()
        self.process.wait(timeout=60)


class Fleet:
    def __init__(self, folder, build, installed, users):
        """folder: empty. installed: what install() gives. users: how many the directories have."""
        self.build, self.users = Path(build).resolve(), users
        hard = resource.getrlimit(resource.RLIMIT_NOFILE)[1]
        resource.setrlimit(resource.RLIMIT_NOFILE, (min(hard, 65536), hard))  # LimitNOFILE= of the unit
        with contextlib.ExitStack() as made:  # ends with what could not be made whole
            self.network = hosts.Network(folder, installed, page.hosts())
            made.callback(self.network.close)
            self._set(folder)
            self.front = Front(self._host(FRONT), self.build / "nginx")
            self.servers = [Server(self._host(name, FRONT), installed) for name in SERVERS]
            self.directories = [Directory(self._host(name), self.build / "slapd") for name in DIRECTORIES]
            self.office = self._host("office.company.example", address="192.0.2.100")
            self.directories[0].fill("\n".join(entries(users)))
            self.directories[1].fill_as(self.directories[0])
            for part in (*self.directories, *self.servers, self.front):
                made.callback(part.end)
                part.start()
            self._made = made.pop_all()

    def _set(self, folder):
        self.settings = page.files()
        for path, text in self.settings.items():
            if path.startswith("/etc/"):
                self.network.write(path, text.replace(MODULES, f"{self.build}/slapd{MODULES}"))
        shutil.copytree(self.build / "slapd/etc/ldap/schema", self.network.etc / "ldap/schema")
        self.network.write("/etc/welcomer/ldap-password", "searching\n")
        self.authority = Path(folder)
        account_server.make_certificate(self.authority, "authority")

    def _host(self, name, *more_names, address=None):
        host = self.network.add(name, address)
        places = f"IP:{host.address}," + ",".join(f"DNS:{each}" for each in (name, *more_names))
        key, certificate = account_server.make_certificate(self.authority, name, "authority", places)
        shutil.copy(certificate, host.certificates / "host.pem")
        shutil.copy(key, host.certificates / "host.key")
        os.chown(host.certificates / "host.key", UNPRIVILEGED, UNPRIVILEGED)
        shutil.copy(self.authority / "authority.pem", host.certificates)
        return host

    def machines(self, plan, at_once, tries=5):
        """Starts machines that follow a plan, lines of (seconds, user, password)."""
        settings = page.settings(self.settings["/usr/share/welcomer/platform.conf"])
        return Program(self.office, [self.build / "fleet/fleet-machines", settings["AccountServer"],
                                     settings["AccountServerAuthority"], at_once, tries], plan)

    def binds(self, plan, at_once):
        """Starts the peer: the users sign in to the first directory by themselves."""
        named = [(at, f"uid={user},{PEOPLE}", password) for at, user, password in plan]
        return Program(self.office, [self.build / "fleet/fleet-binds", f"ldap://{DIRECTORIES[0]}",
                                     "/etc/ssl/company/authority.pem", at_once], named)

    def close(self):
        self._made.close()


class Program:
    """One that follows a plan and writes a line for each step."""

    def __init__(self, host, command, plan):
        text = host.root / "run/plan"
        text.write_text("".join(f"{at:.3f}\t{user}\t{password}\n" for at, user, password in plan), encoding="utf-8")
        with open(text, encoding="utf-8") as standard_input:
            self._process = host.start(*command, stdin=standard_input, stdout=subprocess.PIPE, text=True)

    def lines(self):
        """Each line's fields, as they come."""
        for line in self._process.stdout:
            yield line.rstrip("\n").split("\t")
        self._process.stdout.close()
        status = self._process.wait()
        if status != 0:
            raise RuntimeError(f"{self._process.args} ended with {status}")
