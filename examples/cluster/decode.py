#!/usr/bin/python3
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
import json
import logging
import os
import pathlib
import queue
import re
import stat
import subprocess
import tempfile
import uuid

import distributed
import tqdm

PART_CAPTURES = 200
PART_BYTES = 64 << 20
PARTS_IN_FLIGHT = 1000
COMPRESSION = 1  # the table is 15 % larger than with the usual 6, in a third of the time
CLEAN, FINDINGS, USAGE, UNREADABLE, INCOMPLETE = range(5)


class Failure(Exception):
    """Ends the program with a message and a status."""

    def __init__(self, message, status=INCOMPLETE):
        super().__init__(message)
        self.status = status


class Crash(Exception):
    """kspdump ended otherwise than by an exit status of its own."""


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


def run_kspdump(kspdump, kind, paths, file):
    """Appends the captures' documents to a file, compressed. Returns the sources and the documents with
    findings, without their records; and what kspdump says of those that it cannot read."""
    begin = file.tell()
    sources, findings = [], []
    command = [kspdump, kind, "--jobs", "1", "--format", "json", *paths]
    with tempfile.TemporaryFile() as complaints:
        with subprocess.Popen(command, stdout=subprocess.PIPE, stderr=complaints) as program:
            with gzip.GzipFile("", "wb", COMPRESSION, file, mtime=0) as packed:
                for line in program.stdout:
                    if not line.endswith(b"\n"):
                        break
                    packed.write(line)
                    source, finding = digest(line)
                    sources.append(source)
                    if finding:
                        findings.append(finding)
        complaints.seek(0)
        said = complaints.read().decode("utf-8", "backslashreplace")
    if program.returncode not in (CLEAN, FINDINGS, UNREADABLE):
        file.seek(begin)
        file.truncate()
        raise Crash(f"{kspdump} ended with {program.returncode}: {said.strip()[-200:]}")
    return sources, findings, dict(re.findall(r"^kspdump: (.*): cannot be read: (.*)$", said, re.MULTILINE))


def decode_part(name, inputs, kind, folder, kspdump):
    """Makes one file of the table from some captures: inputs of path, bytes and time of change. Returns why
    some cannot be read, by path, and the file's tally, which also stands beside the table."""
    folder = pathlib.Path(folder)
    unreadable, delivered, findings, documents = {}, [], [], 0
    with whole_file(folder / f"{name}.jsonl.gz") as file:
        batches = [inputs]
        while batches:
            batch = batches.pop(0)
            try:
                sources, wrong, reasons = run_kspdump(kspdump, kind, [each[0] for each in batch], file)
            except Crash as crash:
                if len(batch) == 1:
                    unreadable[batch[0][0]] = str(crash)
                batches += [[each] for each in batch] if len(batch) > 1 else []
                continue
            documents += len(sources)
            findings += wrong
            count = collections.Counter(sources)
            delivered += [[*each, count[spelled(each[0])]] for each in batch if count[spelled(each[0])]]
            silent = [each[0] for each in batch if not count[spelled(each[0])]]
            if len(silent) == len(reasons):
                unreadable |= {path: reasons.get(spelled(path), "kspdump cannot read it") for path in silent}
        tally = {"kind": kind, "documents": documents, "bytes": file.tell(), "inputs": delivered,
                 "findings": findings}
        with whole_file(folder / "_parts" / f"{name}.json") as record:
            record.write(json.dumps(tally).encode())
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


