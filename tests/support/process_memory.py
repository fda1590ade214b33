"""The memory of other processes, while they run and at their very end. Needs root.

`proc` is where the processes of the caller's namespace are seen.
"""

import ctypes
import os
import re
import signal
import time
from pathlib import Path

_PTRACE_CONT, _PTRACE_SEIZE = 7, 0x4206
_TRACE_FORK, _TRACE_EXIT = 0x2, 0x40
_EVENT_FORK, _EVENT_EXIT = 1, 6
_WALL = 0x40000000

_libc = ctypes.CDLL(None, use_errno=True)
_libc.ptrace.argtypes = [ctypes.c_long] * 4


def count(proc, process, text):
    """How often a text stands in what a process can write to."""
    found = 0
    with open(f"{proc}/{process}/maps", encoding="ascii") as maps, open(f"{proc}/{process}/mem", "rb", buffering=0) as memory:
        for line in maps:
            area = re.match(r"([0-9a-f]+)-([0-9a-f]+) rw", line)
            if not area:
                continue
            begin, end = (int(place, 16) for place in area.groups())
            memory.seek(begin)
            try:
                content = memory.read(end - begin)
            except OSError:  # what no page is behind
                continue
            found += content.count(text.encode())
    return found


def descendants(proc, process):
    """A process and its children, and theirs."""
    parents = {}
    for status in Path(proc).glob("[0-9]*/stat"):
        try:
            parents[int(status.parent.name)] = int(status.read_text(encoding="utf-8").rpartition(")")[2].split()[1])
        except FileNotFoundError:  # it has ended meanwhile
            pass
    found = [process]
    for parent in found:
        found += [child for child, own in parents.items() if own == parent]
    return found


def _ptrace(request, process, data):
    if _libc.ptrace(request, process, 0, data) != 0:
        number = ctypes.get_errno()
        raise OSError(number, os.strerror(number))


def watch_ends(proc, process, look, seconds=60):
    """Waits for the end of a child of this thread, and of those that it starts, and calls look(process) when each has run all
    its code and has all its memory yet. The exit status of the first."""
    _ptrace(_PTRACE_SEIZE, process, _TRACE_FORK | _TRACE_EXIT)
    watched, first, status = {process}, process, None
    end = time.monotonic() + seconds
    while watched:
        if time.monotonic() > end:
            raise TimeoutError(f"waited {seconds} seconds for {watched} to end")
        for each in list(watched):
            changed, what = os.waitpid(each, os.WNOHANG | _WALL)
            if not changed:
                continue
            if not os.WIFSTOPPED(what):
                watched.remove(each)
                status = os.waitstatus_to_exitcode(what) if each == first else status
                continue
            event, number = what >> 16, os.WSTOPSIG(what)
            if event == _EVENT_FORK:
                watched.update(int(child) for child in descendants(proc, each))
            if event == _EVENT_EXIT:
                look(each)
            _ptrace(_PTRACE_CONT, each, 0 if event or number == signal.SIGTRAP else number)
        time.sleep(0.002)
    return status
