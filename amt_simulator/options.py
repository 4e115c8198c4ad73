"""What a handset is to be like, and how its directory is furnished for it."""

import json
import shutil
from dataclasses import dataclass, field
from pathlib import Path
from typing import Any, Mapping, Sequence

from amt_simulator import program as programs
from amt_simulator import root
from amt_simulator.android import service_entry
from amt_simulator.errors import HandsetError
from amt_simulator.inside.modem_table import MODES
from amt_simulator.kinds import AUDIO_KEY, KINDS, LINE_KEYS, Kind, config_text, settings
from amt_simulator.tree import Content, place
from amt_simulator.usb import PLUGGED

# The pause that init makes before it starts the daemon again.
RESTART_SECONDS = 0.3
# Where programs lie, in the handset as on the PC.
PC_PROGRAMS = "/usr"
PROGRAM_PATH = "/usr/sbin:/usr/bin:/sbin:/bin"
RECORDS = ("log.txt", "calls.txt", "stdout.txt", "stderr.txt", "init.txt")


@dataclass(frozen=True)
class Options:
    """How a handset is made.

    path          how the daemon is started: "pc", "packet", "simplified", "usb-inserted"
    build         a preset's name or a build directory; None together with `daemon`
    daemon        another program in the daemon's place, for tests of the simulator
    args          further arguments for the daemon
    through       a program of the PC, and its arguments, that runs the daemon: an emulator for a
                  build that this machine cannot run, or a tracer
    config        configuration settings that differ from the usual ones; None takes one out
    files         files to place, path in the handset to content: text, bytes, (content, mode),
                  a Path of the PC to copy, or None for no such file
    properties    system properties; None takes one away
    answers       scripted answers of stand-ins: function to a line or a list of lines
    modem         "table": answers by its table; "slow": the same after two seconds; "refusing":
                  ERROR to everything; "silent": hears, never answers; "held": its ttys
                  wait for the test to speak; "absent": there are no modem ttys
    modem_answers whole command line to the raw answer that replaces the table's
    restart       whether init starts the daemon again when it has ended; None: as its file says
    start         whether init starts the daemon at all; `start()` does it later
    screen        width and height of the framebuffer
    card          size of the memory card in bytes; None: no card
    card_full     whether the card comes up without a free byte
    usb_state     the USB link's state when the handset comes up; None: as the path wants it
    env           further environment of the daemon
    shared        directories of the PC that the handset may write to, by their path inside
    ports         make ports of the PC, for programs: links named after their lines in the
                  handset's directory. `app` is always there, `pc` while the cable is in, `modem`
                  and `mux` with a held modem
    keep          leave the directory in place when the handset is taken down
    """

    path: str = "pc"
    build: str | Path | None = "release"
    daemon: Path | None = None
    args: Sequence[str] = ()
    through: Sequence[str] = ()
    config: Mapping[str, str | None] = field(default_factory=dict)
    files: Mapping[str, Content] = field(default_factory=dict)
    properties: Mapping[str, str | None] = field(default_factory=dict)
    answers: Mapping[str, str | Sequence[str] | None] = field(default_factory=dict)
    modem: str = "table"
    modem_answers: Mapping[str, str] = field(default_factory=dict)
    restart: bool | None = None
    start: bool = True
    screen: tuple[int, int] = (480, 800)
    card: int | None = 64 << 20
    card_full: bool = False
    usb_state: str | None = None
    env: Mapping[str, str] = field(default_factory=dict)
    shared: Mapping[str, Path] = field(default_factory=dict)
    ports: bool = False
    keep: bool = False

    def __post_init__(self) -> None:
        if self.path not in KINDS:
            raise HandsetError(f"no such path: {self.path}; there are {', '.join(KINDS)}")
        if self.modem not in MODES:
            raise HandsetError(f"no such modem mode: {self.modem}; "
                               f"there are {', '.join(MODES)}")

    @property
    def kind(self) -> Kind:
        """The way in which the daemon is started."""
        return KINDS[self.path]

    @property
    def first_usb_state(self) -> str:
        """The USB link's state when the handset comes up."""
        return self.usb_state or self.kind.usb_state

    @property
    def plugged(self) -> bool:
        """Whether the handset comes up with its cable in."""
        return self.first_usb_state in PLUGGED


def environment(options: Options, program: programs.Program) -> dict[str, str]:
    """The environment in which init starts the daemon."""
    env = {"PATH": f"/system/bin:{PROGRAM_PATH}", "HOME": "/", "TZ": "UTC0",
           "LD_LIBRARY_PATH": "/system/lib"}
    for name, file in (("LOG", "log.txt"), ("PROPERTIES", "properties"), ("CALLS", "calls.txt"),
                       ("ANSWERS", "answers"), ("DEVICES", "devices")):
        env[f"VX_HOST_{name}"] = f"/handset/{file}"
    if program.has_preload:
        env["LD_PRELOAD"] = f"/system/lib/{programs.PRELOAD}"
    if program.sanitizer:
        env.update(programs.sanitizer_environment())
    return {**env, **options.env}


def runner(options: Options) -> list[str]:
    """The words before the daemon's own: none, or the program that runs it by its whole path."""
    if not options.through:
        return []
    path = shutil.which(options.through[0], path=PROGRAM_PATH)
    if path is None or not Path(path).resolve().is_relative_to(PC_PROGRAMS):
        raise HandsetError(f"{options.through[0]} cannot run the daemon: there is no such program "
                           f"below {PC_PROGRAMS}, which is all that the handset has of the PC")
    return [path, *options.through[1:]]


def _orders(options: Options, program: programs.Program) -> dict[str, Any]:
    """What init is told."""
    kind = options.kind
    service = service_entry(kind.service)
    configured = settings(options.config)
    words = [*runner(options), kind.program, *service.argv[1:], *options.args]
    return {
        "daemon": {"argv": words, "program": words[0], "env": environment(options, program),
                   "no_randomize": program.no_randomize},
        "start": options.start, "restart_pause": RESTART_SECONDS,
        "restart": not service.oneshot if options.restart is None else options.restart,
        # A service that waits for its trigger gets it from the cable.
        "start_on_plug": service.disabled and options.start,
        "lines": {name: configured.get(key, "") for name, key in LINE_KEYS.items()},
        "modem": options.modem, "modem_answers": dict(options.modem_answers),
        "card": options.card, "card_full": options.card_full, "ports": options.ports,
    }


def furnish(directory: Path, options: Options, program: programs.Program) -> None:
    """Fill a handset's directory with all that it needs to come up."""
    kind = options.kind
    root.build_root(directory)
    root.build_devices(directory, *options.screen)
    programs.install(directory, program)
    place(directory, kind.config, config_text(options.config))
    place(directory, kind.program, ("", 0o755))
    audio = settings(options.config).get(AUDIO_KEY, "")
    if audio.startswith("/system/"):
        place(directory, audio, root.SILENCE)
    place(directory, "/sys/class/android_usb/android0/state",
          options.first_usb_state + "\n")
    for properties in (root.PROPERTIES, kind.properties, options.properties):
        root.write_properties(directory, properties)
    root.write_answers(directory, options.answers)
    for name in RECORDS:
        place(directory, f"/handset/{name}", b"")
    for inside, content in options.files.items():
        place(directory, inside, content)
    place(directory, "/handset/init.json",
          json.dumps(_orders(options, program), indent=1))
