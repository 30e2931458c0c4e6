#!/usr/bin/python3
# SPDX-License-Identifier: Apache-2.0
"""monitoring_test.py KSPDUMP CAPTURES RECIPE: a device's captures, through the real exporter, asked of a real
Prometheus server."""

import contextlib
import json
import os
import pathlib
import shutil
import socket
import struct
import subprocess
import sys
import tempfile
import time
import unittest
import urllib.parse
import urllib.request

DEADLINE = 60


def free_port():
    with socket.socket() as probe:
        probe.bind(("127.0.0.1", 0))
        return probe.getsockname()[1]


def value_behind(capture, header, element=0):
    """A value of eight bytes as it stands in a capture, behind the header of its record."""
    data = capture.read_bytes()
    return struct.unpack_from("<Q", data, data.index(header) + len(header) + 8 * element)[0]


class MonitoringTest(unittest.TestCase):
    def setUp(self):
        folder = tempfile.TemporaryDirectory()
        self.addCleanup(folder.cleanup)
        self.folder = pathlib.Path(folder.name)
        self.collector = self.folder / "collector"
        self.collector.mkdir()

    def start(self, program, *options):
        log = open(self.folder / f"{program}.log", "w")
        self.addCleanup(log.close)
        process = subprocess.Popen([program, *options], cwd=self.folder, stdout=log, stderr=log)
        self.addCleanup(lambda: process.kill() or process.wait())

    def capture(self, example, device, age):
        path = self.folder / "captures" / device / example
        path.parent.mkdir(parents=True, exist_ok=True)
        shutil.copy(CAPTURES / example, path)
        os.utime(path, (time.time() - age,) * 2)
        return path

    def write_metrics(self):
        path = f"{KSPDUMP.parent}:{os.environ['PATH']}"
        return subprocess.run([RECIPE / "ksp-metrics", self.folder / "captures", self.collector], timeout=DEADLINE,
                              env={**os.environ, "PATH": path}, capture_output=True, text=True)

    def ask(self, query):
        url = f"http://127.0.0.1:{self.port}/api/v1/query?{urllib.parse.urlencode({'query': query})}"
        with urllib.request.urlopen(url, timeout=DEADLINE) as answer:
            return [each["value"][1] for each in json.load(answer)["data"]["result"]]

    def wait_for(self, query, value):
        end, seen = time.monotonic() + DEADLINE, None
        while seen != [str(value)]:
            self.assertLess(time.monotonic(), end, f"{query} is {seen}, not {value}")
            time.sleep(0.2)
            with contextlib.suppress(OSError):
                seen = self.ask(query)

    def test_the_units_are_sound(self):
        service = (RECIPE / "ksp-metrics.service").read_text().replace("/usr/local/bin", str(RECIPE))
        (self.folder / "ksp-metrics.service").write_text(service)
        shutil.copy(RECIPE / "ksp-metrics.timer", self.folder)
        units = [self.folder / f"ksp-metrics.{kind}" for kind in ("service", "timer")]
        run = subprocess.run(["systemd-analyze", "verify", "--man=no", *units], capture_output=True, text=True)
        self.assertEqual((run.returncode, run.stderr), (0, ""))

    def test_captures_reach_the_server(self):
        self.capture("monday.stats", "nvme0", 7200)
        latest = self.capture("tuesday.stats", "nvme0", 3600)
        media = self.capture("tuesday.media", "nvme0", 3600)
        self.capture("monday.stats", "nvme1", 3600)
        run = self.write_metrics()
        self.assertEqual((run.returncode, run.stderr), (0, ""))
        files = ["ksp-captures.prom", "ksp-nvme0-media.prom", "ksp-nvme0-stats.prom", "ksp-nvme1-stats.prom"]
        self.assertEqual(sorted(os.listdir(self.collector)), files)

        exporter, self.port = free_port(), free_port()
        self.start("prometheus-node-exporter", "--collector.disable-defaults", "--collector.textfile",
                   f"--collector.textfile.directory={self.collector}", f"--web.listen-address=127.0.0.1:{exporter}")
        targets = [f"127.0.0.1:{exporter}", f"127.0.0.1:{self.port}"]
        configuration = {"global": {"scrape_interval": "1s"}, "rule_files": [str(RECIPE / "ksp-rules.yml")],
                         "scrape_configs": [{"job_name": "node", "static_configs": [{"targets": targets}]}]}
        (self.folder / "prometheus.yml").write_text(json.dumps(configuration))
        self.start("prometheus", "--config.file=prometheus.yml", "--storage.tsdb.path=data",
                   f"--web.listen-address=127.0.0.1:{self.port}")

        self.wait_for('ksp_stats{source="nvme0",name="hostWrites"}', value_behind(latest, struct.pack("<II", 4, 1)))
        self.wait_for('ksp_stats{source="nvme0",name="hostWriteLogHisto",element="3"}',
                      value_behind(latest, struct.pack("<II", 14, 10), 3))
        self.wait_for('ksp_media{source="nvme0",name="num_pg_events"}', value_behind(media, struct.pack("<HH", 16388, 8)))
        self.wait_for("node_textfile_scrape_error", 0)
        self.wait_for('count(ksp_capture_status == 0)', 3)
        self.wait_for('prometheus_rule_group_rules', 7)
        self.assertEqual(self.ask('{source=~".*[/.].*"}'), [], "a label is a path")

        before = (self.collector / files[2]).read_bytes()
        with open(latest, "r+b") as file:
            file.truncate(1 << 30)  # more than kspdump takes
        os.truncate(self.capture("tuesday.stats", "nvme1", 0), 1004)
        self.assertEqual(self.write_metrics().returncode, 1)
        self.assertEqual((self.collector / files[2]).read_bytes(), before)
        self.wait_for('ksp_capture_status{source="nvme0",kind="stats"}', 3)
        self.wait_for('ksp_capture_status{source="nvme1"}', 1)

        shutil.rmtree(self.folder / "captures" / "nvme0")
        self.assertEqual(self.write_metrics().returncode, 0)
        self.assertEqual(sorted(os.listdir(self.collector)), [files[0], files[3]])


if __name__ == "__main__":
    KSPDUMP, CAPTURES, RECIPE = map(pathlib.Path, map(os.path.abspath, sys.argv[1:]))
    unittest.main(argv=sys.argv[:1], verbosity=2)
