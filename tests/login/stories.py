"""What happens from the setup to the end of the second login, on machines that are booted for it."""

import concurrent.futures
import configparser
import json
import os
import plistlib
import signal
import time
from pathlib import Path

import booted_machine as booted

TOOL = "/usr/bin/welcomer"
LABEL = "com.corvid.welcomer.nimbussetup.user"
UNIT = f"welcomer-agent-{LABEL}.service"
PASSWORD, KEYRING_PASSWORD = "correct horse", "battery staple"
SERVICE = "com.corvid.nimbus.service."
ONLINE_ACCOUNTS = "org.gnome.OnlineAccounts"
PRE_LOGIN = {"photo-stream", "account-sync", "locator", "documents"}
POST_LOGIN = {"contacts", "calendars", "bookmarks", "reminders", "mail", "notes"}
# How long the plug-ins take, where nothing else is to happen meanwhile.
AT_ONCE = {"com.corvid.chatter": 0, "com.corvid.deskmate": 0}
# The examples become plug-ins of the machine as an administrator would have it.
ENABLE_PLUGINS = """
    cd /usr/lib/*/welcomer/plugins
    ln -s ../examples/plugins/Vidlink.ncdplugin ../examples/plugins/Chatter.ncdplugin .
    ln -s ../examples/desktop-plugins/Deskmate.ncdplugin .
"""
# The setup of an account.
SET_UP = """
    account=$1 delays=$2 password=$3
    shift 3
    answers=$(mktemp)
    printf '{ Account = "%s"; }' "$account" > "$answers"
    echo "$password" | welcomer setup "$@" --answers "$answers" --password-fd 0
"""
# The account on the server that the machine itself stands for, before that, and how long it has the plug-ins take.
ADD = """
    account=$1 delays=$2 password=$3
    echo "$password" | welcomer account add "$account" --mail "$account@nimbus.example" --password-fd 0
    python3 - "$account" "$delays" <<'END'
import json, plistlib, sys
path = "/var/lib/welcomer/nimbus-directory.plist"
with open(path, "rb") as file:
    contents = plistlib.load(file)
delegates = contents["Users"][sys.argv[1]]["Response"]["delegates"]
for identifier, seconds in json.loads(sys.argv[2]).items():
    delegates.setdefault(identifier, {})["delaySeconds"] = seconds
with open(path, "wb") as file:
    plistlib.dump(contents, file)
END
"""
# Who signs in is who has the directory of users: for a user's own setup it lies in a folder that only this setup sees.
AS_OWN_SERVER = ["unshare", "--user", "--map-current-user", "--keep-caps", "--mount", "sh", "-ec",
                 'mount -t tmpfs tmpfs /var/lib && mkdir -m 700 /var/lib/welcomer && exec "$@"', "sh"]


