"""``amt-station line``: carry out a plan with many handsets at once."""

from __future__ import annotations

import sys
from contextlib import ExitStack
from dataclasses import dataclass, field
from pathlib import Path
from typing import Any, Mapping, Sequence

import click

from amt_line.cli import places
from amt_line.cli.line_views import Views, Wanted, has_keyboard
from amt_line.cli.run import answers_of
from amt_line.cli.signals import ending_in_order
from amt_line.cli.slots import SlotSpec, check_slots, said_slots, slots_of_file
from amt_line.cli.line_records import LineRecords
from amt_line.plan.model import Plan
from amt_line.plan.reader import load_plan
from amt_line.plan.rows import rows_of_slots
from amt_line.run.desk import Desk
from amt_line.run.events import Stream
from amt_line.run.inputs import Supply
from amt_line.run.line import Line
from amt_line.run.plug import Listing
from amt_line.run.record import Where
from amt_line.run.slot import Shop, Slot
from amt_line.view.board import Board
from amt_station import __version__
from amt_station.cli import console
from amt_station.cli.options import DEFAULT_BAUD, Seconds, Settings, common_options
from amt_station.errors import EXIT_DEFECT, UsageProblem

_FILE = click.Path(path_type=Path, dir_okay=False)


@dataclass(frozen=True)
class Wishes:
    """What was said on the command line, but for the slots."""

    inputs: Path | None = None
    answers: Mapping[str, str] = field(default_factory=dict)
    once: bool = False
    events: str = ""
    http: str = ""
    records: Path | None = None
    store: str | None = None
    station: str = ""
    operator: str = ""
    replug: float | None = None


@click.command()
@click.argument("plan", type=click.Path(path_type=Path))
@click.option("--slot", "said", multiple=True, metavar="NAME=PORT",
              help="A slot: a device, usb:PATH for a socket of the USB tree, or a pySerial URL")
@click.option("--slots", "file", type=_FILE, metavar="FILE.toml", help="The slots from a file")
@click.option("--simulate", type=click.IntRange(1, 64), metavar="N",
              help="N simulated handsets as slots 1 to N")
@click.option("--replug", type=Seconds(), metavar="SECONDS",
              help="Change simulated handsets so long after each verdict")
@click.option("--inputs", type=_FILE, metavar="FILE.csv",
              help="Values of the inputs: a column each, a row a run of its slot (column slot)")
@click.option("--answer", "answers", multiple=True, metavar="STEP=ANSWER",
              help="Answer to an operator step in every run: yes, no, or the text to enter")
@click.option("--once", is_flag=True, help="Test one handset a slot, and end")
@click.option("--events", metavar="FILE", help="Write all events as JSON lines; - is standard "
              "output")
@click.option("--http", metavar="[HOST:]PORT", help="Serve the page of the line there")
@click.option("--records", type=click.Path(path_type=Path, file_okay=False), metavar="DIR",
              help="Where records go (default: below the XDG state directory)")
@click.option("--no-records", is_flag=True, help="Keep no records, also not in the store")
@click.option("--store", metavar="URL", help="Database for the records (default: a file below "
              "the XDG state directory)")
@click.option("--station", metavar="NAME", help="Name of this station (default: the machine's)")
@click.option("--operator", metavar="NAME", help="Who is in charge (default: who is logged in)")
@common_options
@click.pass_context
def line(context: click.Context, plan: Path, said: Sequence[str], file: Path | None,
         simulate: int | None, answers: Sequence[str], no_records: bool, **others: Any) -> None:
    """Carry out a test plan with handset after handset, in many slots at once.

    Each slot waits for a handset, asks for its inputs, runs the plan, shows the verdict until the
    next handset, and waits again. Ctrl-C or SIGTERM ends all runs in order, a second one at once.
    The exit status with --once is 0 when every slot's run has passed, else that of the first run
    that was no pass; otherwise how the line was ended.
    """
    settings: Settings = context.ensure_object(Settings)
    _check_options(settings, said, file, simulate, no_records, others)
    read = load_plan(plan, settings.chosen_channel)
    if settings.line is not None and settings.line != read.channel.value:
        raise UsageProblem(f"the plan is for the {read.channel.value} channel, --{settings.line} "
                           "contradicts it")
    directory = None if no_records else others.pop("records") or places.records_directory()
    wishes = Wishes(answers=answers_of(read, answers), **{
        name: value for name, value in others.items() if value is not None and name != "records"},
        records=directory)
    with ExitStack() as stack:
        if simulate is None:
            baud = settings.baud or DEFAULT_BAUD
            slots = slots_of_file(file, baud) if file is not None else said_slots(said, baud)
            context.exit(carry_out(settings, read, slots, wishes))
        context.exit(_simulated(settings, read, simulate, wishes, stack))


