"""Finds the mutants of all sources."""

from pathlib import Path

from clang.cindex import CursorKind

from model import FilePlaces, number
from syntax import Source, constants_required, parse, path_of, range_of
from walker import Walker


def source_paths(root):
    """Headers first: their mutants keep their numbers when only other files change, and so the tests stay compiled."""
    paths = [path for path in sorted((root / "src").rglob("*")) if path.suffix in (".h", ".cpp")]
    return [str(path.relative_to(root)) for path in sorted(paths, key=lambda path: path.suffix != ".h")]


def collect(root):
    """All files with their places, in a fixed order; the mutants are numbered."""
    paths = source_paths(root)
    sources = {path: Source(root, path) for path in paths}
    units = [parse(root, path) for path in paths if path.endswith(".cpp")]
    required = set().union(*(constants_required(unit, root, sources) for unit in units))
    files = {path: FilePlaces(source) for path, source in sources.items()}
    done = set()
    for unit in units:
        here = [(path_of(cursor, root), cursor) for cursor in unit.cursor.get_children()]
        here = [(path, cursor) for path, cursor in here if path in files and path not in done]
        macros = {}
        for path, cursor in here:
            if cursor.kind == CursorKind.MACRO_INSTANTIATION:
                macros.setdefault(path, set()).add(range_of(cursor))
        for path in {path for path, _ in here}:
            walker = Walker(files[path], root, macros.get(path, set()), required)
            for cursor in (cursor for where, cursor in here if where == path):
                if not cursor.kind.is_preprocessing():
                    walker.visit(cursor)
        done.update(path for path, _ in here)
    ordered = [files[path] for path in paths]
    number(ordered)
    return ordered
