"""What the kernel knows about a process of the handset."""

import os


def _read(path: str) -> str:
    with open(path, encoding="utf-8", errors="replace") as stream:
        return stream.read()


def _pairs(path: str) -> dict[str, str]:
    pairs = (line.partition(":") for line in _read(path).splitlines())
    return {key: value.strip() for key, _, value in pairs}


def _memory(pid: int) -> dict[str, int]:
    """What is resident, in KiB, page by page: the sums in `status` are each processor's own, and
    lag behind. Of a process that has ended it is nothing."""
    try:
        pages = _pairs(f"/proc/{pid}/smaps_rollup")
    except ProcessLookupError:
        pages = {}
    return {"resident_kib": int(pages.get("Rss", "0").split()[0]),
            "anonymous_kib": int(pages.get("Anonymous", "0").split()[0])}


def _links(directory: str) -> dict[str, str]:
    found = {}
    for name in os.listdir(directory):
        try:
            found[name] = os.readlink(f"{directory}/{name}")
        except OSError:
            continue
    return found


def _threads(pid: int) -> tuple[dict[str, dict[str, str]], list[int]]:
    """The threads of a process, and the children of all of them."""
    threads = {}
    children = []
    for task in os.listdir(f"/proc/{pid}/task"):
        place = f"/proc/{pid}/task/{task}"
        try:
            stat = _read(f"{place}/stat").rpartition(")")
            call = _read(f"{place}/wchan")
            started = [int(child) for child in _read(f"{place}/children").split()]
        except (FileNotFoundError, ProcessLookupError):
            # A thread that has ended meanwhile; its children are another thread's now.
            continue
        threads[task] = {"name": stat[0].partition("(")[2], "state": stat[2].split()[0],
                         "waits_in": call}
        children += started
    return threads, children


def describe(pid: int) -> dict[str, object]:
    """Threads, descriptors, children and memory of the process PID."""
    threads, children = _threads(pid)
    return {
        "pid": pid,
        "command": _read(f"/proc/{pid}/cmdline").rstrip("\0").split("\0"),
        "state": _pairs(f"/proc/{pid}/status")["State"],
        "threads": threads,
        "descriptors": _links(f"/proc/{pid}/fd"),
        "children": children,
        **_memory(pid),
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
