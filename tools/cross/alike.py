"""What two handsets have in common behind the same dialogue: everything, but for this table."""

import difflib
import re
from dataclasses import dataclass, field
from typing import Iterator, Mapping, Sequence

LOG = "the log"
SHOWN_LINES = 20
SHOWN_WIDTH = 160


@dataclass(frozen=True)
class Rule:
    """Something that differs between two runs or two machines; what matches becomes `by`."""

    # An expression for the whole path of the files in which it stands, or LOG.
    where: str
    what: str
    pattern: bytes
    by: bytes
    reason: str


# From there on the daemon's end is a matter of time.
SHUT_DOWN = "signal_treatment()"
# A whole content that cannot be the same.
ALL = rb"(?s).+"

RULES = (
    Rule(LOG, "the time, the process and the thread of a record", rb"", b"",
         "another run; the records of a thread are compared in their order, those of different "
         "threads come as the machine lets them"),
    Rule(LOG, "the date behind \"Build time: \"", rb"(Build time: ).*", rb"\1(date)",
         "each build tells its own"),
    Rule(LOG, "the thread's id in \"thread N will be end\"", rb"(thread )\d+( will be end)",
         rb"\1N\2", "the emulator has a thread of its own, and so its threads have other ids"),
    Rule(LOG, "the process that a pid file names",
         rb"(pid_ptr\[|check_run pid\[|/proc/)\d+(\]|/cmdline\])", rb"\1N\2",
         "processes are numbered together with threads"),
    Rule(LOG, f"what a thread logs behind \"{SHUT_DOWN}\"", rb"", b"",
         "the daemon cuts its shut-down short after 800 ms, which a busy machine may need"),
    Rule(r"/system/(lib|lib64)/.*", "libraries", ALL, b"(library)", "built for one machine"),
    Rule(r"/handset/answers/\.taken/.*", "which script the calls were counted of",
         rb"^\d+ \d+\.\d+ ", b"", "a number and a time of its file: another handset"),
    Rule(r"/handset/init\.json", "what init is told", ALL, b"(orders)",
         "names the program that runs the daemon, and its environment"),
    Rule(r"/handset/init\.txt", "init's record", ALL, b"(record)",
         "times, process ids, and the commands that look into the handset; how often the daemon "
         "was started and how it ended is compared by itself"),
)

# Only one of the two handsets has them: the emulated daemon brings its own zlib, and what it
# starts, which runs by itself, has a library of its own width.
ONLY_EMULATED = ("/system/lib/libz.so.1", "/system/lib64", "/system/lib64/libhandset-devices.so")
# Dialogues that emulation cannot play, each with its reason.
NOT_PLAYED: Mapping[str, str] = {}


@dataclass
class Seen:
    """What has come of a dialogue."""

    # Line and bytes, in the order in which they were heard.
    heard: list[tuple[str, bytes]] = field(default_factory=list)
    # Kind, mode and owner of each path, and what stands in it.
    files: dict[str, tuple[str, bytes]] = field(default_factory=dict)
    # The records of each thread, threads in the order of their first records.
    threads: list[list[str]] = field(default_factory=list)
    # How often the daemon was started, and how it ended each time.
    starts: int = 0
    exits: list[int] = field(default_factory=list)


def normal(path: str, content: bytes, rules: Sequence[Rule] = RULES) -> bytes:
    """The CONTENT of the file PATH, or a text of the LOG, without what has to differ."""
    for rule in rules:
        if rule.pattern and re.fullmatch(rule.where, path):
            content = re.sub(rule.pattern, rule.by, content)
    return content


def normal_text(text: str) -> str:
    """A log text without what has to differ."""
    return normal(LOG, text.encode("utf-8", "surrogateescape")).decode("utf-8", "surrogateescape")


def normal_thread(texts: Sequence[str]) -> list[str]:
    """The records of a thread without what has to differ, up to its shut-down."""
    found = []
    for text in texts:
        found.append(normal_text(text))
        if text.endswith(f": {SHUT_DOWN}"):
            break
    return found


def _short(text: str) -> str:
    return text if len(text) <= SHOWN_WIDTH else f"{text[:SHOWN_WIDTH]}... ({len(text)})"


def _lines(content: bytes) -> list[str]:
    return repr(content)[2:-1].replace("\\n", "\\n\n").splitlines()


def _difference(what: str, one: Sequence[str], other: Sequence[str]) -> Iterator[str]:
    """The lines that differ, behind a line that says where."""
    lines = [line for line in difflib.unified_diff(one, other, lineterm="", n=1)
             if not line.startswith(("---", "+++", "@@"))]
    if lines:
        yield f"{what}:"
        yield from (f"  {_short(line)}" for line in lines[:SHOWN_LINES])
        if len(lines) > SHOWN_LINES:
            yield f"  ({len(lines) - SHOWN_LINES} more lines)"


def _file_differences(one: Mapping[str, tuple[str, bytes]],
                      other: Mapping[str, tuple[str, bytes]]) -> Iterator[str]:
    for path in sorted(set(one) | set(other)):
        if path not in one:
            if path not in ONLY_EMULATED:
                yield f"{path}: only in the second"
        elif path not in other:
            yield f"{path}: only in the first"
        else:
            kinds = one[path][0], other[path][0]
            if kinds[0] != kinds[1]:
                yield f"{path}: {kinds[0]}, and {kinds[1]}"
            first, second = (normal(path, side[path][1]) for side in (one, other))
            if first != second:
                yield from _difference(path, _lines(first), _lines(second))


def differences(one: Seen, other: Seen) -> list[str]:
    """What is not the same, in lines; the first is the native run, the second the emulated one."""
    found = list(_difference("heard", [f"{line}: {data!r}" for line, data in one.heard],
                             [f"{line}: {data!r}" for line, data in other.heard]))
    if (one.starts, one.exits) != (other.starts, other.exits):
        found.append(f"the daemon's starts and ends: {one.starts} {one.exits}, and "
                     f"{other.starts} {other.exits}")
    found += _file_differences(one.files, other.files)
    # A thread is known by what it says: which one spoke first is the machine's.
    sides = [sorted(map(normal_thread, side.threads)) for side in (one, other)]
    if sides[0] != sides[1]:
        flat = [[f"{number}: {text}" for number, thread in enumerate(side) for text in thread]
                for side in sides]
        found += _difference(LOG, *flat)
    return found
