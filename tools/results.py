"""What a test runner's report says: how many tests passed, and which did not."""

import xml.etree.ElementTree as ElementTree
from dataclasses import dataclass, field
from pathlib import Path

# Of a failed test's output, from its end: what has gone wrong stands there.
SHOWN_LINES = 60


@dataclass
class Count:
    """What a suite's report counts."""

    passed: int = 0
    failed: int = 0
    skipped: int = 0

    def add(self, other: "Count") -> None:
        """Add another suite's count."""
        self.passed += other.passed
        self.failed += other.failed
        self.skipped += other.skipped

    def __str__(self) -> str:
        return f"{self.passed} passed, {self.failed} failed, {self.skipped} skipped"


@dataclass
class Results:
    """The tests of one report; the failed and the skipped ones with what they said."""

    count: Count = field(default_factory=Count)
    failed: dict[str, str] = field(default_factory=dict)
    skipped: dict[str, str] = field(default_factory=dict)


def _name(case: ElementTree.Element) -> str:
    """A test's name; ctest gives the name as the class again."""
    name, group = case.get("name", "?"), case.get("classname", "")
    return name if group in ("", name) else f"{group}::{name}"


def _said(case: ElementTree.Element, kind: str) -> str:
    """What a test said: its output, the message of KIND, or the longer of them."""
    texts = [case.findtext("system-out") or ""]
    found = case.find(kind)
    if found is not None:
        texts += [found.get("message", ""), found.text or ""]
    return max(texts, key=len).strip()


def read_results(report: Path) -> Results:
    """Read a JUnit report; one that is not there, or is no such report, has no tests."""
    results = Results()
    try:
        cases = list(ElementTree.parse(report).getroot().iter("testcase"))
    except (OSError, ElementTree.ParseError):
        return results
    for case in cases:
        if case.find("failure") is not None or case.find("error") is not None:
            results.count.failed += 1
            kind = "failure" if case.find("failure") is not None else "error"
            results.failed[_name(case)] = _said(case, kind)
        elif case.find("skipped") is not None or case.get("status") in ("notrun", "disabled"):
            results.count.skipped += 1
            results.skipped[_name(case)] = _said(case, "skipped")
        else:
            results.count.passed += 1
    return results


def describe(results: Results) -> str:
    """The failed tests with their output, and the skipped ones with their reason."""
    parts = []
    for name, text in results.failed.items():
        lines = text.splitlines()
        shown = lines[-SHOWN_LINES:]
        if len(lines) > len(shown):
            shown.insert(0, f"({len(lines) - len(shown)} more lines)")
        parts.append("\n".join([f"FAILED {name}", *(f"    {line}" for line in shown)]))
    for name, text in results.skipped.items():
        lines = [line for line in text.splitlines() if line.strip()]
        parts.append(f"SKIPPED {name}: {lines[-1].strip() if lines else 'no reason given'}")
    return "\n".join(parts)
