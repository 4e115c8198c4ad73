"""``amt-station run``: carry out a plan with one handset."""

from __future__ import annotations

import os
import sys
from dataclasses import dataclass
from pathlib import Path
from typing import Any, Mapping, Sequence

import click

from amt_line.cli import places
from amt_line.cli.outputs import Outputs
from amt_line.cli.signals import ending_in_order
from amt_line.cli.store_option import STORE_OPTION
from amt_line.plan.filled import check_with_inputs
from amt_line.plan.inputs import known_values, row_of
from amt_line.plan.model import Kind, Plan
from amt_line.plan.reader import load_plan
from amt_line.plan.references import Scalar
from amt_line.run.operator import GivenAnswers, Nobody, Operator, Question, is_answer
from amt_line.run.record import Record, Where
from amt_line.run.record_file import Keeper, NoRecord, RecordFile, file_name
from amt_line.run.runner import Runner, Setting
from amt_line.store import Delivery, checked_url
from amt_line.view.lines import LineView
from amt_line.view.prompt import Terminal, there_is_a_terminal
from amt_station import __version__
from amt_station.cli import console
from amt_station.cli.options import Settings, common_options
from amt_station.errors import StationError, UsageProblem
from amt_station.text import printable

_FILE = click.Path(path_type=Path, dir_okay=False)


@dataclass(frozen=True)
class _Wishes:
    """What was said on the command line."""

    said: Mapping[str, str]
    inputs: Path | None
    dut: str | None
    answers: Mapping[str, str]
    records: Path | None
    store: str
    station: str | None
    operator: str | None


@click.command()
@click.argument("plan", type=click.Path(path_type=Path))
@click.option("--set", "said", multiple=True, metavar="NAME=VALUE", help="Value of an input")
@click.option("--inputs", type=_FILE, metavar="FILE.csv",
              help="Values of the inputs: a column each, a row a handset (column dut); see --dut")
@click.option("--dut", metavar="ID", help="The handset: its row in --inputs, and its name where "
              "the plan names none")
@click.option("--answer", "answers", multiple=True, metavar="STEP=ANSWER",
              help="Answer to an operator step: yes, no, or the text to enter")
@click.option("--records", type=click.Path(path_type=Path, file_okay=False), metavar="DIR",
              help="Where the record goes (default: below the XDG state directory)")
@click.option("--no-records", is_flag=True, help="Keep no record, on the disk or in the store")
@STORE_OPTION
@click.option("--junit", type=_FILE, metavar="FILE", help="Write a JUnit report too")
@click.option("--csv", type=_FILE, metavar="FILE", help="Write the values as CSV too")
@click.option("--html", type=_FILE, metavar="FILE", help="Write an HTML report too")
@click.option("--station", metavar="NAME", help="Name of this station (default: the machine's)")
@click.option("--operator", metavar="NAME", help="Who is in charge (default: who is logged in)")
@common_options
@click.pass_context
def run(context: click.Context, plan: Path, said: Sequence[str], inputs: Path | None,
        dut: str | None, answers: Sequence[str], records: Path | None, no_records: bool,
        store_url: str | None, junit: Path | None, csv: Path | None, html: Path | None,
        station: str | None, operator: str | None) -> None:
    """Carry out a test plan with the handset at the port, and keep a record of the run.

    The plan is read and checked whole before anything is sent (`amt-station check` does only
    that). Ctrl-C or SIGTERM ends the step at hand and carries out what is always to be done; a
    second one leaves at once. The exit status is that of the verdict: 0 PASS, 1 FAIL, that of
    the first error, 130 or 143 when it was ended.
    """
    if records is not None and no_records:
        raise UsageProblem("--records and --no-records contradict each other")
    if store_url is not None and no_records:
        raise UsageProblem("--store and --no-records contradict each other")
    settings: Settings = context.ensure_object(Settings)
    directory = None if no_records else records or places.records_directory()
    wishes = _Wishes(_pairs(said, "--set"), inputs, dut, _pairs(answers, "--answer"), directory,
                     "" if no_records else checked_url(store_url), station, operator)
    read = load_plan(plan, settings.chosen_channel)
    _check_wishes(read, settings, wishes)
    outputs = Outputs({"junit": junit, "csv": csv, "html": html},
                      read=[plan] if inputs is None else [plan, inputs])
    try:
        context.exit(_run(settings, read, wishes, outputs))
    finally:
        outputs.close()


def _pairs(texts: Sequence[str], option: str) -> dict[str, str]:
    pairs: dict[str, str] = {}
    for text in texts:
        name, equals, value = text.partition("=")
        if not equals or not name:
            raise UsageProblem(f"{option} {printable(text)!r}: a name, '=' and a value are needed")
        if name in pairs:
            raise UsageProblem(f"{option}: {printable(name)!r} is given twice")
        pairs[name] = value
    return pairs


