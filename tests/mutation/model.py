"""Mutants, and the places of a source file that the generated copy rewrites for them.

A place covers a range of byte offsets. Ranges nest or are disjoint; where two places have the same range, the one with
the lower `rank` is the outer one.
"""

import re
from dataclasses import dataclass, field


def one_line(text):
    """Source text as reports and keys show it."""
    return re.sub(r"\s+", " ", re.sub(r"//[^\n]*", "", text)).strip()


@dataclass(eq=False)
class Mutant:
    kind: str
    path: str  # from the top of the repository
    offset: int
    line: int
    column: int
    function: str
    original: str
    mutated: str
    rebuilt: bool = False  # stands where a constant expression is required, so its file is compiled again
    ordinal: int = 1
    number: int = 0

    def base_key(self):
        return f"{self.path}: {self.function}: {self.kind}: [{self.original}] -> [{self.mutated}]"

    @property
    def key(self):
        """Stays the same when lines move or other mutants come and go."""
        return f"{self.base_key()} #{self.ordinal}"

    @property
    def place(self):
        return f"{self.path}:{self.line}:{self.column}"


@dataclass
class Place:
    start: int
    end: int


@dataclass
class Statement(Place):
    """An expression statement, without its semicolon: may be left out, or change places with the next one."""

    rank = 0
    removal: Mutant = None
    swapped_with_next: Mutant = None
    swapped_with_previous: Mutant = None
    previous: tuple = None  # the range of the previous statement


@dataclass
class Jump(Place):
    """A return, break or continue that may be left out."""

    rank = 0
    removal: Mutant = None


@dataclass
class Choice(Place):
    """An expression with other texts to choose from. `as_bool` when the expression only has to convert to bool."""

    rank = 1
    as_bool: bool = False
    options: list = field(default_factory=list)  # (mutant, text)


@dataclass
class Use(Place):
    """Where a variable is named whose initialiser has mutants: marks these as reached."""

    rank = 2
    variable: tuple = None


@dataclass
class Replace(Place):
    """Another text in the copy, in all mutants."""

    rank = 3
    text: str = ""


@dataclass
class Insert(Place):
    """A text behind a range; `{}` in it stands for the mutant's number."""

    rank = 0
    text: str = ""
    mutant: Mutant = None


@dataclass
class Rebuild(Place):
    """A constant expression; the option that is to be compiled is chosen when the copy is written."""

    rank = 1
    options: list = field(default_factory=list)


class FilePlaces:
    """All places of one source file."""

    def __init__(self, source):
        self.source = source
        self.places = []
        self.mutants = []
        self.variables = {}  # of variables with mutants in their initialisers: key -> range of the initialiser
        self._choices = {}

    def mutant(self, kind, function, start, original, mutated, rebuilt=False):
        line, column = self.source.position(start)
        made = Mutant(kind, self.source.path, start, line, column, function, one_line(original), one_line(mutated),
                      rebuilt)
        self.mutants.append(made)
        return made

    def add(self, place):
        self.places.append(place)

    def choose(self, kind, function, start, end, text, as_bool=False, shown=None):
        """Adds `text` as an option for the range, unless it's the original or an option already."""
        place = self._choices.get((start, end))
        original = self.source.text(start, end)
        taken = [original] + [known for _, known in place.options] if place else [original]
        if one_line(text) in map(one_line, taken):
            return
        if place is None:
            place = Choice(start, end)
            self._choices[(start, end)] = place
            self.add(place)
        place.as_bool = place.as_bool or as_bool
        place.options.append((self.mutant(kind, function, start, original, shown or text), text))


def number(files):
    """Gives every mutant its number and its ordinal among those that read the same."""
    count = 0
    for file in files:
        ordinals = {}
        file.mutants.sort(key=lambda mutant: mutant.offset)
        for mutant in file.mutants:
            count += 1
            mutant.number = count
            base = mutant.base_key()
            ordinals[base] = ordinals.get(base, 0) + 1
            mutant.ordinal = ordinals[base]
    return count
