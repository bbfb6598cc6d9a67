"""The report: what became of the mutants, held against the list of reviewed survivors."""

from collections import Counter

from runner import KILLED, NOT_REACHED, REFUSED, SURVIVED, TIMED_OUT

SEPARATOR = " ## "
COLUMNS = (KILLED, TIMED_OUT, SURVIVED, NOT_REACHED)


def read_reviewed(path):
    """The reviewed survivors, as key -> reason."""
    reviewed = {}
    for count, line in enumerate(path.read_text().splitlines() if path.exists() else [], start=1):
        if not line.strip() or line.startswith("#"):
            continue
        key, separator, reason = line.partition(SEPARATOR)
        if not separator or not reason.strip() or key in reviewed:
            raise SystemExit(f"{path}:{count}: needs a key of its own,{SEPARATOR}and a reason")
        reviewed[key.strip()] = reason.strip()
    return reviewed


def table(verdicts):
    counts = Counter((mutant.kind, verdict) for mutant, (verdict, _) in verdicts.items() if verdict != REFUSED)
    rows = [("kind", "made", *COLUMNS)]
    for kind in sorted({kind for kind, _ in counts}):
        numbers = [counts[kind, column] for column in COLUMNS]
        rows.append((kind, sum(numbers), *numbers))
    widths = [max(len(str(row[column])) for row in rows) for column in range(len(rows[0]))]
    for row in rows:
        print("  ".join(str(cell).rjust(width) if column else str(cell).ljust(width)
                        for column, (cell, width) in enumerate(zip(row, widths))))


def by_hand(mutant, build):
    if mutant.rebuilt:
        return f"tests/mutation/mutate.py --mutant {mutant.number}"
    program = build.executable(build.targets[0]).relative_to(build.root)
    return f"MUTANT={mutant.number} {program}"


def show(mutant, build, note=""):
    print(f"{mutant.place}: {mutant.kind}{note}")
    print(f"    {mutant.original}")
    print(f"    -> {mutant.mutated or '(nothing)'}")
    print(f"    {by_hand(mutant, build)}")
    print(f"    {mutant.key}")


def report(verdicts, reviewed, build):
    """Prints it all and gives the exit code. `reviewed` holds only what concerns the mutants that ran."""
    made = {mutant: verdict for mutant, (verdict, _) in verdicts.items() if verdict != REFUSED}
    survivors = [mutant for mutant, verdict in made.items() if verdict in (SURVIVED, NOT_REACHED)]
    keys = {mutant.key for mutant in survivors}
    known = {mutant.key for mutant in made}
    fresh = [mutant for mutant in survivors if mutant.key not in reviewed]
    stale = [key for key in reviewed if key not in keys]

    table(verdicts)
    slow = [mutant for mutant, verdict in made.items() if verdict == TIMED_OUT]
    if slow:
        print("\nTimed out, which counts as killed:\n")
    for mutant in slow:
        print(f"{mutant.place}: [{mutant.original}] -> [{mutant.mutated}]")
    if fresh:
        print("\nSurvivors that nobody has reviewed:\n")
    for mutant in fresh:
        show(mutant, build, ", not reached by any test" if made[mutant] == NOT_REACHED else "")
    if stale:
        print("\nReviewed, but no survivors:\n")
    for key in stale:
        print(f"{key}\n    {'is killed now' if key in known else 'there is no such mutant'}")
    print(f"\nmutants: {len(made)} made, {len(made) - len(survivors)} killed, {len(survivors)} survived "
          f"({len(survivors) - len(fresh)} reviewed)")
    return 1 if fresh or stale else 0
