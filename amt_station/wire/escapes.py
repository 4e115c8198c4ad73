r"""Bytes written as text: \r \n \t \0 \\ \" and \xHH."""

import re

ESCAPE = re.compile(r"\\(x[0-9A-Fa-f]{2}|.|$)", re.DOTALL)
CHARACTERS = {"r": b"\r", "n": b"\n", "t": b"\t", "0": b"\0", "\\": b"\\", '"': b'"'}


def unescape(text: str, encoding: str = "utf-8") -> bytes:
    r"""The bytes that TEXT stands for; ValueError names an escape that there is not.

    What is not escaped is taken in this ENCODING.
    """
    parts = []
    place = 0
    for match in ESCAPE.finditer(text):
        code = match[1]
        if len(code) == 3:
            value = bytes.fromhex(code[1:])
        elif code in CHARACTERS:
            value = CHARACTERS[code]
        else:
            raise ValueError(f"unknown escape \\{code}")
        parts += [text[place:match.start()].encode(encoding, "surrogateescape"), value]
        place = match.end()
    return b"".join([*parts, text[place:].encode(encoding, "surrogateescape")])
