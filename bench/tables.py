"""Tables as text: columns of a name and of figures."""
import re

BEGIN = "<!-- measured: begin -->"
END = "<!-- measured: end -->"


def table(name, title, columns, rows, note=""):
    """A table; its rows are lists as long as its columns."""
    return {"name": name, "title": title, "columns": columns, "rows": rows, "note": note}


def as_figure(value):
    if value is None:
        return ""
    if isinstance(value, str):
        return value
    if isinstance(value, int):
        return f"{value:,}".replace(",", " ")
    return f"{value:.2f}" if abs(value) < 10 else f"{value:,.0f}".replace(",", " ")


def as_text(of):
    """Markdown that is readable as it stands."""
    cells = [of["columns"]] + [[as_figure(value) for value in row] for row in of["rows"]]
    widths = [max(len(row[column]) for row in cells) for column in range(len(of["columns"]))]
    numeric = [all(not isinstance(row[column], str) for row in of["rows"]) for column in range(len(widths))]

    def line(row):
        return "| " + " | ".join(cell.rjust(width) if right else cell.ljust(width)
                                 for cell, width, right in zip(row, widths, numeric)) + " |"

    rule = "| " + " | ".join("-" * (width - 1) + ":" if right else "-" * width
                             for width, right in zip(widths, numeric)) + " |"
    lines = [f"### {of['title']}", "", line(cells[0]), rule] + [line(row) for row in cells[1:]]
    if of["note"]:
        lines += ["", of["note"]]
    return "\n".join(lines) + "\n"


def put_into(document, tables):
    """Puts tables between the two lines of a document; those of other names stay there as they are."""
    head, rest = document.read_text(encoding="utf-8").split(BEGIN)
    measured, tail = rest.split(END)
    texts = {text.split("\n", 1)[0]: text.rstrip() + "\n" for text in re.split(r"^(?=### )", measured, flags=re.M)[1:]}
    texts |= {f"### {each['title']}": as_text(each) for each in tables}
    text = "\n".join(texts.values())
    document.write_text(f"{head}{BEGIN}\n\n{text}\n{END}{tail}", encoding="utf-8")
