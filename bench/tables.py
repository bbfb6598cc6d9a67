"""Tables that read well in a terminal and are Markdown as well."""


def table(headings, rows):
    cells = [headings] + [[str(cell) for cell in row] for row in rows]
    widths = [max(len(row[i]) for row in cells) for i in range(len(headings))]

    def line(row):
        first = row[0].ljust(widths[0])
        others = [cell.rjust(width) for cell, width in zip(row[1:], widths[1:])]
        return "| " + " | ".join([first] + others) + " |"

    rule = "|" + "-" * (widths[0] + 2) + "|" + "|".join("-" * (width + 1) + ":" for width in widths[1:]) + "|"
    return "\n".join([line(cells[0]), rule] + [line(row) for row in cells[1:]])


def number(value, digits=0):
    text = f"{value:,.{digits}f}"
    return text[1:] if text.startswith("-") and not any(digit in text for digit in "123456789") else text
