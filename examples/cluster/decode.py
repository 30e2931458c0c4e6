#!/usr/bin/python3
# SPDX-License-Identifier: Apache-2.0
"""Decodes a fleet's captures with kspdump on a Dask cluster and leaves a table of JSON documents.

Sources and the table's folder must have the same names on this machine and on the workers. The table is
FOLDER/*.jsonl.gz, a capture's document a line; what is wrong with captures stands in FOLDER/findings.jsonl.
Started again, it decodes only what the table lacks.

Exit status: 0 all is decoded and sound, 1 with findings, 2 the command line is wrong, 3 a capture cannot be
read, 4 captures are missing from the table: start it again.
"""

import sys

# select.py beside this program must not stand before the standard library's module of that name.
sys.path.append(sys.path.pop(0))

import argparse
import collections
import contextlib
import fcntl
import gzip
import hashlib
import itertools
import json
import logging
import os
import pathlib
import queue
import re
import signal
import stat
import subprocess
import tempfile
import uuid

import distributed
import tqdm

PART_CAPTURES = 200
PART_BYTES = 16 << 20
PARTS_IN_FLIGHT = 1000
COMPRESSION = 1  # the table is 15 % larger than with the usual 6, in a third of the time
CLEAN, FINDINGS, USAGE, UNREADABLE, INCOMPLETE = range(5)


class Failure(Exception):
    """Ends the program with a message and a status."""

    def __init__(self, message, status=INCOMPLETE):
        super().__init__(message)
        self.status = status


class Crash(Exception):
    """kspdump did not end by itself; the fault may be a capture's."""


# What workers do. Dask sends these functions to them by value, so they need no copy of this program.


@contextlib.contextmanager
def whole_file(path):
    """A file to write that takes its name only when it is complete and on the disk."""
    with tempfile.NamedTemporaryFile(dir=path.parent, prefix=".unfinished-", delete=False) as file:
        try:
            yield file
            file.flush()
            os.fsync(file.fileno())
            os.chmod(file.name, 0o644)
            os.replace(file.name, path)
        except BaseException:
            with contextlib.suppress(FileNotFoundError):
                os.unlink(file.name)
            raise


def spelled(path):
    """A file's name as documents have it: bytes that are not UTF-8 are spelled out."""
    return os.fsencode(path).decode("utf-8", "backslashreplace")


def digest(line):
    """A document's source and, if it has findings, all of it but its records."""
    head = re.match(rb'\{"source":("(?:[^"\\]|\\.)*"),', line)
    if head and line.endswith(b',"findings":[]}\n'):
        return json.loads(head[1]), None
    document = json.loads(line)
    source = document["source"]
    del document["records"]
    return source, document if document["findings"] else None


def run_kspdump(command, take):
    """Hands each line that kspdump prints to `take`. Returns why what cannot be read cannot be, by source."""
    with tempfile.TemporaryFile() as complaints:
        with subprocess.Popen(command, stdin=subprocess.DEVNULL, stdout=subprocess.PIPE, stderr=complaints) as program:
            for line in program.stdout:
                take(line)
        complaints.seek(0)
        said = complaints.read().decode("utf-8", "backslashreplace")
    if program.returncode < 0:
        raise Crash(f"kspdump was ended by signal {-program.returncode}")
    if program.returncode not in (CLEAN, FINDINGS, UNREADABLE):
        raise RuntimeError(f"{command[:2]} ended with {program.returncode}: {said.strip()[:200]}")
    return dict(re.findall(r"^kspdump: (.*): cannot be read: (.*)$", said, re.MULTILINE))


def owner(source, inputs):
    """Whose capture it is: an archive's own name stands before its members'."""
    for name in itertools.accumulate(source.split("/"), "{}/{}".format):
        if name in inputs:
            return name
    return None


