"""The text form of Prometheus, read strictly: whatever a lenient reader would let pass fails here."""

import re

NAME = r"[a-zA-Z_:][a-zA-Z0-9_:]*"
LABEL = r'[a-zA-Z_][a-zA-Z0-9_]*="(?:[^"\\\n]|\\[\\"n])*"'
SAMPLE = re.compile(rf"({NAME})(?:\{{({LABEL}(?:,{LABEL})*)\}})? (\S+)")
NUMBER = re.compile(r"[+-]?(\d+(\.\d+)?([eE][+-]?\d+)?|Inf|NaN)")
KINDS = ("counter", "gauge", "histogram", "summary", "untyped")
ENDS = ("_bucket", "_sum", "_count")


class Figures:
    """TYPES: the kind of each family. VALUES: the samples by (name, frozenset of (label, value))."""

    def __init__(self, text):
        self.text = text
        self.types = {}
        self.values = {}
        self._family = None
        helped = set()
        assert text.endswith("\n") and "\r" not in text
        for line in text[:-1].split("\n"):
            if line.startswith("# HELP "):
                name, help_text = re.fullmatch(rf"# HELP ({NAME}) (\S.*)", line).groups()
                assert name not in helped and help_text, line
                helped.add(name)
                self._family = None
            elif line.startswith("# TYPE "):
                name, kind = re.fullmatch(rf"# TYPE ({NAME}) (\w+)", line).groups()
                assert name in helped and name not in self.types and kind in KINDS, line
                assert (kind == "counter") == name.endswith("_total"), line
                self.types[name] = kind
                self._family = name
            else:
                self._take(line)
        assert helped == set(self.types)
        for name, kind in self.types.items():
            assert any(self.family(sample) == name for sample, _ in self.values), f"{name} has no sample"
            if kind == "histogram":
                self._check_histogram(name)

    def family(self, sample):
        for end in ENDS:
            base = sample.removesuffix(end)
            if base != sample and self.types.get(base) == "histogram":
                return base
        return sample

    def _take(self, line):
        match = SAMPLE.fullmatch(line)
        assert match, f"no sample: {line!r}"
        name, labels, value = match.groups()
        pairs = re.findall(r'(\w+)="((?:[^"\\]|\\.)*)"', labels or "")
        key = (name, frozenset(pairs))
        assert len(dict(pairs)) == len(pairs), f"a label twice: {line!r}"
        assert self.family(name) == self._family, f"not below its own TYPE: {line!r}"
        assert key not in self.values, f"twice: {line!r}"
        assert NUMBER.fullmatch(value), line
        self.values[key] = float(value)

    def _check_histogram(self, name):
        groups = {}
        for (sample, labels), value in self.values.items():
            if sample == name + "_bucket":
                rest = frozenset(pair for pair in labels if pair[0] != "le")
                groups.setdefault(rest, []).append((float(dict(labels)["le"]), value))
        assert groups, f"{name} has no buckets"
        for labels, buckets in groups.items():
            buckets.sort()
            counts = [count for _, count in buckets]
            assert counts == sorted(counts), f"{name}: buckets that fall"
            assert buckets[-1][0] == float("inf") and counts[-1] == self.values[name + "_count", labels]
            assert self.values[name + "_sum", labels] >= 0

    def total(self, name, **labels):
        """The sum of all samples of this name that have these labels; 0 when there is none."""
        wanted = set(labels.items())
        return sum(value for (sample, pairs), value in self.values.items() if sample == name and wanted <= pairs)

    def fell(self, later):
        """The counters, and counts of histograms, that are smaller or gone in LATER."""
        rising = [key for key in self.values
                  if self.types[self.family(key[0])] == "counter"
                  or (self.types[self.family(key[0])] == "histogram" and not key[0].endswith("_sum"))]
        return [key for key in rising if later.values.get(key, -1) < self.values[key]]


def figures_of(machine):
    """What vornd tells root of itself."""
    status, body = machine.client.request("GET", "/metrics", deadline=20)
    assert status == 200, body
    return Figures(body.decode())
