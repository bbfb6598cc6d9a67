"""Goes through the syntax tree of one file and collects its places."""

from clang.cindex import CursorKind as Kind

from expressions import Expressions
from model import Insert, Jump, Replace, Statement, Use
from syntax import (CLASSES, FUNCTIONS, constant_contexts, core, is_bool, is_pointer, key_of, operands, operator,
                    range_of)

# Calls whose order among each other nobody can see.
SILENT = {"SetError", "RecordError", "syslog"}


class Walker:
    def __init__(self, places, root, macros, required):
        self.places = places
        self.source = places.source
        self.root = root
        self.macros = macros  # ranges of macro calls
        self.required = required  # keys of the variables that have to stay constant expressions
        self.expressions = Expressions(places)
        self.idle_breaks = set()  # ranges of breaks that would be reached all the same
        self.follows = False  # whether something in the function comes after the statement at hand
        self.names = []

    def visit(self, cursor, inside_bool=False):
        """`inside_bool`: the value is an operand of something that the caller has turned already, or is dropped."""
        start, end = range_of(cursor)
        if start == end:
            return
        if cursor.kind.is_expression():
            if (start, end) in self.macros:
                self.expressions.macro(cursor)
            else:
                self.expression(cursor, inside_bool)
            return
        handler = {
            Kind.COMPOUND_STMT: self.block, Kind.IF_STMT: self.branch, Kind.WHILE_STMT: self.branch,
            Kind.DO_STMT: self.do_loop, Kind.FOR_STMT: self.for_loop, Kind.CXX_FOR_RANGE_STMT: self.range_loop,
            Kind.RETURN_STMT: self.leave, Kind.SWITCH_STMT: self.switch, Kind.CASE_STMT: self.label, Kind.DEFAULT_STMT: self.label,
            Kind.VAR_DECL: self.variable, Kind.FIELD_DECL: self.variable, Kind.PARM_DECL: self.variable,
            Kind.NAMESPACE: self.scope,
        }.get(cursor.kind)
        if cursor.kind in FUNCTIONS:
            self.function(cursor)
        elif cursor.kind in CLASSES:
            self.scope(cursor)
        elif handler is not None:
            handler(cursor)
        elif cursor.kind not in (Kind.STATIC_ASSERT, Kind.ENUM_DECL, Kind.TEMPLATE_NON_TYPE_PARAMETER):
            self.children(cursor)

    def children(self, cursor, inside_bool=False):
        for child in cursor.get_children():
            self.visit(child, inside_bool)

    # ---- declarations ----

    def scope(self, cursor):
        self.named(cursor, self.children)

    def named(self, cursor, action):
        outer = self.names
        parent = cursor.semantic_parent
        written_outside = parent.kind in CLASSES and parent.spelling not in outer
        self.names = outer + ([parent.spelling] if written_outside else []) + [cursor.spelling]
        self.expressions.function = "::".join(name for name in self.names if name)
        action(cursor)
        self.names = outer
        self.expressions.function = "::".join(name for name in outer if name)

    def function(self, cursor):
        self.follows = False
        self.named(cursor, self.children)
        self.not_constexpr(cursor, "inline")

    def variable(self, cursor):
        constants = [range_of(child) for child in constant_contexts(cursor, self.source)]
        at_file_level = cursor.kind == Kind.VAR_DECL and cursor.semantic_parent.kind not in FUNCTIONS
        stays = at_file_level and key_of(cursor, self.root) in self.required

        def initialiser(declaration):
            for child in declaration.get_children():
                if range_of(child) in constants or stays:
                    self.expressions.constant_expression(child)
                else:
                    self.visit(child)

        if not at_file_level:
            initialiser(cursor)
            return
        before = len(self.places.mutants)
        self.named(cursor, initialiser)
        if len(self.places.mutants) > before and not stays:
            self.places.variables[key_of(cursor, self.root)] = range_of(cursor)
            self.not_constexpr(cursor, "static")

    def not_constexpr(self, cursor, instead):
        start, _ = range_of(cursor)
        head = self.source.text(start, cursor.location.offset)
        if "constexpr" in head:
            at = start + head.index("constexpr")
            self.places.add(Replace(at, at + len("constexpr"), instead))

    # ---- statements ----

    def block(self, cursor):
        statements = list(cursor.get_children())
        outer = self.follows
        made = []
        for index, statement in enumerate(statements):
            self.follows = outer or index + 1 < len(statements)
            made.append(self.statement(statement, index))
        for first, second, place, following in zip(statements, statements[1:], made, made[1:]):
            if place and following and self.order_shows(first, second):
                mutant = self.places.mutant("order", self.expressions.function, place.start,
                                            self.source.text(place.start, following.end),
                                            self.source.text(following.start, following.end) + "; " +
                                            self.source.text(place.start, place.end))
                place.swapped_with_next = following.swapped_with_previous = mutant
                following.previous = (place.start, place.end)
        self.follows = outer

    def statement(self, cursor, index=0):
        """A statement of a block; gives the place of an expression statement."""
        start, end = range_of(cursor)
        if cursor.kind in (Kind.BREAK_STMT, Kind.CONTINUE_STMT) or (
                cursor.kind == Kind.RETURN_STMT and (index > 0 or not list(cursor.get_children()))):
            # A lone return of a value is left out by the mutants of its condition.
            if self.follows and (start, end) not in self.idle_breaks:
                self.places.add(Jump(start, end, self.removal(start, end)))
        if not cursor.kind.is_expression() or (start, end) in self.macros:
            self.visit(cursor)
            return None
        place = Statement(start, end, self.removal(start, end))
        self.places.add(place)
        self.visit(cursor, inside_bool=True)
        return place

    def removal(self, start, end):
        return self.places.mutant("removal", self.expressions.function, start, self.source.text(start, end), "")

    def order_shows(self, first, second):
        def name(cursor):
            return core(cursor).spelling

        def assigns(cursor):
            return name(cursor) == "operator=" or operator(core(cursor), self.source) == "="

        return not (assigns(first) and assigns(second)) and not {name(first), name(second)} <= SILENT

    def branch(self, cursor):
        """An if or a while."""
        children = list(cursor.get_children())
        if children[0].kind == Kind.VAR_DECL:
            self.declared_condition(children[0], cursor.kind == Kind.IF_STMT)
            bodies = children[2:]
        else:
            self.condition(children[0])
            bodies = children[1:]
        for body in bodies:
            self.body(body, cursor.kind == Kind.WHILE_STMT)

    def body(self, cursor, is_loop):
        outer = self.follows
        self.follows = outer or is_loop
        self.visit(cursor)
        self.follows = outer

    def declared_condition(self, declaration, is_if):
        """`if (T* name = value)`: the variable has to stay."""
        self.visit(declaration)
        if not is_pointer(declaration):
            return
        value = list(declaration.get_children())[-1]
        start, end = range_of(value)
        self.places.choose("condition", self.expressions.function, start, end, "nullptr")
        if is_if:
            mutant = self.places.mutant("condition", self.expressions.function, range_of(declaration)[0],
                                        self.source.text(*range_of(declaration)), "true")
            self.places.add(Insert(start, end, f"; mutant::On({{}}) || {declaration.spelling}", mutant))

    def do_loop(self, cursor):
        body, condition = cursor.get_children()
        self.body(body, is_loop=True)
        self.condition(condition)

    def for_loop(self, cursor):
        first, condition, step, body = cursor.get_children()
        self.visit(first)
        self.condition(condition)
        self.visit(step, inside_bool=True)
        self.body(body, is_loop=True)

    def range_loop(self, cursor):
        _, values, body = cursor.get_children()
        self.visit(values)
        self.body(body, is_loop=True)

    def leave(self, cursor):
        for value in cursor.get_children():
            self.expressions.returned.add(range_of(core(value)))
            if is_bool(value):
                self.expressions.truth(value, "return")
            self.visit(value, inside_bool=True)

    def switch(self, cursor):
        value, body = cursor.get_children()
        self.visit(value)
        statements = list(body.get_children())
        for statement, following in zip(statements, statements[1:] + [None]):
            last = labelled(statement)
            if last.kind == Kind.BREAK_STMT and (following is None or labelled(following).kind == Kind.BREAK_STMT):
                self.idle_breaks.add(range_of(last))
        self.visit(body)

    def label(self, cursor):
        constants = [range_of(child) for child in constant_contexts(cursor, self.source)]
        for child in cursor.get_children():
            if range_of(child) in constants:
                self.expressions.constant_expression(child)
            else:
                self.statement(child)

    # ---- expressions ----

    def condition(self, cursor):
        self.expressions.truth(cursor, negated=True)
        self.visit(cursor, inside_bool=True)

    def expression(self, cursor, inside_bool):
        named_variable = cursor.kind in (Kind.DECL_REF_EXPR, Kind.MEMBER_REF_EXPR)
        if is_bool(cursor) and not inside_bool and not named_variable:
            self.expressions.truth(cursor)
        inside = is_bool(cursor)
        sides = operands(cursor)
        if sides is not None:
            self.operation(cursor, *sides)
        elif cursor.kind == Kind.CONDITIONAL_OPERATOR:
            condition, *others = cursor.get_children()
            self.condition(condition)
            for other in others:
                self.visit(other, inside)
        elif cursor.kind == Kind.CALL_EXPR:
            self.call(cursor)
        else:
            self.leaf_or_children(cursor, inside or (inside_bool and cursor.kind == Kind.UNEXPOSED_EXPR))

    def operation(self, cursor, left, right):
        self.expressions.binary(cursor)
        what = operator(cursor, self.source)
        if what in ("&&", "||"):
            self.condition(left)
            self.condition(right)
        else:
            self.visit(left, inside_bool=True)
            self.visit(right, inside_bool=what != "=")

    def call(self, cursor):
        for child in cursor.get_children():
            inside = core(child)
            if inside.kind == Kind.CXX_UNARY_EXPR and self.source.text(*range_of(inside)).startswith("sizeof"):
                self.expressions.size(inside)
            else:
                self.visit(child)

    def leaf_or_children(self, cursor, inside_bool):
        text = self.source.text(*range_of(cursor))
        if cursor.kind == Kind.INTEGER_LITERAL:
            self.expressions.integer(cursor)
        elif cursor.kind == Kind.UNARY_OPERATOR and text.startswith("-") and \
                core(next(cursor.get_children())).kind == Kind.INTEGER_LITERAL:
            self.expressions.integer(cursor, sign=-1)
        elif cursor.kind == Kind.CXX_BOOL_LITERAL_EXPR:
            self.expressions.boolean(cursor)
        elif cursor.kind == Kind.CHARACTER_LITERAL:
            self.expressions.character(cursor)
        elif cursor.kind == Kind.STRING_LITERAL:
            self.expressions.string(cursor)
        elif cursor.kind == Kind.CXX_UNARY_EXPR and text.startswith("sizeof"):
            pass
        elif cursor.kind == Kind.DECL_REF_EXPR:
            self.use(cursor)
        else:
            if cursor.kind == Kind.CXX_STATIC_CAST_EXPR:
                self.expressions.enumerators(cursor)
            self.children(cursor, inside_bool)

    def use(self, cursor):
        variable = cursor.referenced
        if variable is None or variable.kind != Kind.VAR_DECL or variable.semantic_parent.kind in FUNCTIONS:
            return
        start, end = range_of(cursor)
        if self.source.text(start, end).endswith(variable.spelling):
            self.places.add(Use(start, end, key_of(variable, self.root)))


def labelled(statement):
    """The statement behind labels of a switch."""
    while statement.kind in (Kind.CASE_STMT, Kind.DEFAULT_STMT):
        *_, statement = statement.get_children()
    return statement