def decode_batch(inputs, kind, kspdump, file, tally):
    """Appends the documents of some inputs to a file and its tally. Returns why inputs cannot be read."""
    inputs = {spelled(path): (path, *rest) for path, *rest in inputs}
    held = {source: collections.Counter() for source in inputs}

    def identify(line):
        document = json.loads(line)
        source = owner(document["source"], inputs)
        if source is None:
            raise ValueError(f"kspdump identifies {document['source']}, which nobody asked for")
        # What is named is decoded, whatever it looks like; what is found is decoded if it is of the kind.
        is_named = source == document["source"] and not inputs[source][-1]
        held[source][kind if is_named else document["kind"]] += 1

    run_kspdump([kspdump, "identify", "--format", "json", *(path for path, *_ in inputs.values())], identify)
    delivered, findings = collections.Counter(), []

    def deliver(line):
        packed.write(line)
        source, finding = digest(line)
        delivered[owner(source, inputs)] += 1
        if finding:
            findings.append(finding)

    wanted = [inputs[source][0] for source, kinds in held.items() if kinds[kind] or not kinds]
    begin = file.tell()
    try:
        with gzip.GzipFile("", "wb", COMPRESSION, file, mtime=0) as packed:
            command = [kspdump, kind, "--jobs", "1", "--format", "json", *wanted]
            reasons = run_kspdump(command, deliver) if wanted else {}
    except Crash:
        file.seek(begin)
        file.truncate()
        raise
    for source, kinds in held.items():
        if kinds[kind] != delivered[source]:
            raise ValueError(f"{source}: {kinds[kind]} captures in, {delivered[source]} documents out")
    tally["documents"] += delivered.total()
    tally["inputs"] += [[*inputs[source], kinds[kind]] for source, kinds in held.items() if kinds]
    tally["findings"] += findings
    unreadable, nameless = {}, []
    for source, reason in reasons.items():
        where = owner(source, inputs)
        if where is None:
            nameless.append(reason)
        elif held[where]:
            tally["findings"].append({"source": source, "kind": kind, "unreadable": reason})
        else:
            unreadable[inputs[where][0]] = reason if source == where else f"{source}: {reason}"
    # A name with control characters is spelled otherwise in a message; messages keep the order of inputs.
    silent = [path for source, (path, *_) in inputs.items() if not held[source] and path not in unreadable]
    unreadable.update(zip(silent, nameless))
    return unreadable


def decode_part(name, inputs, kind, folder, kspdump):
    """Makes one file of the table from some inputs: path, bytes, time of change and whether it was found in a
    folder. Returns the file's tally, which also stands beside the table, and why inputs cannot be read."""
    part, record = pathlib.Path(folder, f"{name}.jsonl.gz"), pathlib.Path(folder, "_parts", f"{name}.json")
    unreadable = {}
    tally = {"kind": kind, "documents": 0, "inputs": [], "findings": []}
    with whole_file(part) as file:
        try:
            unreadable |= decode_batch(inputs, kind, kspdump, file, tally)
        except Crash:
            for each in inputs:
                try:
                    unreadable |= decode_batch([each], kind, kspdump, file, tally)
                except Crash as crash:
                    unreadable[each[0]] = str(crash)
        tally["bytes"] = file.tell()
        with whole_file(record) as tallied:
            tallied.write(json.dumps(tally).encode())
    if not tally["documents"]:
        part.unlink()
        record.unlink()
    return tally, unreadable


def examine_worker(kspdump, folder, run):
    """What the worker's kspdump says that it is, and what the worker lacks."""
    try:
        if pathlib.Path(folder, "_parts", "lock").read_text() != run:
            raise OSError(f"{folder} is another folder there")
        version = subprocess.run([kspdump, "--version"], capture_output=True, text=True, check=True)
        return version.stdout.strip(), None
    except (OSError, subprocess.CalledProcessError) as error:
        return None, str(error)


# What this machine does.


