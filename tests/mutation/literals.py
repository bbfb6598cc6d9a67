"""What a literal is changed to. All functions take and give source texts."""

import re


def value_of(text):
    return int(re.sub(r"[uUlL']+$", "", text.replace("'", "")), 0)


def integer(text, sign=1, compared=False):
    """The neighbours as (difference, text). Below zero only where a comparison can tell it from zero."""
    value = sign * value_of(text)
    variants = [(1, value + 1)]
    if value != 0 or compared:
        variants.append((-1, value - 1))
    is_hex = text.lower().startswith("0x")
    return [(difference, hex(new) if is_hex and new >= 0 else str(new)) for difference, new in variants]


def returned_integer(text, sign):
    value = sign * value_of(text)
    return [str(new) for new in {-1: (0, 1), 0: (-1, 1), 1: (0, -1)}.get(value, (value + 1, value - 1))]


def character(text):
    """The next character."""
    escapes = {"\\0": 0, "\\n": 10, "\\t": 9, "\\\\": 92, "\\'": 39}
    inner = text[1:-1]
    code = escapes[inner] if inner in escapes else ord(inner)
    following = chr(code + 1)
    return f"'{following}'" if following.isprintable() and following not in "\\'" else f"'\\x{code + 1:02x}'"


def string(text):
    """A letter more at the end, another first letter, and nothing."""
    variants = [text[:-1] + 'x"']
    pieces = re.match(r'"(\\x[0-9a-fA-F]+|\\[0-7]{1,3}|\\.|[^"\\])(.*)', text, re.DOTALL)
    if pieces:
        letter = "y" if pieces[1] == "x" else "x"
        variants += [f'"{letter}{pieces[2]}', '""']
    return variants
