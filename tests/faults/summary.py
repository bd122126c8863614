#!/usr/bin/env python3
"""Sums the figures of a fault campaign, prints its table, and writes it into a document.

    summary.py DOCUMENT BUILD...

Each BUILD folder holds campaign.jsonl, the figures that the tests counted, and campaign.xml, how they ended. What was
found and mended is in findings.txt beside this program; the first BUILD shows how much. In DOCUMENT the table stands
between two marker lines.
"""
import collections
import json
import os
import sys
import xml.etree.ElementTree

BEGIN = "<!-- campaign: begin -->"
END = "<!-- campaign: end -->"
HEADINGS = ["Attack", "Build", "Rounds", "Faults injected", "Executions", "Findings mended", "Failed tests"]
FIGURES = ["rounds", "faults", "executions"]


def read_figures(folder):
    """The items of the figures in order, their sums, and which item each test belongs to."""
    sums, item_of = {}, {}
    name = os.path.join(folder, "campaign.jsonl")
    if os.path.exists(name):
        with open(name, encoding="utf-8") as lines:
            for line in map(json.loads, lines):
                figures = sums.setdefault(line["item"], dict.fromkeys(FIGURES, 0))
                figures[line["what"]] += line["number"]
                item_of[line["test"]] = line["item"]
    return sums, item_of


def read_findings():
    """How many findings each attack has."""
    name = os.path.join(os.path.dirname(os.path.abspath(__file__)), "findings.txt")
    with open(name, encoding="utf-8") as lines:
        return collections.Counter(line.split(": ")[0] for line in lines if not line.startswith("#"))


def failed_tests(folder):
    name = os.path.join(folder, "campaign.xml")
    if not os.path.exists(name):
        return ["(the campaign did not run)"]
    cases = xml.etree.ElementTree.parse(name).getroot().iter("testcase")
    return [case.get("name") for case in cases if case.get("status") == "fail"]


def rows_of(folder, findings):
    build = os.path.basename(os.path.normpath(folder))
    sums, item_of = read_figures(folder)
    failed = dict.fromkeys(sums, 0)
    for test in failed_tests(folder):
        # A test that died before it counted anything gets a row of its own.
        item = item_of.get(test, test)
        failed[item] = failed.get(item, 0) + 1
    for item in sorted(failed):
        figures = sums.get(item, dict.fromkeys(FIGURES, 0))
        yield ([item, build] + [f"{figures[what]:,}".replace(",", " ") for what in FIGURES] +
               [str(findings[item]) if findings else "", str(failed[item])])
    unknown = findings.keys() - failed.keys()
    if unknown:
        sys.exit("findings of attacks that did not take place: " + ", ".join(sorted(unknown)))


def as_table(rows):
    widths = [max(len(row[column]) for row in rows) for column in range(len(HEADINGS))]

    def line(cells):
        aligned = [cell.ljust(width) if column < 2 else cell.rjust(width)
                   for column, (cell, width) in enumerate(zip(cells, widths))]
        return "| " + " | ".join(aligned) + " |"

    rule = "| " + " | ".join("-" * width if column < 2 else "-" * (width - 1) + ":"
                             for column, width in enumerate(widths)) + " |"
    return "\n".join([line(rows[0]), rule] + [line(row) for row in rows[1:]])


def put_into(document, table):
    with open(document, encoding="utf-8") as file:
        text = file.read()
    head, rest = text.split(BEGIN)
    tail = rest.split(END)[1]
    with open(document, "w", encoding="utf-8") as file:
        file.write(f"{head}{BEGIN}\n{table}\n{END}{tail}")


def main():
    document, *folders = sys.argv[1:]
    rows = list(rows_of(folders[0], read_findings()))
    for folder in folders[1:]:
        rows += rows_of(folder, {})
    table = as_table([HEADINGS] + rows)
    print(table)
    put_into(document, table)


main()