def list_inputs(sources, lists, table):
    """All files that are named, or stand below the folders that are named but not below the table's: path,
    bytes, time of change and whether it was found in a folder. Then why others cannot be read, and how many
    are no files at all."""
    found, unreadable, others = {}, {}, 0
    for path in lists:
        try:
            with open(path, "rb") if path != "-" else contextlib.nullcontext(sys.stdin.buffer) as names:
                sources = [*sources, *map(os.fsdecode, filter(None, names.read().split(b"\0")))]
        except OSError as error:
            raise Failure(f"{path}: {error.strerror}", USAGE) from error
    for source in map(os.path.abspath, sources):
        if not os.path.isdir(source):
            found[source] = False
            continue
        for folder, folders, files in os.walk(source, onerror=lambda e: unreadable.update({e.filename: e.strerror})):
            folders[:] = [each for each in folders if os.path.join(folder, each) != table]
            for path in (os.path.join(folder, file) for file in files):
                found.setdefault(path, True)
    inputs = []
    for path, is_found in sorted(found.items()):
        try:
            status = os.lstat(path) if is_found else os.stat(path)
        except OSError as error:
            unreadable[path] = error.strerror
            continue
        if stat.S_ISREG(status.st_mode):
            inputs.append((path, status.st_size, status.st_mtime_ns, is_found))
        elif is_found:
            others += 1
        else:
            unreadable[path] = "no regular file"
    return inputs, unreadable, others


class Table:
    """The folder of parts, each of them a file of documents and its tally."""

    def __init__(self, folder, kind):
        self.folder, self.kind, self.tallies = folder, kind, {}
        try:
            (folder / "_parts").mkdir(parents=True, exist_ok=True)
            self.lock = open(folder / "_parts" / "lock", "a")
        except OSError as error:
            raise Failure(f"{error.filename}: {error.strerror}", USAGE) from error
        try:
            fcntl.flock(self.lock, fcntl.LOCK_EX | fcntl.LOCK_NB)
        except OSError as error:
            raise Failure(f"{folder}: another decode.py is at work here") from error
        self.run = uuid.uuid4().hex
        self.lock.truncate(0)
        print(self.run, end="", file=self.lock, flush=True)

    def read(self, inputs):
        """Reads the tallies of the parts that are there. A part goes, and what it held counts as missing, if
        a capture has changed since, or stands in another part too."""
        now = {path: [size, changed] for path, size, changed, _ in inputs}
        seen = set()
        self.sweep()
        for part in sorted(self.folder.glob("*.jsonl.gz")):
            name = part.name.removesuffix(".jsonl.gz")
            record = self.folder / "_parts" / f"{name}.json"
            try:
                tally = json.loads(record.read_bytes())
                is_whole = part.stat().st_size == tally["bytes"]
            except (OSError, ValueError) as error:
                raise Failure(f"{part}: not a part of this table, its tally cannot be read: {error}") from error
            if tally["kind"] != self.kind:
                raise Failure(f"{self.folder} holds {tally['kind']}; give {self.kind} a folder of its own", USAGE)
            paths = {path for path, *_, captures in tally["inputs"] if captures}
            has_changed = any(now.get(path, state) != state for path, *state, _, _ in tally["inputs"])
            if is_whole and not has_changed and not paths & seen:
                self.tallies[name] = tally
                seen |= paths
            else:
                part.unlink()
                record.unlink()

    def sweep(self):
        """Removes what workers that died have left unfinished."""
        for folder in (self.folder, self.folder / "_parts"):
            for left in folder.glob(".unfinished-*"):
                left.unlink(missing_ok=True)

    def captures(self):
        """How many captures each input held; none where it was passed over."""
        held = {}
        for tally in self.tallies.values():
            for path, *_, captures in tally["inputs"]:
                held[path] = max(captures, held.get(path, 0))
        return held

    def lacking(self):
        """Parts that workers say they have written, but that are not here like that or do not add up."""
        sizes = {entry.name: entry.stat().st_size for entry in os.scandir(self.folder)}
        return [name for name, tally in self.tallies.items()
                if tally["documents"] and sizes.get(f"{name}.jsonl.gz") != tally["bytes"]
                or tally["documents"] != sum(captures for *_, captures in tally["inputs"])]

    def write_findings(self, unreadable):
        lines = [each for tally in self.tallies.values() for each in tally["findings"]]
        lines += [{"source": spelled(path), "kind": self.kind, "unreadable": unreadable[path]} for path in unreadable]
        with whole_file(self.folder / "findings.jsonl") as file:
            for line in sorted(lines, key=lambda each: each["source"]):
                file.write(json.dumps(line, separators=(",", ":")).encode() + b"\n")
        return lines