class Newcomer:
    """One user of a machine, from the setup to the end of the second login: what was seen of them."""

    def __init__(self, story, name):
        self.story, self.machine, self.name = story, story.machine, name
        self.machine.add_user(name)
        self.home = self.machine.root / "home" / name
        self.launch_agent = self.home / f"Library/LaunchAgents/{LABEL}.plist"

    def tool(self, session, *arguments):
        return session.run([TOOL, *arguments], check=True).stdout

    def services(self, session):
        listed = json.loads(self.tool(session, "--json", "account", "services", self.name))["services"]
        return {service["service"] for service in listed if service["enabled"]}

    def replay(self, session):
        """The account name of the replay item; none when there is no item that can be read."""
        shown = session.run([TOOL, "--json", "replay", "show"])
        return json.loads(shown.stdout)["account"] if shown.returncode == 0 else None

    def texts(self):
        return [record[2] for record in self.machine.records("wlnimbussetup", self.name)]

    def agent_units(self, session):
        return session.systemctl("list-units", "--all", "--plain", "--no-legend", "welcomer-agent-*").stdout

    def setup_command(self, password, *arguments):
        return ["sh", "-ec", self.story.set_up, "sh", self.name, json.dumps(self.story.delays), password, *arguments]

    def set_up(self):
        """By the administrator: the user is not logged in."""
        set_up = lambda password: self.machine.run(self.setup_command(password, "--user", self.name))
        self.story.before_setup(self, set_up)
        self.set_up_with(set_up)
        self.look_at_setup(booted.Session(self.machine, self.name))

    def set_up_themselves(self):
        """In a session of their own, with the desktop's services there."""
        session = booted.Session(self.machine, self.name)
        self.story.prepare_setup(session)
        set_up = lambda password: session.run([*self.story.own_setup, *self.setup_command(password)])
        self.story.before_setup(self, set_up)
        self.set_up_with(set_up)
        self.look_at_setup(session)

    def set_up_with(self, set_up):
        done = set_up(PASSWORD)
        if done.returncode != 0:
            raise AssertionError(f"the setup failed: {done}")
        self.said = done.stdout

    def look_at_setup(self, session):
        self.installed = self.launch_agent.exists()
        self.replay_after_setup = self.replay(session)
        self.services_after_setup = self.services(session)
        session.end()

    def log_in(self):
        session = booted.Session(self.machine, self.name)
        self.story.prepare_login(session)
        session.start_desktop()
        shown = session.systemctl("show", UNIT, "--property=MainPID,SubState").stdout
        self.seen = dict(line.split("=", 1) for line in shown.splitlines())
        self.story.meanwhile(self, session)
        booted.wait_for(lambda: self.texts()[-1:] == ["exiting"], "the agent's end", seconds=400)
        self.seconds = self.machine.seconds_between_records("wlnimbussetup", self.name)
        booted.wait_for(lambda: "running" not in self.agent_units(session), "the end of the agent's unit")
        self.ended = [session.systemctl("show", UNIT, f"--property={name}", "--value").stdout.strip()
                      for name in ("SubState", "Result", "ExecMainStatus")]
        if self.story.is_offered_again:
            booted.wait_for(self.launch_agent.exists, "the agent's file")
            self.services_after_first = self.services(session)
        session.end()
        self.launch_agent_at_end = self.launch_agent.exists()
        self.records_at_end = self.machine.records("wlnimbussetup", self.name)
        self.texts_at_end = self.texts()

    def log_in_again(self):
        """The second login, with the session's services as they were in the setup."""
        session = booted.Session(self.machine, self.name)
        self.story.prepare_setup(session)
        session.start_desktop()
        self.second_units = self.agent_units(session)
        if self.story.is_offered_again:
            booted.wait_for(lambda: self.texts().count("exiting") == 2, "the agent's second end", seconds=400)
        self.texts_after_second = self.texts()
        self.starter_records = [record[2] for record in self.machine.records("welcomer-launch-agents", self.name)]
        self.services_after_login = self.services(session)
        self.replay_after_login = self.replay(session)
        self.doctor = json.loads(session.run([TOOL, "--json", "doctor"]).stdout)
        self.status = session.run([TOOL, "--json", "status"])
        session.end()
        self.launch_agent_after_second = self.launch_agent.exists()


class Story:
    """One machine, from the installation to the end of the second login. A subclass says what is different."""

    delays = AT_ONCE
    names = ("newcomer",)
    administered = ()  # those of them whom the administrator sets up
    aliases = 0  # that the server offers for each way to be reached
    set_up = ADD + SET_UP
    own_setup = AS_OWN_SERVER  # what a user's own setup runs in
    # Whether the agent cannot ask for its item at the first login, and so runs at the second one.
    is_offered_again = False

    def __init__(self, base, packages):
        """base: the root folder of a minimal system. packages: what is to be installed on it."""
        self.packages = packages
        self.machine = booted.BootedMachine(base)

    def run(self):
        try:
            self.machine.boot()
            self.install()
            self.newcomers = [Newcomer(self, name) for name in self.names]
            for newcomer in self.newcomers:
                newcomer.set_up() if newcomer.name in self.administered else newcomer.set_up_themselves()
            with concurrent.futures.ThreadPoolExecutor(len(self.newcomers)) as pool:
                list(pool.map(self.live, self.newcomers))
        finally:
            self.machine.shut_down()
        return self

    def live(self, newcomer):
        newcomer.log_in()
        newcomer.log_in_again()
        self.look_afterwards(newcomer)

    def install(self):
        if self.packages:
            self.machine.install(self.packages)
        self.machine.must(["sh", "-ec", ENABLE_PLUGINS])

    # What is different.

    def prepare_setup(self, session):
        """The services of the session in which the setup application runs."""
        session.start_keyring(KEYRING_PASSWORD)
        self.start_online_accounts(session)

    def prepare_login(self, session):
        """The services that the user's desktop has started when it is up."""
        session.start_keyring(KEYRING_PASSWORD)
        self.start_online_accounts(session)
        self.notifications = session.start_script("notifications.py")

    def before_setup(self, newcomer, set_up):
        """set_up: sets the newcomer up with the password that it is called with."""

    def meanwhile(self, newcomer, session):
        """Called when the agent has begun."""

    def look_afterwards(self, newcomer):
        """What else is to be seen, after both logins."""

    def start_online_accounts(self, session):
        session.start("online-accounts", "/usr/libexec/goa-daemon")
        session.wait_for_name(ONLINE_ACCOUNTS)


