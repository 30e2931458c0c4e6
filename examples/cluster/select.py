#!/usr/bin/python3
# SPDX-License-Identifier: Apache-2.0
"""Shows one statistic of a whole fleet from the table that decode.py leaves: its least and greatest values and
percentiles, every value, or the units whose value moved most between two days.

A capture's unit and day come from its name, …/2026-11-23/…/UNIT.stats, or what --pattern says.
"""

import sys

# Behind all others in the path: the standard library has a module with the name of this program.
sys.path.append(sys.path.pop(0))

import argparse
import pathlib
import re
import signal

import dask

import fleet_table


def complain(message, status):
    print(f"select.py: {message}", file=sys.stderr)
    sys.exit(status)


def pattern(text):
    try:
        groups = re.compile(text).groupindex
    except re.error as error:
        raise argparse.ArgumentTypeError(f"{text}: {error}") from error
    if not {"unit", "day"} <= groups.keys():
        raise argparse.ArgumentTypeError(f"{text}: lacks the groups (?P<unit>…) and (?P<day>…)")
    return text


def cluster(scheduler, files):
    if scheduler is None:
        # A few files are read before other processes have started.
        return dask.config.set(scheduler="processes" if files > 4 else "sync")
    import distributed  # takes long to load

    return distributed.Client(scheduler, timeout=10)


def main():
    parser = argparse.ArgumentParser(description=__doc__, formatter_class=argparse.RawDescriptionHelpFormatter)
    parser.add_argument("folder", metavar="FOLDER", type=pathlib.Path, help="the table's folder")
    parser.add_argument("name", metavar="NAME", help="a record's name, as hostWrites")
    what = parser.add_mutually_exclusive_group()
    what.add_argument("--all", action="store_true", help="every value, in the order of captures")
    what.add_argument("--moved", nargs=2, metavar=("OLD", "NEW"), help="units that moved most between these days")
    parser.add_argument("--top", type=int, metavar="N", help="the first N rows (10 with --moved, else all)")
    parser.add_argument("--csv", action="store_true", help="CSV instead of a table")
    parser.add_argument("--pattern", type=pattern, default=fleet_table.USUAL_PATTERN, metavar="REGEX",
                        help="matches a whole source; its groups unit and day name the unit and the day")
    parser.add_argument("--scheduler", metavar="ADDRESS", help="read the table on this cluster (on this machine)")
    arguments = parser.parse_args()
    signal.signal(signal.SIGPIPE, signal.SIG_DFL)
    folder = arguments.folder.absolute()
    files = sum(1 for _ in folder.rglob("*.jsonl.gz"))
    if not files:
        complain(f"{folder}: no table of decode.py", 2)
    try:
        with cluster(arguments.scheduler, files):
            frame = fleet_table.statistic(folder, arguments.name, arguments.pattern)
    except (OSError, ValueError) as error:
        complain(error, 3)
    if frame.empty:
        complain(f"{folder}: no capture has a record {arguments.name}", 1)
    if arguments.moved:
        for day in set(arguments.moved) - set(frame["day"]):
            complain(f"no capture is of {day}; there are {', '.join(sorted(set(frame['day']))) or 'no days'}", 1)
        frame = fleet_table.moved(frame, *arguments.moved).head(arguments.top or 10)
    else:
        frame = (frame if arguments.all else fleet_table.summary(frame)).head(arguments.top or len(frame))
    print(frame.to_csv(index=False) if arguments.csv else frame.to_string(index=False) + "\n", end="")


if __name__ == "__main__":
    main()
