"""Commands of the documents that a test cannot type as they stand, each with the reason."""

from __future__ import annotations

from dataclasses import dataclass


@dataclass(frozen=True)
class Row:
    """Why it is not typed, what is typed ``instead``, and with which statuses that may end.

    Without ``instead``, the words of this project's own programs are read as the programs do.
    """

    why: str
    instead: str = ""
    statuses: tuple[int, ...] = (0,)


_LONG = Row("takes minutes, or builds")
_ENDLESS = Row("goes on until somebody ends it")
_ROOT = Row("needs root, and changes the machine")
_NO_USB = "there is no handset on USB"
_OTHERS = Row("is another program's business")
_NO_SERVER = Row("there is no server of that name")
_YOURS = Row("is about the reader's own files")
_BUNDLE = Row("is for a bundle that a build has made; the tests of the packages type it")
_FINDINGS = (0, 3, 8)

UNTYPED: dict[str, Row] = {
    "./dev demo": _LONG,
    "./dev test": _LONG,
    "./dev test unit station": _LONG,
    "./dev test system --repeat 20 --beside 5": _LONG,
    "./dev test --coverage": _LONG,
    "./dev coverage": _LONG,
    "./dev coverage daemon": _LONG,
    "./dev coverage pc": _LONG,
    "./dev mutate": _LONG,
    "./dev mutate 300 --seed 7": _LONG,
    "./dev mutate --of pc 100": _LONG,
    "./dev mutate --only 'amt/amt-packet.cpp:2874:comparison'": _LONG,
    "./dev build": _LONG,
    "./dev torture": _LONG,
    "./dev torture --seed 7 --minutes 10": _LONG,
    "./dev torture --all": _LONG,
    "./dev torture app-items start-": _LONG,
    "./dev torture 'app-items:fflush@initTestFile/g_handle_context#1=half'": _LONG,
    "./dev torture --build asan ...": _LONG,
    "./dev stateful": _LONG,
    "./dev stateful 500 --seed 7 --build tsan": _LONG,
    "./dev stateful --replay build/stateful/seed-7-short.steps": _LONG,
    "./dev fuzz": _LONG,
    "./dev fuzz 600 --target packet --target hub": _LONG,
    "./dev fuzz --nightly 2 -j 2 --grow": _LONG,
    "./dev fuzz --nightly 2 --grow": _LONG,
    "./dev fuzz --executions 1000000000 --target envelope -j 1": _LONG,
    "./dev bench": _LONG,
    "./dev bench --runs 20 --only round-trip": _LONG,
    "./dev bench --all-cores": _LONG,
    "./dev build android": _LONG,
    "./dev build && ./dev test unit station": _LONG,
    "./dev cross": _LONG,
    "./dev cross dialogues": _LONG,
    "./dev package bundle --build android": _LONG,
    "tar -x --numeric-owner -f vx-kel-amt-1.1-handset-arm.tar.gz --strip-components=2 -C IMAGE "
    "vx-kel-amt-1.1-handset-arm/root": _BUNDLE,
    r"sed -n '/^#/!s/^[^ ]* [^ ]* \([^ ]*\) \//\1 /p' MANIFEST | (cd IMAGE && sha256sum -c)":
        _BUNDLE,
    "./dev lint --since HEAD": _LONG,
    "ctest --test-dir build/release --output-on-failure -R at_exchange": Row(
        "needs a build of the unit tests"),
    "python3 -m pytest tests/system/test_version.py -k unknown_module --handset-build=release "
    "-n 4": Row(
        "takes a while", "cd PROJECT && python3 -m pytest tests/system/test_version.py "
        "-k unknown_module --handset-build=release -n 0 --collect-only -q -p no:cacheprovider"),
    "./dev handset up": _ENDLESS,
    "./dev handset up &": _ENDLESS,
    "./dev handset run --n 3 -- pytest": Row("would run these very tests"),
    "./dev handset log -f": _ENDLESS,
    "./dev station -p PORT uptime": _YOURS,
    "python3 -m pytest tests/system/test_uptime.py tests/system/test_startup.py "
    "--handset-build=release": _YOURS,
    "python3 -m amt_station.protocol_doc > docs/protocol.md": Row(
        "writes into the tree", "python3 -m amt_station.protocol_doc > protocol.md"),
    "python3 -m amt_station.handset_source": Row(
        "writes into the tree; a test of the station holds that it would change nothing"),
    "g++ -shared -fPIC -I platform/include -o libldt.so my-ldt.cpp": _YOURS,
    "./dev handset up --file /system/lib/libldt.so=libldt.so": _ENDLESS,
    "amt-station doctor": Row("what is found depends on the PC", "amt-station doctor", _FINDINGS),
    "amt-station -p /dev/ttyACM0 doctor": Row(
        "what is found depends on the PC", "amt-station -p /dev/ttyACM0 doctor", (0, 8)),
    "amt-station doctor --udev-rule | sudo tee /etc/udev/rules.d/70-amt-station.rules": Row(
        "needs root", "amt-station doctor --udev-rule | tee 70-amt-station.rules"),
    "sudo udevadm control --reload": _ROOT,
    "sudo udevadm trigger --subsystem-match=tty": _ROOT,
    "amt-station wait --for 60": Row(_NO_USB, "amt-station -p PORT wait --for 60"),
    "amt-station --app vibrator on": Row(
        "the handset at hand serves the PC line", "amt-station -p APP --app vibrator on"),
    "amt-station line end-of-line.toml --slot A=/dev/ttyACM0 --slot B=/dev/ttyACM1": _ENDLESS,
    "amt-station line end-of-line.toml --slot A=/dev/ttyUSB0 --slot B=/dev/ttyUSB1 --http 8080":
        _ENDLESS,
    "amt-station line PLAN --slot ... --store URL": _ENDLESS,
    "amt-station serve --http 8080": _ENDLESS,
    "amt-station serve --store postgresql+psycopg2://line@factory/line --http 10.0.0.7:8080":
        _ENDLESS,
    "amt-station stats --store postgresql+psycopg2://line@factory/line --json": _NO_SERVER,
    "amt-station store sync --records ~/.local/state/amt-station/records": _NO_SERVER,
    "sudo -u postgres createuser --pwprompt amt": _ROOT,
    "sudo -u postgres createdb --owner amt --encoding UTF8 line": _ROOT,
    "rsync -a ~/.local/state/amt-station/records/ backup:records/": _OTHERS,
    'sqlite3 ~/.local/state/amt-station/line.sqlite ".backup /backup/line.sqlite"': _OTHERS,
}

# What is set apart in a document and is not typed, by its first word.
NO_COMMANDS: dict[str, tuple[str, ...]] = {
    "README.md": ("0.7",),
    "amt_simulator/README.md": ("def",),
    "docs/line.md": ("[[step]]", "store:"),
    "docs/station.md": ("import", "with"),
}
