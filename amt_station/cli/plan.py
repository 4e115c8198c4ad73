"""The command that carries out a test plan."""

from __future__ import annotations

from pathlib import Path

import click

from amt_station.cli import console
from amt_station.cli.options import Settings, common_options
from amt_station.errors import Interrupted, UsageProblem
from amt_station.plan import Plan, load_plan
from amt_station.plan_run import StepResult, Verdict, exit_status, run_plan
from amt_station.report import junit_xml, plan_json, summary, verdict_table


@click.command()
@click.argument("file", type=click.Path(path_type=Path))
@click.option("--junit", type=click.Path(path_type=Path), metavar="FILE",
              help="Write a JUnit report too")
@common_options
@click.pass_context
def plan(context: click.Context, file: Path, junit: Path | None) -> None:
    """Carry out a test plan and print a verdict for each step.

    FILE is a TOML file of steps. A step is a typed command, a request or an AT text; limits bound
    the values of its answer:

    \b
      title = "end of line"
      [[step]]
      name = "battery ADC"
      command = "battery adc"
      limits.adc = { min = 1800, max = 2200 }
      [[step]]
      command = "test-result write"
      with = { station = 3, verdict = "pass" }
      [[step]]
      request = "AMT_VERSION_CMD"
      atoms = ["module=int:16"]
      limits.version = { matches = "^ORLA" }
      stop = true
      [[step]]
      at = "AT^DBTADDR?"
      expect = "OK"
      timeout = 3

    A limit has min, max, equals or matches; the lines of an AT reply are its value `reply`. With
    stop, the steps behind one that does not pass are skipped. The exit status is 0 when every
    step passed.
    """
    settings: Settings = context.ensure_object(Settings)
    steps = load_plan(file, settings.chosen_channel)
    results: list[StepResult] = []
    interrupted = None
    with settings.open_link() as link:
        try:
            for result in run_plan(link, steps):
                results.append(result)
                console.talk(f"{len(results)}/{len(steps.steps)} {result.name}: "
                             f"{result.verdict.value}")
        except KeyboardInterrupt:
            interrupted = Interrupted()
            results += [StepResult(step.name, Verdict.SKIPPED, reason=str(interrupted))
                        for step in steps.steps[len(results):]]
    _report(settings, steps, results, junit)
    if interrupted is not None:
        interrupted.reported = True
        raise interrupted
    context.exit(exit_status(results))


def _report(settings: Settings, steps: Plan, results: list[StepResult],
            junit: Path | None) -> None:
    if settings.json:
        console.data_json(plan_json(steps, results))
    else:
        for line in verdict_table(results):
            print(line)
        console.data(summary(steps, results))
    if junit is not None:
        try:
            junit.write_text(junit_xml(steps, results), encoding="utf-8")
        except OSError as error:
            problem = UsageProblem(f"{junit}: {error.strerror}")
            problem.reported = True
            raise problem from error
