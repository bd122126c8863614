#!/usr/bin/env python3
"""Measures the library beside the least that it can cost and beside other tracers, in turns, and prints tables.

    run.py BUILD [--only NAME,...] [--rounds N] [--json FILE] [--into DOCUMENT] [--svg FILE]

BUILD is the build folder of the preset release. Every figure is the median over the rounds, and a ratio is the median of
the ratios within each round: whatever the machine's mood is, it meets all systems of a round. --into puts the tables
between two marker lines of a document, in the place of those of the same names; --svg draws what a record costs in each
system.
"""
import argparse
import json
import pathlib
import platform
import sys

import measurements
import picture
from tables import as_text, put_into


def main():
    parser = argparse.ArgumentParser(description=__doc__.splitlines()[0])
    parser.add_argument("build", type=pathlib.Path)
    parser.add_argument("--only", help="some of: " + ", ".join(measurements.ALL))
    parser.add_argument("--rounds", type=int, default=5)
    parser.add_argument("--json", type=pathlib.Path)
    parser.add_argument("--into", type=pathlib.Path)
    parser.add_argument("--svg", type=pathlib.Path)
    arguments = parser.parse_args()

    names = arguments.only.split(",") if arguments.only else list(measurements.ALL)
    unknown = [name for name in names if name not in measurements.ALL]
    if unknown:
        parser.error("no such measurement: " + ", ".join(unknown))

    tables = []
    for name in names:
        print(f"{name} ...", file=sys.stderr)
        for each in measurements.run(name, arguments.build, arguments.rounds):
            tables.append(each)
            print(as_text(each), flush=True)
    if arguments.json:
        machine = {"machine": platform.machine(), "kernel": platform.release(), "rounds": arguments.rounds}
        arguments.json.write_text(json.dumps(machine | {"tables": tables}, indent=1) + "\n", encoding="utf-8")
    if arguments.into:
        put_into(arguments.into, tables)
    if arguments.svg:
        arguments.svg.write_text(picture.draw(tables), encoding="utf-8")


main()
