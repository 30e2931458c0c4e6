#!/usr/bin/python3
"""cluster_test.py KSPDUMP CAPTURE_GENERATOR EXAMPLES: the programs on a real scheduler and two workers."""

import csv
import glob
import gzip
import json
import os
import pathlib
import signal
import struct
import subprocess
import sys
import tempfile
import time
import unittest

DEADLINE = 60
CAPTURES = 5000
CUT = [7, 2500, 4999]


def wait_for(condition, what):
    end = time.monotonic() + DEADLINE
    while not condition():
        if time.monotonic() > end:
            raise TimeoutError(what)
        time.sleep(0.01)


def stats(**values):
    keys = {"hostWrites": 4, "bandErases": 20}
    return b"".join(struct.pack("<IIQ", keys[name], 1, value) for name, value in values.items())


class ClusterTest(unittest.TestCase):
    @classmethod
    def setUpClass(cls):
        folder = tempfile.TemporaryDirectory()
        cls.addClassCleanup(folder.cleanup)
        cls.folder = pathlib.Path(folder.name)
        cls.scheduler = cls.folder / "scheduler.json"
        cls.started = []
        cls.addClassCleanup(lambda: [process.kill() or process.wait() for process in cls.started])
        cls.start("scheduler", "--host", "127.0.0.1", "--port", "0")
        cls.workers = [cls.start_worker() for _ in range(2)]
        cls.fleet = cls.folder / "fleet"
        cls.fleet.mkdir()
        subprocess.run([GENERATOR, cls.fleet, "--fleet", str(CAPTURES)], check=True)
        for unit in CUT:
            os.truncate(cls.fleet / f"unit-{100000 + unit}.stats", 20004)
        cls.unreadable = cls.fleet / "unit-099999.stats"
        cls.unreadable.symlink_to("nowhere")

    @classmethod
    def start(cls, program, *options):
        log = open(cls.folder / f"{program}-{len(cls.started)}.log", "w")
        process = subprocess.Popen([f"/usr/bin/dask-{program}", "--scheduler-file", cls.scheduler, "--no-dashboard", *options],
                                   cwd=cls.folder, stdout=log, stderr=log)
        log.close()
        cls.started.append(process)
        return process

    @classmethod
    def start_worker(cls):
        return cls.start("worker", "--nthreads", "1", "--no-nanny", "--host", "127.0.0.1")

    def decoding(self, source, into, kind="stats"):
        return subprocess.Popen([EXAMPLES / "decode.py", self.scheduler, source, "--into", self.folder / into,
                                 "--kind", kind, "--kspdump", KSPDUMP],
                                stdout=subprocess.PIPE, stderr=subprocess.PIPE, text=True)

    def decode(self, *arguments):
        program = self.decoding(*arguments)
        out, err = program.communicate(timeout=DEADLINE)
        return program.returncode, out, err

    def select(self, *arguments):
        return subprocess.run([EXAMPLES / "select.py", self.folder / "units", *arguments, "--csv"],
                              capture_output=True, text=True, timeout=DEADLINE)

    def parts(self, into):
        return {path: os.stat(path).st_mtime_ns for path in glob.glob(f"{self.folder / into}/*.jsonl.gz")}

    def documents(self, into):
        return sorted(line for part in self.parts(into) for line in gzip.open(part))

    def test_a_fleet_survives_an_interruption_and_the_death_of_a_worker(self):
        program = self.decoding(self.fleet, "table")
        wait_for(lambda: len(self.parts("table")) >= 2, "first parts")
        program.send_signal(signal.SIGINT)
        self.assertIn("interrupted", program.communicate(timeout=DEADLINE)[1])
        self.assertEqual(program.returncode, 130)

        before = self.parts("table")
        program = self.decoding(self.fleet, "table")
        wait_for(lambda: len(self.parts("table")) >= len(before) + 2, "further parts")
        self.workers.pop().kill()
        self.assertLess(len(self.parts("table")), CAPTURES / 200)
        out, err = program.communicate(timeout=DEADLINE)
        self.assertEqual((program.returncode, err), (3, ""))
        self.workers.append(self.start_worker())
        self.assertEqual(before.items() - self.parts("table").items(), set())
        self.assertEqual(glob.glob(f"{self.folder}/table/**/.*", recursive=True), [])

        after = self.parts("table")
        status, out, err = self.decode(self.fleet, "table")
        self.assertEqual((status, self.parts("table")), (3, after))
        self.assertRegex(out, rf"captures in +{CAPTURES + 1}, {CAPTURES} of.*\ndocuments out +{CAPTURES},.*\nwith findings +3,.*\nunreadable +1,")

        names = sorted(str(path) for path in self.fleet.iterdir())
        one = subprocess.run([KSPDUMP, "stats", "--format", "json", *names], capture_output=True, timeout=DEADLINE)
        self.assertEqual(len(one.stdout.splitlines()), CAPTURES)
        self.assertTrue(self.documents("table") == sorted(one.stdout.splitlines(keepends=True)))
        findings = list(map(json.loads, (self.folder / "table" / "findings.jsonl").read_text().splitlines()))
        self.assertEqual([finding["source"] for finding in findings],
                         [str(self.unreadable), *(f"{self.fleet}/unit-{100000 + unit}.stats" for unit in CUT)])
        self.assertEqual(findings[0]["unreadable"], "No such file or directory")
        self.assertEqual({finding["findings"][0]["offset"] for finding in findings[1:]}, {20000})

    def test_changed_captures_are_decoded_again_and_units_selected(self):
        greatest = 2**64 - 1
        units = {"2026-11-21/rack/a.stats": (10, 1), "2026-11-21/b.stats": (1, greatest), "2026-11-21/only.stats": (5, 5),
                 "2026-11-22/rack/a.stats": (13, 1), "2026-11-22/b.stats": (5, 5)}
        for name, (writes, erases) in units.items():
            path = self.folder / "days" / name
            path.parent.mkdir(parents=True, exist_ok=True)
            path.write_bytes(stats(hostWrites=writes, bandErases=erases))
        self.assertEqual(self.decode("days", "units")[0], 3, "a relative source is of this folder, not the test's")
        status, out, err = self.decode(self.folder / "days", "units")
        self.assertEqual((status, err), (0, ""))
        (self.folder / "days" / "2026-11-22" / "b.stats").write_bytes(stats(hostWrites=2, bandErases=0))
        self.assertEqual(self.decode(self.folder / "days", "units")[0], 0)
        self.assertEqual(len(self.documents("units")), len(units))

        moved = list(csv.DictReader(self.select("bandErases", "--moved", "2026-11-21", "2026-11-22").stdout.splitlines()))
        self.assertEqual([(row["unit"], row["old"], row["new"], row["delta"]) for row in moved],
                         [("b", str(greatest), "0", str(-greatest)), ("a", "1", "1", "0")])
        (summary,) = csv.DictReader(self.select("hostWrites").stdout.splitlines())
        self.assertEqual([summary[column] for column in ("key", "captures", "least", "1 %", "50 %", "75 %", "greatest")],
                         ["4", "5", "1", "1", "5", "10", "13"])
        self.assertEqual(summary["greatest in"], f"{self.folder}/days/2026-11-22/rack/a.stats")
        rows = list(csv.DictReader(self.select("bandErases", "--all").stdout.splitlines()))
        self.assertEqual([(row["unit"], row["day"], row["value"]) for row in rows],
                         [("b", "2026-11-21", str(greatest)), ("only", "2026-11-21", "5"), ("a", "2026-11-21", "1"),
                          ("b", "2026-11-22", "0"), ("a", "2026-11-22", "1")])
        for arguments, words in [(["none"], "no capture has a record none"),
                                 (["hostWrites", "--moved", "2026-11-21", "2026-11-20"], "no capture is of 2026-11-20"),
                                 (["hostWrites", "--pattern", "(?P<unit>.*)"], "lacks the groups")]:
            program = self.select(*arguments)
            self.assertIn(words, program.stderr)
            self.assertNotEqual(program.returncode, 0)

        status, out, err = self.decode(self.folder / "days", "units", "media")
        self.assertEqual(status, 2)
        self.assertIn("holds stats", err)


if __name__ == "__main__":
    KSPDUMP, GENERATOR, EXAMPLES = map(pathlib.Path, map(os.path.abspath, sys.argv[1:]))
    unittest.main(argv=sys.argv[:1], verbosity=2)
