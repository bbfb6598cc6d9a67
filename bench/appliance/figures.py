"""Measured values, and the wanted ones that they are held against."""

import statistics

from tables import number, table

# A shared machine's times vary: a median that misses by less than this is reported but fails nothing. Where the worst
# one counts, what is wanted is a promise to those who wait, and to miss it at all is a failure.
MARGIN = 2.0

# For each unit: digits shown, and what the values are multiplied with for that.
UNITS = {"s": (2, 1), "ms": (1, 1e3), "µs": (0, 1e6), "times": (2, 1), "MB": (2, 1e-6), "%": (1, 1)}


class Values:
    """Repeated measurements of one thing, in seconds, bytes or plain numbers; shown in a unit."""

    def __init__(self, values, unit):
        self.values = list(values)
        self.unit = unit

    @property
    def median(self):
        return statistics.median(self.values)

    def text(self, value):
        digits, factor = UNITS[self.unit]
        return number(value * factor, digits)

    def cells(self):
        return [self.text(self.median), self.text(min(self.values)), self.text(max(self.values))]


class Figure:
    """A measured value with its limit. The median counts, or the worst one when a promise is to hold every time."""

    def __init__(self, what, values, limit, worst=False, wrong=""):
        self.what = what
        self.values = values
        self.limit = limit
        self.worst = worst
        self.wrong = wrong  # what was answered instead of the right thing

    @property
    def measured(self):
        return max(self.values.values) if self.worst else self.values.median

    @property
    def verdict(self):
        if self.wrong:
            return "WRONG: " + self.wrong
        if self.measured <= self.limit:
            return "met"
        if self.worst:
            return "BROKEN PROMISE"
        return "missed" if self.measured <= MARGIN * self.limit else "MISSED BY FAR"

    @property
    def is_far(self):
        return self.verdict not in ("met", "missed")

    def row(self):
        wanted = f"{self.values.text(self.limit)} {self.values.unit}"
        return [self.what, *self.values.cells(), "most" if self.worst else "median", wanted, self.verdict]

    def as_json(self):
        return {"what": self.what, "unit": self.values.unit, "values": self.values.values, "measured": self.measured,
                "limit": self.limit, "counts": "most" if self.worst else "median", "result": self.verdict}


class Details:
    """A table beside the figures: what they were made of."""

    def __init__(self, title, first):
        self.title = title
        self.first = first
        self.rows = []

    def add(self, what, values):
        self.rows.append((what, values))

    def text(self):
        cells = [[what, *values.cells(), values.unit, len(values.values)] for what, values in self.rows]
        return table([self.first, "median", "least", "most", "unit", "runs"], cells)

    def as_json(self):
        return {"title": self.title, "first": self.first,
                "rows": [{"what": what, "unit": values.unit, "values": values.values} for what, values in self.rows]}


class Findings:
    """All that a run has found out."""

    def __init__(self):
        self.figures = []
        self.details = []

    def add(self, *args, **more):
        self.figures.append(Figure(*args, **more))

    def table_of(self, title, first):
        self.details.append(Details(title, first))
        return self.details[-1]

    def wanted_table(self):
        headings = ["figure", "median", "least", "most", "counts", "at most", "result"]
        return table(headings, [figure.row() for figure in self.figures])

    def as_json(self):
        return {"figures": [figure.as_json() for figure in self.figures],
                "details": [details.as_json() for details in self.details]}

    @staticmethod
    def from_json(record):
        findings = Findings()
        for figure in record["figures"]:
            wrong = figure["result"].removeprefix("WRONG: ") if figure["result"].startswith("WRONG: ") else ""
            findings.add(figure["what"], Values(figure["values"], figure["unit"]), figure["limit"],
                         worst=figure["counts"] == "most", wrong=wrong)
        for details in record["details"]:
            made = findings.table_of(details["title"], details["first"])
            for row in details["rows"]:
                made.add(row["what"], Values(row["values"], row["unit"]))
        return findings