def split(inputs, kind):
    """Parts of captures, and a name for each that depends on them alone."""
    parts, room = [], 0
    for each in inputs:
        if not parts or len(parts[-1]) == PART_CAPTURES or room < each[1]:
            parts.append([])
            room = PART_BYTES
        parts[-1].append(each)
        room -= each[1]
    return [(f"{kind}-{hashlib.sha256(json.dumps(part).encode()).hexdigest()[:20]}", part) for part in parts]


def connect(address, kspdump, table):
    """A client of the cluster, whose workers all have the same kspdump and see the table's folder."""
    logging.disable()  # what matters of it is said by this program
    where = {"scheduler_file": address} if os.path.isfile(address) else {"address": address}
    try:
        client = distributed.Client(**where, timeout=10)
        client.wait_for_workers(1, timeout=30)
        states = client.run(examine_worker, kspdump, str(table.folder), table.run)
    except (OSError, ValueError) as error:
        raise Failure(f"{address}: no scheduler answers: {error}") from error
    except distributed.TimeoutError as error:
        raise Failure(f"{address}: the cluster has no workers") from error
    if any(lack for _, lack in states.values()) or len(set(states.values())) > 1:
        lines = [f"\n  {worker}: {lack or version}" for worker, (version, lack) in sorted(states.items())]
        raise Failure("workers lack something, or differ:" + "".join(lines))
    return client


def work(client, parts, arguments, table, progress):
    """Has the parts decoded, not too many at a time. Returns what cannot be read, and what went wrong."""
    unreadable, wrong = {}, []
    done, flying = queue.SimpleQueue(), {}
    waiting = iter(parts)
    idle = 0

    # An exception would be lost where the signal arrives in a destructor.
    def interrupt(*_):
        signal.signal(signal.SIGINT, signal.default_int_handler)
        done.put(None)

    signal.signal(signal.SIGINT, interrupt)
    while True:
        while len(flying) < PARTS_IN_FLIGHT and (part := next(waiting, None)):
            name, inputs = part
            future = client.submit(decode_part, name, inputs, arguments.kind, str(table.folder),
                                   arguments.kspdump, key=f"{name}-{table.run}", retries=2)
            flying[future.key] = part
            future.add_done_callback(done.put)
        if not flying:
            return unreadable, wrong
        try:
            future = done.get(timeout=1)
        except queue.Empty:
            progress.refresh()
            idle = 0 if client.scheduler_info()["workers"] else idle + 1
            if client.status != "running" or idle > arguments.patience:
                break
            continue
        if future is None:
            raise KeyboardInterrupt
        if future.cancelled():
            break
        name, inputs = flying[future.key]
        try:
            table.tallies[name], reasons = future.result(timeout=5)
            unreadable |= reasons
        except Exception as error:  # whatever went wrong on a worker
            if future.status != "error":
                # The worker died with the result; another one makes it anew.
                future.add_done_callback(done.put)
                continue
            wrong.append(f"{name}, {len(inputs)} files from {inputs[0][0]} on: {error!r}")
        del flying[future.key]
        progress.update(len(inputs))
    wrong.append("no worker is left" if idle > arguments.patience else "the scheduler is gone")
    return unreadable, wrong


