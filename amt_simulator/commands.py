"""What can be done with a handset that is up: the commands of the `amt-handset` tool but `up`."""

import json
import sys
import time
from pathlib import Path
from typing import Callable

import click

from amt_simulator import tree
from amt_simulator.control import HandsetControl
from amt_simulator.errors import HandsetError
from amt_simulator.inside.modem_table import MODES
from amt_simulator.parse import CardSize, Escaped
from amt_simulator.running import Announcement

SHOWN = ("/amt", "/data", "/sys", "/tmp", "/system/etc", "/proc/driver", "/handset/properties")
# Names for files that a person asks for often.
SHORT_NAMES = {
    "vibrator": "/sys/class/timed_output/vibrator/enable",
    "lcd": "/sys/class/leds/lcd-backlight/brightness",
    "buttons": "/sys/class/leds/button-backlight/brightness",
    "voltage": "/sys/class/power_supply/battery/voltage_now",
    "temperature": "/sys/class/power_supply/battery/temp",
    "ac": "/sys/class/power_supply/ac/online",
    "usb": "/sys/class/android_usb/android0/state",
    "battery": "/proc/driver/sarvo_battery",
    "screen": "/handset/devices/framebuffer",
    "camera": "/handset/devices/camera",
    "console": "/handset/devices/console",
    "stdout": "/handset/stdout.txt",
    "stderr": "/handset/stderr.txt",
    "init": "/handset/init.txt",
}
FOLLOW_SECONDS = 0.05

pass_handset = click.make_pass_decorator(HandsetControl)
Command = Callable[..., None]


@click.command("plug")
@pass_handset
def plug(handset: HandsetControl) -> None:
    """Plug the USB cable in (the link is connected)."""
    handset.usb.plug()


@click.command("configure")
@pass_handset
def configure(handset: HandsetControl) -> None:
    """Let the PC configure the USB link."""
    handset.usb.configure()


@click.command("unplug")
@pass_handset
def unplug(handset: HandsetControl) -> None:
    """Pull the USB cable out."""
    handset.usb.unplug()


@click.command("log")
@click.option("-f", "--follow", is_flag=True, help="Go on until Ctrl-C or the handset's end.")
@click.option("-n", "count", type=click.IntRange(min=0), metavar="N",
              help="Begin with the last N lines only.")
@pass_handset
def log(handset: HandsetControl, follow: bool, count: int | None) -> None:
    """Show the log."""
    data = handset.log.content()
    place = len(data)
    if count is not None:
        lines = data.splitlines(keepends=True)
        data = b"".join(lines[max(0, len(lines) - count):])
    click.echo(data.decode("utf-8", "replace"), nl=False)
    while follow:
        sys.stdout.flush()
        time.sleep(FOLLOW_SECONDS)
        is_up = handset.log.path.exists()
        data = handset.log.content(place)
        place += len(data)
        click.echo(data.decode("utf-8", "replace"), nl=False)
        follow = is_up


@click.command("calls")
@pass_handset
def calls(handset: HandsetControl) -> None:
    """Show the recorded calls of the platform stand-ins."""
    for line in handset.calls():
        click.echo(line)


@click.command("files")
@click.argument("directories", nargs=-1)
@pass_handset
def files(handset: HandsetControl, directories: tuple[str, ...]) -> None:
    """List files of the handset with their sizes (by default: those that tests read)."""
    for inside in directories or SHOWN:
        try:
            found = tree.sizes(handset.directory, inside)
        except (FileNotFoundError, NotADirectoryError):
            if directories:
                raise HandsetError(f"{inside} is not there") from None
            continue
        for name, size in sorted(found.items()):
            click.echo(f"{size:8} {name}")


@click.command("show")
@click.argument("name")
@pass_handset
def show(handset: HandsetControl, name: str) -> None:
    """Show a file of the handset: a path, or a short name such as vibrator, lcd, usb, init."""
    if not name.startswith("/") and name not in SHORT_NAMES:
        raise HandsetError(f"no file is called {name}; give a path, or one of: "
                           f"{' '.join(SHORT_NAMES)}")
    inside = SHORT_NAMES.get(name, name)
    try:
        data = handset.read(inside)
    except OSError as error:
        raise HandsetError(f"{inside}: {error.strerror}") from None
    click.echo(data, nl=not data.endswith(b"\n"))


