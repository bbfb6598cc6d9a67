"""The mutants of expressions: conditions, operators and literals."""

from clang.cindex import CursorKind

import literals
from model import Rebuild
from syntax import core, is_bool, is_integer, operands, operator, range_of

NEIGHBOURS = {
    "<": ("<=", ">="), "<=": ("<", ">"), ">": (">=", "<="), ">=": (">", "<"),
    "==": ("!=", "<=", ">="), "!=": ("==", "<", ">"),
}
OPPOSITE = {"<": ">=", "<=": ">", ">": "<=", ">=": "<", "==": "!=", "!=": "=="}
# The difference of the right operand that has the effect of a neighbouring operator, and so is no mutant of its own.
SAME_AS_NEIGHBOUR = {"<": 1, ">=": 1, ">": -1, "<=": -1}
ARITHMETIC = {"+": "-", "-": "+", "*": "+"}


class Expressions:
    """Adds the mutants of one expression at a time; the walker goes down into its operands."""

    def __init__(self, places):
        self.places = places
        self.source = places.source
        self.function = ""
        self.unwanted = {}  # range of a literal -> the difference that another mutant stands for
        self.compared = set()  # ranges of literals that are compared
        self.returned = set()  # ranges of literals that are returned

    def text(self, cursor):
        return self.source.text(*range_of(cursor))

    def option(self, kind, cursor, text, as_bool=False, shown=None):
        self.places.choose(kind, self.function, *range_of(cursor), text, as_bool, shown)

    def truth(self, cursor, kind="condition", negated=False):
        """True, false and, for a condition, the opposite: whichever has no twin among the operands' own mutants."""
        inside = core(cursor)
        what = operator(inside, self.source)
        if inside.kind == CursorKind.CXX_BOOL_LITERAL_EXPR:
            return
        if negated and what not in OPPOSITE:
            opposite = f"!({self.text(cursor)})"
            if inside.kind == CursorKind.UNARY_OPERATOR and self.text(inside).startswith("!"):
                opposite = self.text(inside)[1:]
            self.option(kind, cursor, opposite, as_bool=True)
        if what != "||":
            self.option(kind, cursor, "true", as_bool=True)
        if what != "&&":
            self.option(kind, cursor, "false", as_bool=True)

    def binary(self, cursor):
        left, right = operands(cursor)
        what = operator(cursor, self.source)
        if what in ("&&", "||"):
            self.replaced_operator("logic", cursor, "||" if what == "&&" else "&&")
        elif what in NEIGHBOURS:
            whole = is_integer(left) and is_integer(right) and not is_bool(core(left))
            for other in NEIGHBOURS[what] if whole else (OPPOSITE[what],):
                if whole or other in OPPOSITE:
                    self.replaced_operator("relation", cursor, other)
            literal = range_of(core(right))
            self.compared.add(literal)
            if whole:
                self.unwanted[literal] = SAME_AS_NEIGHBOUR.get(what, 0)
        elif what in ARITHMETIC and cursor.kind == CursorKind.BINARY_OPERATOR:
            self.replaced_operator("arithmetic", cursor, ARITHMETIC[what])

    def replaced_operator(self, kind, cursor, other):
        left, right = operands(cursor)
        between = (range_of(left)[1], range_of(right)[0])
        gap = self.source.text(*between)
        self.option(kind, cursor,
                    self.text(left) + gap.replace(operator(cursor, self.source), other) + self.text(right))

    def integer(self, cursor, sign=1):
        """A literal, or the negative of one when `cursor` is a minus sign's operation."""
        literal = core(next(cursor.get_children())) if sign < 0 else cursor
        text = self.text(literal)
        place = range_of(cursor)
        if place in self.returned:
            for other in literals.returned_integer(text, sign):
                self.option("return", cursor, other)
            return
        for difference, other in literals.integer(text, sign, place in self.compared):
            if difference != self.unwanted.get(place):
                self.option("constant", cursor, other)

    def boolean(self, cursor):
        kind = "return" if range_of(cursor) in self.returned else "constant"
        self.option(kind, cursor, "false" if self.text(cursor) == "true" else "true")

    def character(self, cursor):
        self.option("constant", cursor, literals.character(self.text(cursor)))

    def string(self, cursor):
        for other in literals.string(self.text(cursor)):
            self.option("text", cursor, other)

    def size(self, cursor):
        self.option("size", cursor, f"{self.text(cursor)} - 1")

    def macro(self, cursor):
        """A whole macro call; what it expands to isn't looked at."""
        if is_integer(cursor):
            self.option("constant", cursor, f"{self.text(cursor)} + 1")

    def enumerators(self, cursor):
        """Where an enumerator becomes a number: each that is written with its value gets another one."""
        enumeration = core(list(cursor.get_children())[-1])
        declaration = enumeration.type.get_canonical().get_declaration()
        if declaration.kind != CursorKind.ENUM_DECL:
            return
        for enumerator in declaration.get_children():
            value = next((child for child in enumerator.get_children()), None)
            if value is not None:
                changed = enumerator.enum_value + 1
                name = f"{declaration.spelling}::{enumerator.spelling}"
                self.option("constant", cursor, f"{self.text(enumeration)} == {name} ? {changed} : {self.text(cursor)}",
                            shown=f"{name} = {changed}")

    def constant_expression(self, cursor):
        """Literals that have to stay constants: their mutants are compiled one by one."""
        for child in [cursor, *cursor.walk_preorder()]:
            if child.kind == CursorKind.INTEGER_LITERAL:
                start, end = range_of(child)
                text = self.source.text(start, end)
                if any(place.start == start for place in self.places.places if isinstance(place, Rebuild)):
                    continue
                # With a header the tests are compiled again as well, so one mutant has to do.
                others = [other for _, other in literals.integer(text)][:1 if self.source.path.endswith(".h") else 2]
                options = [(self.places.mutant("constant", self.function, start, text, other, rebuilt=True), other)
                           for other in others]
                self.places.add(Rebuild(start, end, options))
