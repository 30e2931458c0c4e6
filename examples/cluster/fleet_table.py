# SPDX-License-Identifier: Apache-2.0
"""Reads the table that decode.py leaves: one statistic of a whole fleet as a pandas data frame.

In a notebook: sys.path.append("…/examples/cluster"); from fleet_table import statistic
"""

import gzip
import json
import pathlib
import re
import sys
import zlib

import cloudpickle
import dask
import numpy
import pandas

# A capture's day and unit in its name: …/2026-11-23/…/UNIT.stats
USUAL_PATTERN = r"(?:.*/)?(?P<day>\d{4}-\d\d-\d\d)/(?:.*/)?(?P<unit>[^/.]+)[^/]*"
COLUMNS = ["source", "unit", "day", "key", "element", "value"]
PERCENTILES = [1, 25, 50, 75, 99]

# Workers of a cluster get the functions below by value; they need no copy of this file.
cloudpickle.register_pickle_by_value(sys.modules[__name__])


def unit_and_day(source, pattern):
    match = re.fullmatch(pattern, source)
    return (match["unit"], match["day"]) if match else (source.rsplit("/", 1)[-1].split(".")[0], "")


def records(document, name):
    """A document's records of a name. They hold no braces, so each is cut out without reading the others."""
    label = b'"name":%b,' % json.dumps(name).encode()
    at = document.find(label)
    while at >= 0:
        yield json.loads(document[document.rfind(b"{", 0, at) : document.find(b"}", at) + 1])
        at = document.find(label, at + 1)


def rows(part, name, pattern):
    """The values of a name in one file of the table."""
    found = []
    try:
        with gzip.open(part) as documents:
            for document in documents:
                for record in records(document, name):
                    source = json.loads(re.match(rb'\{"source":("(?:[^"\\]|\\.)*")', document)[1])
                    found += [(source, *unit_and_day(source, pattern), record["key"], element, value)
                              for element, value in enumerate(record["values"])]
    except (EOFError, OSError, zlib.error) as error:
        raise OSError(f"{part}: {error}") from error
    return found


def statistic(folder, name, pattern=USUAL_PATTERN):
    """A row for each value of a name, in the order of sources. Runs on the Dask client that is active, else on
    this machine's cores. Values are exact 64-bit numbers."""
    parts = sorted(pathlib.Path(folder).rglob("*.jsonl.gz"))
    found = dask.compute([dask.delayed(rows)(str(part), name, pattern) for part in parts])[0]
    frame = pandas.DataFrame([row for part in found for row in part], columns=COLUMNS)
    return frame.astype({"value": numpy.uint64}).sort_values(["source", "key", "element"], ignore_index=True)


def summary(frame):
    """Least and greatest values and percentiles (the least value that so many do not exceed), an element each."""

    def describe(group):
        values = numpy.sort(group["value"].to_numpy())
        ranks = {f"{p} %": values[-(-p * len(values) // 100) - 1] for p in PERCENTILES}
        greatest = group["source"][group["value"].idxmax()]
        return pandas.Series({"captures": len(values), "least": values[0], **ranks, "greatest": values[-1],
                              "greatest in": greatest}, dtype=object)

    return frame.groupby(["key", "element"]).apply(describe).reset_index()


def moved(frame, old, new):
    """How far each unit's value moved between the last captures of two days, the farthest first."""
    days = [frame[frame["day"] == day].groupby(["unit", "key", "element"])["value"].last() for day in (old, new)]
    both = pandas.concat(days, axis=1, keys=["old", "new"], join="inner").reset_index()
    both["delta"] = [int(b) - int(a) for a, b in zip(both["old"], both["new"])]
    farthest = both["delta"].map(abs).sort_values(ascending=False, kind="stable")
    return both.loc[farthest.index].reset_index(drop=True)
