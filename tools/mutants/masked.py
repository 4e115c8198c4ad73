"""Source text in which only code is left, place for place: no comments, no includes, no texts."""

import io
import re
import tokenize

# What is no code: comments, preprocessor lines with their continuations, texts and characters.
PARTS = re.compile(r"""
    (?P<comment>//[^\n]*|/\*.*?\*/)
  | (?P<directive>^[ \t]*\#(?:[^\n\\]|\\.|\\\n)*)
  | (?P<text>"(?:[^"\\\n]|\\.)*")
  | (?P<character>'(?:[^'\\\n]|\\.)+')
""", re.VERBOSE | re.MULTILINE | re.DOTALL)


def _blank(text: str) -> str:
    return re.sub(r"[^\n]", " ", text)


def masked(source: str) -> str:
    """The source with everything that is no code blanked; quotation marks of texts stay."""
    def replace(match: "re.Match[str]") -> str:
        whole = match.group()
        if match.lastgroup in ("text", "character"):
            return whole[0] + "\x01" * (len(whole) - 2) + whole[-1]
        return _blank(whole)

    return PARTS.sub(replace, source)


# Behind these a text stands for itself: it is what people read of a module, a class, a function.
_BEGINS = (tokenize.NEWLINE, tokenize.NL, tokenize.INDENT, tokenize.DEDENT, tokenize.COMMENT,
           tokenize.ENCODING)


def _hidden(text: str, is_document: bool) -> str:
    if is_document or not text.startswith('"') or text.startswith('"""'):
        return _blank(text)
    return text[0] + "\x01" * (len(text) - 2) + text[-1]


# What a type checker is told; it never fails, and would be no behaviour if it did.
_ASSERTION = re.compile(r"(?m)^ +assert .*$")


def masked_python(source: str) -> str:
    """The same of a Python source; only plain texts keep their quotation marks."""
    starts = [0]
    for line in source.splitlines(keepends=True):
        starts.append(starts[-1] + len(line))
    code = list(source)
    before = tokenize.ENCODING
    for token in tokenize.generate_tokens(io.StringIO(source).readline):
        if token.type in (tokenize.STRING, tokenize.COMMENT):
            first, last = (starts[row - 1] + column for row, column in (token.start, token.end))
            is_document = token.type == tokenize.COMMENT or before in _BEGINS
            code[first:last] = _hidden(token.string, is_document)
        before = token.type
    return _ASSERTION.sub(lambda match: _blank(match[0]), "".join(code))