@click.command("screen")
@click.argument("file", type=click.Path(dir_okay=False, path_type=Path))
@pass_handset
def screen(handset: HandsetControl, file: Path) -> None:
    """Save what the screen shows as a picture, such as FILE.png."""
    # The picture library is only loaded by those who want a picture.
    from amt_simulator import screen as pictures
    pictures.save(handset.path(pictures.FRAMEBUFFER), handset.path(pictures.STATE), file)
    click.echo(str(file))


# Answers are often negative numbers, which are no options.
@click.command("answer", context_settings={"ignore_unknown_options": True})
@click.argument("function")
@click.argument("lines", nargs=-1)
@pass_handset
def answer(handset: HandsetControl, function: str, lines: tuple[str, ...]) -> None:
    """Script what a stand-in function answers: a line a call; no lines: as if never scripted."""
    handset.answer(function, *lines)


@click.command("set", context_settings={"ignore_unknown_options": True})
@click.argument("key")
@click.argument("value", required=False)
@pass_handset
def set_property(handset: HandsetControl, key: str, value: str | None) -> None:
    """Set a system property; without a value, take it away."""
    handset.set_property(key, value)


@click.command("get")
@click.argument("key")
@pass_handset
def get_property(handset: HandsetControl, key: str) -> None:
    """Show a system property."""
    value = handset.get_property(key)
    if value is None:
        raise HandsetError(f"the property {key} is not set")
    click.echo(value)


@click.command("card")
@click.argument("size", type=CardSize())
@pass_handset
def card(handset: HandsetControl, size: int) -> None:
    """Put a memory card of SIZE in, or take it out (none)."""
    handset.set_card(size or None)


@click.group("modem")
def modem() -> None:
    """What the modem does: hang up, come back, say something, answer differently."""


@modem.command("hangup")
@pass_handset
def modem_hangup(handset: HandsetControl) -> None:
    """Take both modem ttys away; the daemon gets EIO."""
    handset.modem.hang_up()
    handset.mux.hang_up()


@modem.command("back")
@pass_handset
def modem_back(handset: HandsetControl) -> None:
    """Bring both modem ttys back."""
    handset.modem.come_back()
    handset.mux.come_back()


@modem.command("say")
@click.argument("text", type=Escaped())
@click.option("--line", type=click.Choice(["modem", "mux"]), default="modem", show_default=True)
@pass_handset
def modem_say(handset: HandsetControl, text: str, line: str) -> None:
    r"""Let the modem say TEXT unasked; \r, \n and \xHH are understood."""
    handset.client.ask("say", line=line, text=text)


@modem.command("answer")
@click.argument("command")
@click.argument("text", required=False, type=Escaped())
@pass_handset
def modem_answer(handset: HandsetControl, command: str, text: str | None) -> None:
    r"""Answer the command line COMMAND with TEXT (\r, \n, \xHH); without: as the table says."""
    handset.answer_modem(command, text)


@modem.command("mode")
@click.argument("mode", type=click.Choice(MODES))
@pass_handset
def modem_mode(handset: HandsetControl, mode: str) -> None:
    """Bring the modem into another mode."""
    handset.set_modem(mode)


@click.command("status")
@click.option("--json", "as_json", is_flag=True, help="For programs.")
@pass_handset
def status(handset: HandsetControl, as_json: bool) -> None:
    """Show how the handset and its daemon are."""
    announced = Announcement.read(handset.directory)
    facts: dict[str, object] = {
        "path": announced.path, "build": announced.build, **announced.ports,
        "log": str(handset.log.path), "files": str(handset.directory / tree.ROOT),
        "directory": str(handset.directory), "usb": handset.text(SHORT_NAMES["usb"]).strip(),
        "daemon_pid": handset.pid, "daemon_exits": handset.exits(),
    }
    if as_json:
        click.echo(json.dumps(facts))
        return
    for name, value in facts.items():
        click.echo(f"{name:14} {value}")


@click.command("start")
@pass_handset
def start(handset: HandsetControl) -> None:
    """Start the daemon unless it runs."""
    handset.start()


@click.command("down")
@pass_handset
def down(handset: HandsetControl) -> None:
    """Take the handset down."""
    handset.client.ask("shutdown")


COMMANDS: tuple[click.Command, ...] = (
    plug, configure, unplug, log, calls, files, show, screen, answer, set_property, get_property,
    card, modem, status, start, down,
)