def _check_wishes(plan: Plan, settings: Settings, wishes: _Wishes) -> None:
    if settings.line is not None and settings.line != plan.channel.value:
        raise UsageProblem(f"the plan is for the {plan.channel.value} channel, "
                           f"--{settings.line} contradicts it")
    if wishes.inputs is not None and wishes.dut is None:
        raise UsageProblem("--inputs needs --dut, which names the row")
    _check_answers(plan, wishes.answers)


def answers_of(plan: Plan, texts: Sequence[str]) -> dict[str, str]:
    """The answers of ``--answer STEP=ANSWER``; ``UsageProblem`` for one that answers nothing."""
    answers = _pairs(texts, "--answer")
    _check_answers(plan, answers)
    return answers


def _check_answers(plan: Plan, answers: Mapping[str, str]) -> None:
    asked = {step.name: step for step in plan.every_step if step.kind in (Kind.ASK, Kind.ENTER)}
    for name, answer in answers.items():
        step = asked.get(name)
        if step is None:
            raise UsageProblem(f"--answer: the plan has no operator step {printable(name)!r}")
        if not is_answer(Question(name, step.subject, step.kind is Kind.ASK), answer):
            wanted = "yes or no" if step.kind is Kind.ASK else "a text that can be shown"
            raise UsageProblem(f"--answer {printable(name)}: {wanted} is needed")


def _values(plan: Plan, wishes: _Wishes, terminal: Terminal | None) -> dict[str, Scalar]:
    row = row_of(wishes.inputs, wishes.dut or "") if wishes.inputs is not None else {}
    values = known_values(plan.inputs, wishes.said, row)
    missing = [item for item in plan.inputs if item.name not in values]
    if not missing:
        return values
    if terminal is None:
        names = ", ".join(item.name for item in missing)
        raise UsageProblem(f"no value for {names}: give --set or --inputs; there is no terminal "
                           "to ask at")
    return {**values, **terminal.ask_inputs(missing)}


def _run(settings: Settings, plan: Plan, wishes: _Wishes, outputs: Outputs) -> int:
    url = settings.chosen_port
    # A trace is of the plan's channel, whatever the environment says.
    settings.line = plan.channel.value
    terminal = Terminal() if there_is_a_terminal() else None
    values = _values(plan, wishes, terminal)
    dut = check_with_inputs(plan, values) or wishes.dut or ""
    files: list[RecordFile] = []
    deliveries: list[Delivery] = []

    def keep(record: Record) -> Keeper:
        if wishes.records is None:
            return NoRecord()
        name = file_name(dut, record.head["began"], record.run)
        files.append(RecordFile(wishes.records, name, record.text()))
        deliveries.append(Delivery(wishes.store, wishes.records))
        return files[0]

    view = _view(settings)
    others: Operator = terminal or Nobody()
    where = Where(wishes.station or places.station_name(),
                  wishes.operator or places.operator_name(), url, __version__)
    runner = Runner(plan, values, dut, Setting(
        settings.open_port, where, settings.chosen_timeout,
        GivenAnswers(wishes.answers, others), [view], keep))
    try:
        with ending_in_order(runner.abort):
            document = runner.run()
    finally:
        view.close()
        for file in files:
            file.close()
    status = _finish(settings, runner, document, files, outputs)
    _deliver(files, deliveries)
    if runner.defect is not None:
        raise runner.defect
    return status


def _deliver(files: Sequence[RecordFile], deliveries: Sequence[Delivery]) -> None:
    """Whatever becomes of it, the verdict and the exit status stay."""
    for file, delivery in zip(files, deliveries):
        delivery.recorded(file.path)
        try:
            delivery.close()
        except KeyboardInterrupt:
            pass  # nobody has to wait for it
        for line in delivery.lines():
            console.talk(line)


def _view(settings: Settings) -> Any:
    stream = sys.stderr if settings.json else sys.stdout
    if not stream.isatty() or os.environ.get("TERM") == "dumb":
        return LineView(stream)
    from amt_line.view.terminal import TerminalView

    return TerminalView(stream)


def _finish(settings: Settings, runner: Runner, document: Mapping[str, Any],
            files: Sequence[RecordFile], outputs: Outputs) -> int:
    status = runner.exit_status
    if runner.record_problem is not None:
        # Rather here than nowhere, and before standard output: that may go to the same full disk.
        print(runner.record.text(), end="", file=sys.stderr, flush=True)
        console.complain(printable(str(runner.record_problem)))
    elif files:
        console.talk(f"record: {printable(str(files[0].path))}")
    if settings.json:
        console.data_json(document)
    try:
        outputs.write([document])
    except StationError as error:
        console.complain(printable(str(error)))
        status = status or error.exit_status
    if runner.view_failure is not None and not isinstance(runner.view_failure, BrokenPipeError):
        console.complain(f"the view of the run failed: {runner.view_failure!r}")
    return status
