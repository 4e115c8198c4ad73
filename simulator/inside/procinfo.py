"""What the kernel knows about a process of the handset."""

import os


def _read(path: str) -> str:
    with open(path, encoding="utf-8", errors="replace") as stream:
        return stream.read()


def _status(pid: int) -> dict[str, str]:
    pairs = (line.partition(":") for line in _read(f"/proc/{pid}/status").splitlines())
    return {key: value.strip() for key, _, value in pairs}


def _links(directory: str) -> dict[str, str]:
    found = {}
    for name in os.listdir(directory):
        try:
            found[name] = os.readlink(f"{directory}/{name}")
        except OSError:
            continue
    return found


def _children(pid: int) -> list[int]:
    return [int(child) for task in os.listdir(f"/proc/{pid}/task")
            for child in _read(f"/proc/{pid}/task/{task}/children").split()]


def describe(pid: int) -> dict[str, object]:
    """Threads, descriptors, children and memory of the process PID."""
    status = _status(pid)
    threads = {}
    for task in os.listdir(f"/proc/{pid}/task"):
        stat = _read(f"/proc/{pid}/task/{task}/stat").rpartition(")")
        call = _read(f"/proc/{pid}/task/{task}/wchan")
        threads[task] = {"name": stat[0].partition("(")[2], "state": stat[2].split()[0],
                         "waits_in": call}
    return {
        "pid": pid,
        "command": _read(f"/proc/{pid}/cmdline").rstrip("\0").split("\0"),
        "state": status["State"],
        "threads": threads,
        "descriptors": _links(f"/proc/{pid}/fd"),
        "children": _children(pid),
        "resident_kib": int(status.get("VmRSS", "0 kB").split()[0]),
        "policy": os.sched_getscheduler(pid),
    }


def processes() -> dict[str, list[str]]:
    """Every process of the handset with its command line."""
    found = {}
    for name in os.listdir("/proc"):
        if name.isdigit():
            try:
                found[name] = _read(f"/proc/{name}/cmdline").rstrip("\0").split("\0")
            except OSError:
                continue
    return found
