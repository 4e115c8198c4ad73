"""What the steps so far come to."""

from __future__ import annotations

from dataclasses import dataclass, field
from enum import Enum

from amt_line.plan.model import Section, When
from amt_line.run.stop import Abort

EXIT_PASS, EXIT_FAIL, EXIT_OWN_ERROR = 0, 1, 7


class Verdict(str, Enum):
    """How a step ended."""

    PASS = "pass"
    FAIL = "fail"
    ERROR = "error"
    SKIPPED = "skipped"


class RunVerdict(str, Enum):
    """How a run ended."""

    PASS = "PASS"
    FAIL = "FAIL"
    ERROR = "ERROR"
    ABORTED = "ABORTED"


@dataclass
class Tally:
    """Counts the verdicts, and keeps the first that was no pass."""

    passed_steps: int = 0
    failed: bool = False
    error_status: int = 0
    reason: str = ""
    advice: str = ""
    abort: Abort | None = None
    counts: dict[str, int] = field(default_factory=dict)

    def count(self, verdict: Verdict, section: Section) -> None:
        """A step has ended."""
        self.counts[verdict.value] = self.counts.get(verdict.value, 0) + 1
        if verdict is Verdict.PASS and section is Section.STEP:
            self.passed_steps += 1

    def count_again(self, before: Verdict, verdict: Verdict) -> None:
        """A step that had ended was carried out once more."""
        self.counts[before.value] -= 1
        self.counts[verdict.value] = self.counts.get(verdict.value, 0) + 1
        self.counts = {word: count for word, count in self.counts.items() if count}

    def not_passed(self, verdict: Verdict, status: int, reason: str, advice: str) -> None:
        """Something did not pass; the first one is what people are told."""
        if verdict is Verdict.ERROR and not self.error_status:
            self.error_status = status if status > EXIT_FAIL else EXIT_OWN_ERROR
        if not self.reason:
            self.reason, self.advice = reason, advice
        self.failed = True

    def allows(self, when: When | None) -> bool:
        """Whether a step that depends on the steps so far is carried out."""
        if when is When.PASSED:
            return not self.failed
        return self.failed if when is When.FAILED else True

    def verdict(self) -> RunVerdict:
        """The verdict so far. A run in which no step has passed is no pass."""
        if self.abort is not None:
            return RunVerdict.ABORTED
        if self.error_status:
            return RunVerdict.ERROR
        if self.failed:
            return RunVerdict.FAIL
        return RunVerdict.PASS if self.passed_steps else RunVerdict.ERROR

    def exit_status(self) -> int:
        """The status that belongs to the verdict."""
        if self.abort is not None:
            return self.abort.exit_status
        return {RunVerdict.PASS: EXIT_PASS, RunVerdict.FAIL: EXIT_FAIL}.get(
            self.verdict(), self.error_status or EXIT_OWN_ERROR)
