"""The sources as libclang sees them: files, ranges, and what kind of thing a cursor is."""

import bisect
import functools
import re
from pathlib import Path

from clang.cindex import CursorKind, Index, TranslationUnit, TypeKind

ARGUMENTS = ["-std=c++17", "-I/usr/include/jsoncpp"]

INTEGERS = {
    TypeKind.CHAR_S, TypeKind.CHAR_U, TypeKind.SCHAR, TypeKind.UCHAR, TypeKind.SHORT, TypeKind.USHORT, TypeKind.INT,
    TypeKind.UINT, TypeKind.LONG, TypeKind.ULONG, TypeKind.LONGLONG, TypeKind.ULONGLONG,
}
FUNCTIONS = {
    CursorKind.FUNCTION_DECL, CursorKind.CXX_METHOD, CursorKind.CONSTRUCTOR, CursorKind.DESTRUCTOR,
    CursorKind.CONVERSION_FUNCTION, CursorKind.FUNCTION_TEMPLATE,
}
CLASSES = {CursorKind.CLASS_DECL, CursorKind.STRUCT_DECL, CursorKind.CLASS_TEMPLATE}


class Source:
    """A file's text, addressed by byte offsets."""

    def __init__(self, root, path):
        self.root = root
        self.path = path
        self.content = (Path(root) / path).read_text(encoding="latin-1")
        self.line_starts = [0] + [match.end() for match in re.finditer("\n", self.content)]

    def text(self, start, end):
        return self.content[start:end]

    def line(self, offset):
        return bisect.bisect_right(self.line_starts, offset)

    def position(self, offset):
        line = self.line(offset)
        return line, offset - self.line_starts[line - 1] + 1


def parse(root, path):
    unit = Index.create().parse(str(Path(root) / path), args=ARGUMENTS + [f"-I{root}"],
                                options=TranslationUnit.PARSE_DETAILED_PROCESSING_RECORD)
    errors = [str(note) for note in unit.diagnostics if note.severity >= 3]
    if errors:
        raise SystemExit("\n".join(errors))
    return unit


@functools.lru_cache(maxsize=None)
def below(root, name):
    path = str(Path(name).resolve())
    prefix = f"{root}/"
    return path[len(prefix):] if path.startswith(prefix) else ""


def path_of(cursor, root):
    """The path from the top of the repository, or "" for what lies elsewhere."""
    file = cursor.location.file
    return "" if file is None else below(root, file.name)


def range_of(cursor):
    return cursor.extent.start.offset, cursor.extent.end.offset


def key_of(cursor, root):
    """Tells a declaration from all others."""
    return path_of(cursor, root), cursor.location.offset


def core(cursor):
    """What is left without implicit conversions and parentheses."""
    while cursor.kind in (CursorKind.UNEXPOSED_EXPR, CursorKind.PAREN_EXPR):
        children = [child for child in cursor.get_children() if child.kind.is_expression()]
        if len(children) != 1:
            break
        cursor = children[0]
    return cursor


def is_bool(cursor):
    return cursor.type.get_canonical().kind == TypeKind.BOOL


def is_integer(cursor):
    return core(cursor).type.get_canonical().kind in INTEGERS


def is_pointer(cursor):
    return cursor.type.get_canonical().kind == TypeKind.POINTER


def operands(cursor):
    """Of a binary operator, overloaded or not: left, right, and the range of the operator. None when it's neither."""
    children = list(cursor.get_children())
    if cursor.kind == CursorKind.BINARY_OPERATOR and len(children) == 2:
        return children[0], children[1]
    if cursor.kind == CursorKind.CALL_EXPR and cursor.spelling.startswith("operator") and len(children) == 3:
        return children[0], children[2]
    return None


def operator(cursor, source):
    """The text of a binary operator, or ""."""
    sides = operands(cursor)
    if sides is None:
        return ""
    between = source.text(range_of(sides[0])[1], range_of(sides[1])[0])
    return re.sub(r"//[^\n]*", "", between).strip()


def is_array_bound(child, source):
    start, _ = range_of(child)
    return child.kind.is_expression() and source.content[:start].rstrip().endswith("[")


def constant_contexts(cursor, source):
    """The children of a cursor that have to be constant expressions."""
    children = list(cursor.get_children())
    if cursor.kind == CursorKind.CASE_STMT:
        return children[:1]
    if cursor.kind in (CursorKind.VAR_DECL, CursorKind.FIELD_DECL, CursorKind.PARM_DECL):
        return [child for child in children if is_array_bound(child, source)]
    if cursor.kind in (CursorKind.STATIC_ASSERT, CursorKind.ENUM_CONSTANT_DECL):
        return children
    return []


def constants_required(unit, root, sources):
    """The keys of the variables that constant expressions name, directly or through other constants."""
    found = set()

    def names(cursor):
        for child in [cursor, *cursor.walk_preorder()]:
            if child.kind == CursorKind.DECL_REF_EXPR and child.referenced.kind == CursorKind.VAR_DECL:
                key = key_of(child.referenced, root)
                if key not in found:
                    found.add(key)
                    names(child.referenced)

    def walk(cursor, source):
        for child in constant_contexts(cursor, source):
            names(child)
        for child in cursor.get_children():
            if child.kind == CursorKind.VAR_DECL and cursor.kind in CLASSES:
                found.add(key_of(child, root))
            walk(child, source)

    for cursor in unit.cursor.get_children():
        source = sources.get(path_of(cursor, root))
        if source is not None:
            walk(cursor, source)
    return found