class Administered(Story):
    """The administrator has set up two users, who log in at the same time."""

    names = administered = ("newcomer", "latecomer")

    def look_afterwards(self, newcomer):
        newcomer.foreign_files = self.machine.must(["find", f"/home/{newcomer.name}", "!", "-user", newcomer.name])


class Whole(Story):
    """Everything is there, and the user's password has opened the keyring."""

    def look_afterwards(self, newcomer):
        self.greetings = self.notifications.read_text().splitlines()[1:]
        accounts = configparser.ConfigParser()
        accounts.optionxform = str
        accounts.read(newcomer.home / ".config/goa-1.0/accounts.conf")
        self.online_accounts = [dict(accounts[name]) for name in accounts.sections()]


class Locked(Story):
    """The keyring is locked, and the user answers when it asks."""

    def prepare_login(self, session):
        session.start_keyring(KEYRING_PASSWORD, unlocked=False)
        self.prompts = session.start_script("prompter.py", "ok", KEYRING_PASSWORD)
        self.start_online_accounts(session)

    def look_afterwards(self, newcomer):
        self.questions = self.prompts.read_text().splitlines()[1:]


class LockedForGood(Locked):
    """The keyring is locked, and nobody answers; at the second login it is open."""

    is_offered_again = True

    def prepare_login(self, session):
        session.start_keyring(KEYRING_PASSWORD, unlocked=False)
        self.prompts = session.start_script("prompter.py", "silent")


class WithoutKeyring(Story):
    """No Secret Service, no online accounts: a bus, and nobody on it."""

    def install(self):
        self.machine.must(["dpkg", "--purge", "gnome-keyring", "gnome-online-accounts"])
        super().install()

    def prepare_setup(self, session):
        pass

    def prepare_login(self, session):
        pass


class BusDies(Story):
    """The bus, and whoever lives on it, dies while the plug-ins work, before the delayed services are on."""

    delays = {"com.corvid.chatter": 8, "com.corvid.deskmate": 8}

    def prepare_login(self, session):
        super().prepare_login(session)
        # The agent is stopped as soon as it works, so that nothing is a matter of how fast this test is.
        self.stopper = concurrent.futures.ThreadPoolExecutor(1).submit(self._stop_agent_at_work)

    def _stop_agent_at_work(self):
        def works():
            self.agent = self.machine.process_of("wlnimbussetup")
            return self.agent and "/Deskmate.ncdplugin" in Path(f"/proc/{self.agent}/maps").read_text()

        booted.wait_for(works, "an agent that has loaded its plug-ins", 120, between=0.005)
        os.kill(self.agent, signal.SIGSTOP)

    def _has_begun_with_deskmate(self, newcomer):
        if "setting up com.corvid.deskmate" in newcomer.texts():
            return True
        os.kill(self.agent, signal.SIGCONT)
        time.sleep(0.05)
        os.kill(self.agent, signal.SIGSTOP)
        return False

    def meanwhile(self, newcomer, session):
        self.stopper.result()
        booted.wait_for(lambda: self._has_begun_with_deskmate(newcomer), "the plug-ins' start")
        process = session.systemctl("show", "dbus.service", "--property=MainPID", "--value").stdout.strip()
        bus_runs = lambda: self.machine.run(["test", "-e", f"/proc/{process}"]).returncode == 0
        self.bus_ran = bus_runs()
        self.before_the_end = newcomer.texts()
        # With the socket goes the bus; the socket alone would start another one.
        session.systemctl("stop", "dbus.socket")
        booted.wait_for(lambda: not bus_runs(), "the end of the bus")
        os.kill(self.agent, signal.SIGCONT)

    def look_afterwards(self, newcomer):
        accounts = plistlib.loads((newcomer.home / "Library/Accounts/Accounts.plist").read_bytes())["Accounts"]
        self.written_down = accounts[newcomer.name]["Services"]
