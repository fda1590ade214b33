"""What the machines of a fleet saw, held against what the account servers counted and logged."""

import collections
import dataclasses
import re

import fleet

FIELD = re.compile(r'(\w+)=("(?:[^"\\]|\\.)*"|\S+)')
WRONG_PASSWORD = "1"
UNAVAILABLE = "4"


@dataclasses.dataclass
class Try:
    """One sign-in as a machine saw it."""
    user: str
    number: int
    at: float
    took: float
    outcome: str  # "completed", or the account error
    mail: str
    alias: str
    text: str

    @staticmethod
    def of(fields):
        user, number, at, took, *rest = fields
        return Try(user, int(number), float(at), float(took), *rest)


def plan(users, seconds, wrong_every=10):
    """Machines that sign in one after another, as (lines of the plan, users who give a wrong password).

    users: their numbers. seconds: from the first to the last. Every so many gives a wrong password.
    """
    lines, wrong = [], set()
    for place, number in enumerate(users):
        name = fleet.user_name(number)
        password = fleet.password_of(name)
        if place % wrong_every == wrong_every - 1:
            wrong.add(name)
            password = f"not {password}"
        lines.append((seconds * place / len(users), name, password))
    return lines, wrong


def wrong_answers(lines, wrong, tries):
    """One text for each machine that was told something wrong in the end, or was told nothing."""
    last = {each.user: each for each in tries}
    for _, user, _ in lines:
        answer = last.get(user)
        if answer is None:
            yield f"{user} has no answer"
        elif user in wrong and answer.outcome != WRONG_PASSWORD:
            yield f"{user} has a wrong password and was told {answer}"
        elif user not in wrong and (answer.outcome, answer.mail, answer.alias) != ("completed", *[fleet.mail_of(user)] * 2):
            yield f"{user} was told {answer}"
    for each in tries:
        if each.outcome not in ("completed", WRONG_PASSWORD, UNAVAILABLE):
            yield f"{each.user} was told {each}"
        if each.outcome == UNAVAILABLE and not each.text:
            yield f"{each.user} was not told what is wrong: {each}"


# What may come of any request where processors are scarce, and is no sign of anything that was lost.
BUSY = ("HTTP status 504", "has not answered within", "does not answer", "has too much to do")


def losses(tries):
    """The failures that have another reason than a want of time."""
    return {text: count for text, count in failures(tries).items() if not any(busy in text for busy in BUSY)}


def failures(tries):
    """How many tries ended with each of the texts that people are shown."""
    return collections.Counter(each.text for each in tries if each.outcome == UNAVAILABLE)


def requests(lines):
    """The requests to sign in that a server has logged, each as a dictionary."""
    for line in lines:
        if ": authenticate " in line:
            yield {name: value.strip('"') for name, value in FIELD.findall(line)}


def sign_ins(lines):
    """The IDs of the requests that were answered with success, with their users."""
    return {each["request"]: each["user"] for each in requests(lines) if each["status"] == "200"}


def wrong_counts(servers, tries, given_up):
    """One text for each sign-in that was counted more than once, or not at all, and each figure that is not what was logged.

    given_up: how many requests the front has waited for too long, and sent to another server.
    """
    counted = collections.defaultdict(set)  # the IDs of each user's
    places = collections.defaultdict(list)  # where each ID was logged
    for server in servers:
        runs = server.log()
        for number, (how, lines) in enumerate(runs):
            for request, user in sign_ins(lines).items():
                counted[user].add(request)
                places[request].append((f"{server.host.name}, run {number}", how))
        # What a server has counted ends with it: only the figures of the one that runs are there.
        if runs[-1][0] is None:
            figure, logged = server.figures()["sign_ins_total"], len(sign_ins(runs[-1][1]))
            if figure != logged:
                yield f"{server.host.name} counted {figure:g} sign-ins and logged {logged}"
    # A server that is killed may have counted what it could not answer: the front asks another one then.
    doubled = {request: where for request, where in places.items() if sum(how != "killed" for _, how in where) > 1}
    if len(doubled) > given_up:
        yield f"counted twice, where the front gave up {given_up} requests: {doubled}"
    succeeded = collections.Counter(each.user for each in tries if each.outcome == "completed")
    lost = collections.Counter(each.user for each in tries if each.outcome == UNAVAILABLE)
    for user in succeeded.keys() | counted.keys():
        # An answer that did not arrive was counted all the same, and its machine said that it failed.
        if not succeeded[user] <= len(counted[user]) <= succeeded[user] + lost[user]:
            yield (f"{user} signed in {succeeded[user]} times and failed {lost[user]} times, "
                   f"and was counted {len(counted[user])} times")
