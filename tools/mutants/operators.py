"""The kinds of defects, as a table: what is looked for in code, and what is put in its place."""

import re
from collections import Counter
from dataclasses import dataclass, replace
from typing import Callable, Iterator, Mapping

from tools.mutants.masked import masked, masked_python

Replace = Callable[["re.Match[str]", str], str]


@dataclass(frozen=True)
class Operator:
    """One kind: PATTERN is matched in the masked source, REPLACE is given the original text."""

    name: str
    pattern: "re.Pattern[str]"
    replace: Replace


@dataclass(frozen=True)
class Mutant:
    """One defect: the bytes of a file from START to END become TEXT."""

    path: str
    operator: str
    start: int
    end: int
    text: str
    line: int
    before: str
    # The line of code that it is in, or begins in.
    code: str = ""
    # Which one it is where the same line of code and change come again in the file.
    turn: str = ""

    @property
    def name(self) -> str:
        """How it is named on a command line."""
        return f"{self.path}:{self.start}:{self.operator}"

    def applied(self, source: str) -> str:
        """The source with the defect."""
        return source[:self.start] + self.text + source[self.end:]

    @property
    def listed(self) -> str:
        """How a list names it: without the numbers of lines, which move."""
        return f"{self.path}: {self.code}: {self._change}{self.turn}"

    @property
    def _change(self) -> str:
        def short(text: str) -> str:
            return " ".join(text.split()) or "nothing"

        return f"{self.operator}: {short(self.before)} -> {short(self.text)}"

    def __str__(self) -> str:
        return f"{self.path}:{self.line}: {self._change}"


def _swap(pairs: dict[str, str]) -> Replace:
    return lambda match, original: pairs[original]


def _by_one(match: "re.Match[str]", original: str) -> str:
    digits = original.rstrip("uUlL")
    value = int(digits, 16 if digits.lower().startswith("0x") else 10)
    return f"{value + 1}{original[len(digits):]}"


def _text(_match: "re.Match[str]", original: str) -> str:
    """The same text with its last letter changed; conversions and escapes are left alone."""
    places = [place for place in range(len(original) - 1, 0, -1)
              if original[place].isalpha() and not re.search(r"(\\|%[-+ #0-9.*hlzjt]*)$",
                                                             original[:place])
              and not re.search(r"\\x[0-9A-Fa-f]*$", original[:place])]
    if not places:
        return original
    place = places[0]
    return original[:place] + ("x" if original[place] != "x" else "y") + original[place + 1:]


def _negated(_match: "re.Match[str]", original: str) -> str:
    return f"!({original})"


def _other_status(_match: "re.Match[str]", original: str) -> str:
    return "PUB_ERR_NONE" if original != "PUB_ERR_NONE" else "PUB_ERR_FAIL"


def _gone(_match: "re.Match[str]", _original: str) -> str:
    return ";"


COMPARISONS = {"==": "!=", "!=": "==", "<=": "<", ">=": ">", "<": "<=", ">": ">="}
ARITHMETIC = {"+": "-", "-": "+", "*": "/", "/": "*", "%": "/", "+=": "-=", "-=": "+=",
              "<<": ">>", ">>": "<<", "&": "|", "|": "&", "|=": "&="}
LOGIC = {"&&": "||", "||": "&&"}
FLAGS = {"true": "false", "false": "true"}
# A statement on lines of its own: a call or an assignment, no declaration and no jump.
STATEMENT = (r"(?m)^[ \t]+(?P<it>%s(?:\(void\) ?)?[A-Za-z_][\w.:>\[\]-]*"
             r"(?:\([^;{}]*\)|\s[-+|&]?=\s[^;{}]*|\+\+|--);)$")
LOG = r"(?:PUB_LOG|pub_log_\w+)\("
NUMBER = r"(?<![\w.'\"])(?:0x[0-9A-Fa-f]+|\d+)[uUlL]*(?![\w.'\"])"
BETWEEN_OPERANDS = r"(?<=[\w)\]] )(\+|-|\*|/|%|<<|>>|\+=|-=|&|\||\|=)(?= [\w(~])"