def _check_options(settings: Settings, said: Sequence[str], file: Path | None,
                   simulate: int | None, no_records: bool, others: Mapping[str, Any]) -> None:
    given = [name for name, value in (("--slot", said), ("--slots", file),
                                      ("--simulate", simulate)) if value]
    if len(given) > 1:
        raise UsageProblem(f"{' and '.join(given)} contradict each other")
    if not given:
        raise UsageProblem("no slots: give --slot NAME=PORT, --slots FILE or --simulate N")
    if settings.port is not None or settings.usb_serial or settings.vid_pid:
        raise UsageProblem("a line has its ports by --slot or --slots")
    if settings.trace is not None:
        raise UsageProblem("--trace is for one port; the records of a line hold every exchange")
    if no_records and (others["records"] is not None or others["store"] is not None):
        raise UsageProblem("--no-records and --records or --store contradict each other")
    if others["replug"] is not None and simulate is None:
        raise UsageProblem("--replug is for the handsets of --simulate")
    if settings.json and others["events"] == "-":
        raise UsageProblem("--json and --events - would both go to standard output")


def _simulated(settings: Settings, plan: Plan, count: int, wishes: Wishes,
               stack: ExitStack) -> int:
    from amt_line.cli.simulated import Hand, simulated_handsets, slots_of

    names = [SlotSpec(str(number), f"simulated:{number}") for number in range(1, count + 1)]
    # Before handsets come up for nothing.
    _supplies(plan, names, wishes, Desk(), bool(wishes.http) or has_keyboard())
    console.talk(f"bringing up {count} simulated handsets ...")
    handsets = stack.enter_context(simulated_handsets(count, plan.channel))
    hand = None
    if wishes.replug is not None and not wishes.once:
        hand = Hand(handsets, wishes.replug)
        stack.callback(hand.close)
    return carry_out(settings, plan, slots_of(handsets, plan.channel), wishes, hand)


def _supplies(plan: Plan, slots: Sequence[SlotSpec], wishes: Wishes, desk: Desk,
              attended: bool) -> dict[str, Supply]:
    """The inputs of every slot, checked."""
    names = [slot.name for slot in slots]
    rows = rows_of_slots(wishes.inputs, names) if wishes.inputs is not None else {}
    return {slot.name: Supply(slot.name, plan, slot.inputs, rows.get(slot.name, ()),
                              desk if attended else None) for slot in slots}


def carry_out(settings: Settings, plan: Plan, specs: Sequence[SlotSpec], wishes: Wishes,
              listener: Any = None) -> int:
    """Serve the slots until the line ends; the exit status."""
    check_slots(specs)
    stream, desk, board = Stream(), Desk(), Board()
    records = LineRecords(wishes.records, wishes.store)
    wanted = Wanted(plan.title, wishes.events, wishes.http, settings.json, records.store_url,
                    records.state)
    views = Views(wanted, stream, desk)
    supplies = _supplies(plan, specs, wishes, desk, views.attended)
    station = wishes.station or places.station_name()
    operator = wishes.operator or places.operator_name()
    shop = Shop(plan, stream, desk,
                lambda slot, url: Where(station, operator, url, __version__, slot), records.keep,
                views.attended, settings.chosen_timeout, wishes.answers, wishes.once,
                lost_record=records.lost)
    listing = Listing()
    whole = Line([Slot(spec.name, spec.plug(listing), supplies[spec.name], shop)
                  for spec in specs], shop.ends, wishes.once)
    stream.listen(board.take)
    if listener is not None:
        stream.listen(listener)
    with records.open(), views.open(), ending_in_order(whole.end):
        status = whole.run()
    return _finish(settings, status, board, views, records, stream)


def _finish(settings: Settings, status: int, board: Board, views: Views, records: LineRecords,
            stream: Stream) -> int:
    if settings.json:
        console.data_json({"ok": status == 0, "exit_status": status, **board.snapshot()})
    for problem in filter(None, (views.lost_events, *records.problems)):
        console.complain(problem)
        status = status or EXIT_DEFECT
    for remark in records.remarks:
        console.talk(remark)
    if stream.failure is not None and not isinstance(stream.failure, BrokenPipeError):
        console.complain(f"a view of the line failed: {stream.failure!r}")
    sys.stdout.flush()
    return status