def list_captures(sources, lists, table):
    """All files that are named or stand below the folders that are named, but not below the table's, with size
    and time of change; and what cannot be read."""
    paths, unreadable = set(), {}
    for path in lists:
        try:
            with open(path, "rb") if path != "-" else contextlib.nullcontext(sys.stdin.buffer) as names:
                sources = [*sources, *map(os.fsdecode, filter(None, names.read().split(b"\0")))]
        except OSError as error:
            raise Failure(f"{path}: {error.strerror}", USAGE) from error
    for source in map(os.path.abspath, sources):
        if not os.path.isdir(source):
            paths.add(source)
            continue
        for folder, folders, files in os.walk(source, onerror=lambda e: unreadable.update({e.filename: e.strerror})):
            folders[:] = [each for each in folders if os.path.join(folder, each) != table]
            paths.update(os.path.join(folder, file) for file in files)
    inputs = []
    for path in sorted(paths):
        try:
            status = os.stat(path)
        except OSError as error:
            unreadable[path] = error.strerror
            continue
        if stat.S_ISREG(status.st_mode):
            inputs.append((path, status.st_size, status.st_mtime_ns))
        else:
            unreadable[path] = "no regular file"
    return inputs, unreadable


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
        now = {path: [size, changed] for path, size, changed in inputs}
        seen = set()
        self.sweep()
        for part in sorted(self.folder.glob("*.jsonl.gz")):
            name = part.name.removesuffix(".jsonl.gz")
            try:
                tally = json.loads((self.folder / "_parts" / f"{name}.json").read_bytes())
                whole = part.stat().st_size == tally["bytes"]
            except (OSError, ValueError) as error:
                raise Failure(f"{part}: not a part of this table, its tally cannot be read: {error}") from error
            if tally["kind"] != self.kind:
                raise Failure(f"{self.folder} holds {tally['kind']}; give {self.kind} a folder of its own", USAGE)
            paths = {path for path, *_ in tally["inputs"]}
            changed = any(now.get(path, state) != state for path, *state, _ in tally["inputs"])
            if whole and not changed and not paths & seen:
                self.tallies[name] = tally
                seen |= paths
            else:
                part.unlink()
                (self.folder / "_parts" / f"{name}.json").unlink()

    def sweep(self):
        """Removes what workers that died have left unfinished."""
        for left in self.folder.rglob(".unfinished-*"):
            left.unlink(missing_ok=True)

    def missing(self, inputs):
        done = {path for tally in self.tallies.values() for path, *_ in tally["inputs"]}
        return [each for each in inputs if each[0] not in done]

    def lacking(self):
        """Parts that workers say they have written, but that are not here."""
        sizes = {entry.name: entry.stat().st_size for entry in os.scandir(self.folder)}
        return [name for name, tally in self.tallies.items() if sizes.get(f"{name}.jsonl.gz") != tally["bytes"]]

    def write_findings(self, unreadable):
        lines = [(each["source"], each) for tally in self.tallies.values() for each in tally["findings"]]
        lines += [(path, {"source": spelled(path), "kind": self.kind, "unreadable": reason})
                  for path, reason in unreadable.items()]
        with whole_file(self.folder / "findings.jsonl") as file:
            for _, line in sorted(lines, key=lambda each: each[0]):
                file.write(json.dumps(line, separators=(",", ":")).encode() + b"\n")
        return len(lines) - len(unreadable)


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
        if future.cancelled():
            break
        name, inputs = flying.pop(future.key)
        progress.update(len(inputs))
        if future.status == "finished":
            tally, reasons = future.result()
            table.tallies[name] = tally
            unreadable |= reasons
        else:
            wrong.append(f"{name}, {len(inputs)} captures from {inputs[0][0]} on: {future.exception()!r}")
    wrong.append("no worker is left" if idle > arguments.patience else "the scheduler is gone")
    return unreadable, wrong


def decode(arguments):
    table = Table(pathlib.Path(arguments.into), arguments.kind)
    inputs, unreadable = list_captures(arguments.sources, arguments.files0_from, str(table.folder))
    asked = unreadable.keys() | {path for path, *_ in inputs}
    table.read(inputs)
    missing = table.missing(inputs)
    wrong = []
    if missing:
        with connect(arguments.scheduler, arguments.kspdump, table) as client:
            with tqdm.tqdm(total=len(missing), unit=" captures", disable=None) as progress:
                reasons, wrong = work(client, split(missing, arguments.kind), arguments, table, progress)
        unreadable |= reasons
    return report(table, asked, len(inputs) - len(missing), unreadable, wrong)


def report(table, asked, before, unreadable, wrong):
    """Says what was done and whether it adds up; returns the exit status."""
    table.sweep()
    for name in table.lacking():
        wrong.append(f"{name}.jsonl.gz is not here as a worker wrote it")
        del table.tallies[name]
    here = {path for tally in table.tallies.values() for path, *_ in tally["inputs"]}
    unreadable = {path: reason for path, reason in unreadable.items() if path not in here}
    damaged = table.write_findings(unreadable)
    documents = len(asked & here)
    print(f"captures in    {len(asked)}, {before} of them decoded before")
    print(f"documents out  {documents}, in {table.folder}")
    print(f"with findings  {damaged}, in {table.folder / 'findings.jsonl'}")
    print(f"unreadable     {len(unreadable)}, likewise")
    for line in wrong[:10]:
        print(f"decode.py: {line}", file=sys.stderr)
    missing = len(asked) - documents - len(unreadable)
    if missing or wrong:
        print(f"decode.py: {missing} captures are missing; start it again", file=sys.stderr)
        return INCOMPLETE
    return UNREADABLE if unreadable else FINDINGS if damaged else CLEAN


def main():
    parser = argparse.ArgumentParser(description=__doc__, formatter_class=argparse.RawDescriptionHelpFormatter)
    parser.add_argument("scheduler", metavar="SCHEDULER", help="address, as tcp://HOST:8786, or scheduler file")
    parser.add_argument("sources", metavar="SOURCE", nargs="*", help="capture, or folder of captures")
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
