#!/usr/bin/python3
# SPDX-License-Identifier: Apache-2.0
"""cluster_test.py KSPDUMP CAPTURE_GENERATOR CAPTURES PROGRAMS: the programs on a real scheduler and two workers."""

import csv
import glob
import gzip
import json
import os
import pathlib
import shutil
import signal
import struct
import subprocess
import sys
import tempfile
import time
import unittest

DEADLINE = 120
COUNT = 5000
BUNDLED = 300  # of them in an archive
CUT = [2000, 3500, 4999]


class ClusterTest(unittest.TestCase):
    @classmethod
    def setUpClass(cls):
        folder = tempfile.TemporaryDirectory()
        cls.addClassCleanup(folder.cleanup)
        cls.folder = pathlib.Path(folder.name)
        cls.scheduler = cls.folder / "scheduler.json"
        cls.started = []
        cls.addClassCleanup(lambda: [process.kill() or process.wait() for process in cls.started])
        cls.start("scheduler", "--port", "0")
        cls.workers = [cls.start("worker", "--nthreads", "1", "--no-nanny") for _ in range(2)]

    @classmethod
    def start(cls, program, *options):
        command = [f"/usr/bin/dask-{program}", "--host", "127.0.0.1", "--scheduler-file", cls.scheduler, *options]
        with open(cls.folder / f"{program}-{len(cls.started)}.log", "w") as log:
            process = subprocess.Popen([*command, "--no-dashboard"], cwd=cls.folder, stdout=log, stderr=log)
        cls.started.append(process)
        return process

    def decoding(self, source, into, kind="stats"):
        command = [PROGRAMS / "decode.py", self.scheduler, source, "--into", self.folder / into]
        return subprocess.Popen([*command, "--kind", kind, "--kspdump", KSPDUMP], text=True,
                                stdout=subprocess.PIPE, stderr=subprocess.PIPE)

    def decode(self, *arguments, status, words=""):
        program = self.decoding(*arguments)
        out, err = program.communicate(timeout=DEADLINE)
        self.assertEqual(program.returncode, status, out + err)
        self.assertIn(words, " ".join((out + err).split()))

    def select(self, *arguments):
        return subprocess.run([PROGRAMS / "select.py", self.folder / "units", *arguments, "--csv"],
                              capture_output=True, text=True, timeout=DEADLINE)

    def rows(self, columns, *arguments):
        rows = csv.DictReader(self.select(*arguments).stdout.splitlines())
        return [tuple(row[column] for column in columns.split(",")) for row in rows]

    def parts(self, into):
        return {path: os.stat(path).st_mtime_ns for path in glob.glob(f"{self.folder / into}/*.jsonl.gz")}

    def wait_for_parts(self, into, count):
        end = time.monotonic() + DEADLINE
        while len(self.parts(into)) < count:
            self.assertLess(time.monotonic(), end)
            time.sleep(0.01)
        self.assertLess(len(self.parts(into)), COUNT / 200, "this is not the middle")

    def documents(self, into):
        return sorted(line for part in self.parts(into) for line in gzip.open(part))

    def test_a_fleet_survives_an_interruption_and_the_death_of_a_worker(self):
        fleet = self.folder / "fleet"
        fleet.mkdir()
        subprocess.run([GENERATOR, fleet, "--fleet", str(COUNT)], check=True)
        for unit in CUT:
            os.truncate(fleet / f"unit-{100000 + unit}.stats", 20004)
        unreadable = fleet / "unit-099999.stats.gz"
        unreadable.write_bytes(gzip.compress((fleet / "unit-100000.stats").read_bytes())[:1000])
        for other in ["monday.media", "day.snapshot"]:
            shutil.copy(CAPTURES / other, fleet)
        bundled = sorted(file.name for file in fleet.glob("unit-1*"))[:BUNDLED]
        subprocess.run(["tar", "--remove-files", "-C", fleet, "-czf", fleet / "bundle.tgz", *bundled], check=True)

        program = self.decoding(fleet, "table")
        self.wait_for_parts("table", 2)
        program.send_signal(signal.SIGINT)
        self.assertIn("interrupted", program.communicate(timeout=DEADLINE)[1])
        self.assertEqual(program.returncode, 130)

        before = self.parts("table")
        program = self.decoding(fleet, "table")
        self.wait_for_parts("table", len(before) + 2)
        self.workers[0].kill()
        self.assertEqual(program.communicate(timeout=DEADLINE)[1], "")
        after = self.parts("table")
        self.assertEqual(before.items() - after.items(), set(), "what was done was done again")
        files = COUNT - BUNDLED + 4
        self.decode(fleet, "table", status=3, words=f"files {files}, {files - 1} of them done before, 2 without stats "
                    f"captures in {COUNT + 1} documents out {COUNT}, in {self.folder}/table unreadable 1,")
        self.assertEqual(self.parts("table"), after)

        one = subprocess.run([KSPDUMP, "stats", "--format", "json", fleet], capture_output=True, timeout=DEADLINE)
        self.assertEqual(len(one.stdout.splitlines()), COUNT)
        self.assertTrue(self.documents("table") == sorted(one.stdout.splitlines(keepends=True)))
        lines = (self.folder / "table" / "findings.jsonl").read_text().splitlines()
        self.assertEqual([(each["source"], "unreadable" in each) for each in map(json.loads, lines)],
                         [(str(unreadable), True)] + [(f"{fleet}/unit-{100000 + unit}.stats", False) for unit in CUT])

    def test_changed_captures_are_decoded_again_and_units_selected(self):
        greatest = 2**64 - 1

        def write(name, writes, erases):
            path = self.folder / "days" / name
            path.parent.mkdir(parents=True, exist_ok=True)
            path.write_bytes(struct.pack("<IIQIIQ", 4, 1, writes, 20, 1, erases))

        write("2026-11-21/rack/a.stats", 10, 1)
        write("2026-11-21/b.stats", 1, greatest)
        write("2026-11-21/only.stats", 5, 5)
        write("2026-11-22/rack/a.stats", 13, 1)
        write("2026-11-22/b.stats", 5, 5)
        self.decode(self.folder / "days", "units", status=0)
        write("2026-11-22/b.stats", 2, 0)
        self.decode(self.folder / "days", "units", status=0, words="documents out 5,")
        self.assertEqual(len(self.documents("units")), 5)
        self.decode(self.folder / "days", "units", "media", status=2, words="holds stats")

        self.assertEqual(self.rows("unit,old,new,delta", "bandErases", "--moved", "2026-11-21", "2026-11-22"),
                         [("b", str(greatest), "0", str(-greatest)), ("a", "1", "1", "0")])
        self.assertEqual(self.rows("key,captures,least,1 %,50 %,75 %,greatest,greatest in", "hostWrites"),
                         [("4", "5", "1", "1", "5", "10", "13", f"{self.folder}/days/2026-11-22/rack/a.stats")])
        self.assertEqual(self.rows("unit,day,value", "bandErases", "--all", "--top", "2"),
                         [("b", "2026-11-21", str(greatest)), ("only", "2026-11-21", "5")])
        self.assertIn("no capture is of 2026", self.select("bandErases", "--moved", "2026-11-21", "2026-11-20").stderr)


if __name__ == "__main__":
    KSPDUMP, GENERATOR, CAPTURES, PROGRAMS = map(pathlib.Path, map(os.path.abspath, sys.argv[1:]))
    unittest.main(argv=sys.argv[:1], verbosity=2)