OPERATORS = (
    Operator("comparison", re.compile(r"(?<= )(==|!=|<=|>=|<|>)(?= )"), _swap(COMPARISONS)),
    Operator("logic", re.compile(r"(?<= )(&&|\|\|)(?= )"), _swap(LOGIC)),
    Operator("condition", re.compile(r"(?<=\bif \()[^;{}]+(?=\) \{$)", re.MULTILINE), _negated),
    Operator("constant", re.compile(NUMBER), _by_one),
    Operator("arithmetic", re.compile(BETWEEN_OPERANDS), _swap(ARITHMETIC)),
    Operator("flag", re.compile(r"\b(true|false)\b"), _swap(FLAGS)),
    Operator("log", re.compile(STATEMENT % f"(?={LOG})"), _gone),
    Operator("statement", re.compile(STATEMENT % f"(?!{LOG})"), _gone),
    Operator("status", re.compile(r"\bPUB_ERR_\w+\b"), _other_status),
    Operator("text", re.compile(r"\"\x01+\""), _text),
    Operator("break", re.compile(r"(?m)^[ \t]+(?P<it>break;)$"), _gone),
)


IDENTITY = {"is not": "is", "is": "is not", "not in": "in", "in": "not in"}
PYTHON_LOGIC = {"and": "or", "or": "and"}
PYTHON_FLAGS = {"True": "False", "False": "True"}
PYTHON_ARITHMETIC = {"+": "-", "-": "+", "*": "//", "//": "*", "/": "*", "%": "//", "+=": "-=",
                     "-=": "+=", "<<": ">>", ">>": "<<"}
PYTHON_BETWEEN = r"(?<=[\w)\]] )(\+|-|\*|//|/|%|<<|>>|\+=|-=)(?= [\w(~])"
PYTHON_STATEMENT = (r"(?m)^[ ]+(?P<it>(?:await )?[A-Za-z_][\w.\[\]]*"
                    r"(?:\([^\n]*\)|\s[-+|&]?=\s[^\n]*[^\s(\[{,]))$")


def _not(_match: "re.Match[str]", original: str) -> str:
    return f"not ({original})"


def _pass(_match: "re.Match[str]", _original: str) -> str:
    return "pass"


def _none(_match: "re.Match[str]", _original: str) -> str:
    return "return None"


PYTHON_OPERATORS = (
    OPERATORS[0],
    Operator("identity", re.compile(r"(?<= )(is not|is|not in)(?= )"), _swap(IDENTITY)),
    Operator("logic", re.compile(r"(?<= )(and|or)(?= )"), _swap(PYTHON_LOGIC)),
    Operator("condition", re.compile(r"(?m)(?<=\bif )[^\n:]+(?=:$)"), _not),
    Operator("constant", re.compile(NUMBER), _by_one),
    Operator("arithmetic", re.compile(PYTHON_BETWEEN), _swap(PYTHON_ARITHMETIC)),
    Operator("flag", re.compile(r"\b(True|False)\b"), _swap(PYTHON_FLAGS)),
    Operator("statement", re.compile(PYTHON_STATEMENT), _pass),
    Operator("return", re.compile(r"(?m)^[ ]+(?P<it>return (?!None$)[^\n]*[^\s(\[{,])$"), _none),
    Operator("refusal", re.compile(r"(?m)^[ ]+(?P<it>raise [^\n]*[^\s(\[{,])$"), _pass),
    Operator("text", re.compile(r"\"\x01+\""), _text),
    Operator("break", re.compile(r"(?m)^[ ]+(?P<it>break|continue)$"), _pass),
)

# How each language is read, and what may be wrong in it.
LANGUAGES: Mapping[str, tuple[Callable[[str], str], tuple[Operator, ...]]] = {
    "cpp": (masked, OPERATORS),
    "py": (masked_python, PYTHON_OPERATORS),
}


def mutants_of(path: str, source: str) -> Iterator[Mutant]:
    """Every mutant of one file; no two are listed alike."""
    mutants = list(_changes(path, source))
    total = Counter(mutant.listed for mutant in mutants)
    seen: Counter[str] = Counter()
    for mutant in mutants:
        listed = mutant.listed
        seen[listed] += 1
        if total[listed] == 1:
            yield mutant
        else:
            yield replace(mutant, turn=f" ({seen[listed]} of {total[listed]})")


def _changes(path: str, source: str) -> Iterator[Mutant]:
    mask, operators = LANGUAGES[path.rpartition(".")[2]]
    code = mask(source)
    lines = source.split("\n")
    for operator in operators:
        for match in operator.pattern.finditer(code):
            start, end = match.span("it") if "it" in match.groupdict() else match.span()
            original = source[start:end]
            text = operator.replace(match, original)
            if text != original:
                line = source.count("\n", 0, start) + 1
                yield Mutant(path, operator.name, start, end, text, line, original,
                             lines[line - 1].strip())
