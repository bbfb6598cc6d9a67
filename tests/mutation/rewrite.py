"""Writes the copy of a source file in which the active mutant is chosen while the program runs.

Every statement keeps its line, since log lines carry their numbers: where a text of several lines is written more than
once, `#line` sets the number back.
"""

from model import Choice, Insert, Jump, Rebuild, Replace, Statement, Use


class Rewriter:
    """`reached_by_use` gives, for a variable's key, the ranges of mutants in its initialiser."""

    def __init__(self, places, reached_by_use, rebuilt=None):
        self.source = places.source
        self.places = sorted(places.places, key=lambda place: (place.start, -place.end, place.rank))
        self.reached_by_use = reached_by_use
        self.rebuilt = rebuilt  # the one mutant in a constant expression to write, if any
        self.next = 0

    def whole(self):
        return self.range(0, len(self.source.content))

    def range(self, start, end):
        pieces = []
        at = start
        while self.next < len(self.places) and self.places[self.next].start < end:
            place = self.places[self.next]
            if place.start < at or place.end > end:
                raise ValueError(f"{self.source.path}: places overlap at line {self.source.line(place.start)}")
            pieces.append(self.source.text(at, place.start))
            self.next += 1
            inner = self.range(place.start, place.end)
            pieces.append(self.rewritten(place, inner))
            at = place.end
        pieces.append(self.source.text(at, end))
        return "".join(pieces)

    def rewritten(self, place, inner):
        return {
            Statement: self.statement, Jump: self.jump, Choice: self.choice, Use: self.use, Insert: self.insert,
            Replace: lambda place, inner: place.text, Rebuild: self.constant,
        }[type(place)](place, inner)

    def at_line(self, offset, text):
        return f"\n#line {self.source.line(offset)}\n{text}"

    def statement(self, place, inner):
        off = [f"mutant::On({mutant.number})" for mutant in (place.removal, place.swapped_with_next) if mutant]
        text = f"{' || '.join(off)} ? static_cast<void>(0) : static_cast<void>({inner})"
        if place.swapped_with_previous:
            first = self.at_line(place.previous[0], self.source.text(*place.previous))
            text = f"{text}, mutant::On({place.swapped_with_previous.number}) ? static_cast<void>({first}" + \
                self.at_line(place.end, ") : static_cast<void>(0)")
        return text

    def jump(self, place, inner):
        return f"if (!mutant::On({place.removal.number})) {inner}"

    def choice(self, place, inner):
        cast = "static_cast<bool>" if place.as_bool else ""
        texts = []
        for mutant, text in place.options:
            if "\n" in text:
                text = self.at_line(place.start, text) + self.at_line(place.start, "")
            texts.append(f"mutant::On({mutant.number}) ? {cast}({text}) : ")
        return f"({''.join(texts)}{cast}({inner}))"

    def use(self, place, inner):
        marks = "".join(f"mutant::Seen({first}, {last}), "
                        for first, last in self.reached_by_use.get(place.variable, ()))
        return f"({marks}{inner})" if marks else inner

    def insert(self, place, inner):
        return inner + place.text.format(place.mutant.number)

    def constant(self, place, inner):
        for mutant, text in place.options:
            if mutant is self.rebuilt:
                return text
        return inner


def reached_by_use(files):
    """For each variable the mutants in its initialiser, and in those of the variables that it names."""
    own, named = {}, {}
    for places in files:
        for key, (start, end) in places.variables.items():
            numbers = [mutant.number for mutant in places.mutants
                       if start <= mutant.offset < end and not mutant.rebuilt]
            own[key] = (min(numbers), max(numbers)) if numbers else None
            named[key] = {place.variable for place in places.places
                          if isinstance(place, Use) and start <= place.start < end}

    def all_of(key, seen):
        if key not in own or key in seen:
            return set()
        seen.add(key)
        return ({own[key]} - {None}).union(*(all_of(other, seen) for other in named[key]))

    return {key: sorted(all_of(key, set())) for key in own}
