"""The command that looks for what goes wrong on a station's PC."""

from __future__ import annotations

import sys
from collections import Counter
from pathlib import Path

import click

from amt_station.cli import console
from amt_station.cli.options import AUTO, DEFAULT_BAUD, Settings, common_options
from amt_station.doctor.checks import examine
from amt_station.doctor.examination import Examination
from amt_station.doctor.finding import Finding, Level, exit_status
from amt_station.errors import EXIT_PASS
from amt_station.link import RECOVER_TIMEOUT
from amt_station.udev import rule

_MARK_WIDTH = 13
_NAME_WIDTH = 17


@click.command()
@click.option("--records", type=click.Path(path_type=Path, file_okay=False), metavar="DIR",
              help="The directory of records (default: below the XDG state directory)")
@click.option("--store", metavar="URL", help="The database of the line (default: the "
              "environment's, else a SQLite file below the XDG state directory)")
@click.option("--udev-rule", is_flag=True, help="Print the rule file that names the ports of "
              "handsets, opens them to a group and keeps modem managers away; look at nothing")
@common_options
@click.pass_context
def doctor(context: click.Context, records: Path | None, store: str | None,
           udev_rule: bool) -> None:
    """Look for what goes wrong on this PC, and say what to do; one line each.

    Nothing is changed, and the handset is asked no more than every run asks it first. Without -p
    the only port on USB is meant. The exit status is 0 when all was looked at and nothing is wrong,
    8 when something may go wrong or could not be looked at, else that of the first error, as other
    commands end with it.
    """
    settings: Settings = context.ensure_object(Settings)
    if udev_rule:
        _print_rule(settings)
        return
    context.exit(_examine(settings, records, store))


def _print_rule(settings: Settings) -> None:
    # Ids that are none are refused by whoever looks for ports by them.
    sys.stdout.write(rule(settings.wanted_port.vid_pid))


def _examine(settings: Settings, records: Path | None, store: str | None) -> int:
    # What contradicts itself is usage, and no finding.
    _ = settings.wanted_port, settings.wanted
    visit = Examination(lambda: settings.port_or(AUTO), settings.open_named,
                        settings.chosen_channel, settings.baud or DEFAULT_BAUD,
                        settings.chosen_timeout or RECOVER_TIMEOUT, records, store)
    findings: list[tuple[str, Finding]] = []
    try:
        for name, finding in examine(visit):
            findings.append((name, finding))
            if not settings.json:
                _show(name, finding)
    finally:
        visit.close()
    status = exit_status([finding for _, finding in findings])
    if settings.json:
        console.data_json({"ok": status == EXIT_PASS, "exit_status": status,
                           "port": visit.url or None, "channel": visit.channel.value,
                           "findings": [finding.json(name) for name, finding in findings]})
    else:
        console.talk(_summary(findings))
    return status


def _show(name: str, finding: Finding) -> None:
    word = f"{finding.level.value:{_MARK_WIDTH}}"
    paint = console.good if finding.level is Level.OK else console.bad
    advice = f"; {finding.advice}" if finding.advice else ""
    console.data(f"{name:{_NAME_WIDTH}}{finding.text}{advice}", paint(word))


def _summary(findings: list[tuple[str, Finding]]) -> str:
    counts = Counter(finding.level.value for _, finding in findings)
    said = [f"{count} {word}{'s' if word != 'not checked' and count > 1 else ''}"
            for word, count in counts.items() if word != "ok"]
    return ", ".join(said) or "nothing is wrong"