def decode(arguments):
    table = Table(pathlib.Path(arguments.into), arguments.kind)
    inputs, unreadable, others = list_inputs(arguments.sources, arguments.files0_from, arguments.into)
    table.read(inputs)
    before = table.captures()
    # What was passed over when it was found in a folder is wanted when it is named.
    missing = [each for each in inputs if each[0] not in before or not (before[each[0]] or each[-1])]
    wrong = []
    if missing:
        with connect(arguments.scheduler, arguments.kspdump, table) as client:
            with tqdm.tqdm(total=len(missing), unit=" files", disable=None) as progress:
                reasons, wrong = work(client, split(missing, arguments.kind), arguments, table, progress)
        unreadable |= reasons
    return report(table, inputs, others, len(missing), unreadable, wrong)


def report(table, inputs, others, tried, unreadable, wrong):
    """Says what was done and whether it adds up; returns the exit status."""
    table.sweep()
    for name in table.lacking():
        wrong.append(f"{name}.jsonl.gz is not here as a worker wrote it")
        del table.tallies[name]
    held = table.captures()
    unreadable = {path: reason for path, reason in unreadable.items() if not held.get(path)}
    asked = unreadable.keys() | {path for path, *_ in inputs}
    names = set(map(spelled, asked))
    findings = [line for line in table.write_findings(unreadable) if owner(line["source"], names)]
    lost = sum("unreadable" in line for line in findings)
    documents = sum(held.get(path, 0) for path in asked)
    passed_over = others + sum(held.get(path) == 0 for path in asked)
    missing = sum(path not in held and path not in unreadable for path in asked)
    before = len(inputs) - tried
    print(f"files          {len(asked) + others}, {before} of them done before, {passed_over} without {table.kind}")
    print(f"captures in    {documents + lost + missing}")
    print(f"documents out  {documents}, in {table.folder}")
    print(f"unreadable     {lost}, in {table.folder / 'findings.jsonl'}")
    print(f"with findings  {len(findings) - lost}, likewise")
    for line in wrong[:10]:
        print(f"decode.py: {line}", file=sys.stderr)
    if missing or wrong:
        print(f"decode.py: {missing} files are missing from the table; start it again", file=sys.stderr)
        return INCOMPLETE
    return UNREADABLE if lost else FINDINGS if findings else CLEAN


def main():
    parser = argparse.ArgumentParser(description=__doc__, formatter_class=argparse.RawDescriptionHelpFormatter)
    parser.add_argument("scheduler", metavar="SCHEDULER", help="address, as tcp://HOST:8786, or scheduler file")
    parser.add_argument("sources", metavar="SOURCE", nargs="*", help="capture, archive, or folder of either")
    parser.add_argument("--into", metavar="FOLDER", required=True, type=os.path.abspath, help="where the table is")
    parser.add_argument("--kind", required=True, choices=["stats", "media"])
    parser.add_argument("--files0-from", metavar="LIST", action="append", default=[],
                        help="file of further sources, each ended by a NUL; - is standard input")
    parser.add_argument("--kspdump", metavar="PATH", default="kspdump", help="the workers' kspdump (from their PATH)")
    parser.add_argument("--patience", metavar="SECONDS", type=int, default=60,
                        help="how long to wait for a worker when none is left (%(default)s)")
    arguments = parser.parse_args()
    if not arguments.sources and not arguments.files0_from:
        parser.error("no SOURCE")
    try:
        sys.exit(decode(arguments))
    except Failure as failure:
        print(f"decode.py: {failure}", file=sys.stderr)
        sys.exit(failure.status)
    except KeyboardInterrupt:
        print("decode.py: interrupted; started again, it goes on from here", file=sys.stderr)
        sys.exit(130)


if __name__ == "__main__":
    main()
