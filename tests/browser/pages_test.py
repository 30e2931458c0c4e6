#!/usr/bin/python3
# SPDX-License-Identifier: Apache-2.0
"""Opens the pages that kspdump makes in a real browser, and uses them as people do.

usage: pages_test.py KSPDUMP CAPTURES [UNITTEST ARGUMENT...]
"""

import fnmatch
import json
import math
import os
import pathlib
import random
import shutil
import struct
import subprocess
import sys
import tempfile
import unittest

from selenium import webdriver
from selenium.webdriver.common.action_chains import ActionChains
from selenium.webdriver.common.by import By
from selenium.webdriver.common.keys import Keys
from selenium.webdriver.support.ui import Select, WebDriverWait

KSPDUMP, CAPTURES = (os.path.abspath(path) for path in sys.argv[1:3])
DEADLINE_S = 30
FLAGS = ["--headless", "--no-sandbox", "--disable-gpu", "--disable-quic", "--no-first-run", "--disable-sync",
         "--disable-background-networking", "--disable-component-update", "--window-size=1400,1000"]


def record(key, values):
    return struct.pack(f"<II{len(values)}Q", key, len(values), *values)


def snapshot(fields):
    """A snapshot in the fixed layout: of each record the words that are not 0."""
    records = bytearray()
    for words in fields:
        row = [0] * 63
        for word, value in words.items():
            row[word] = value
        records += struct.pack("<63I", *row)
    return bytes(records)


class Pages(unittest.TestCase):
    @classmethod
    def setUpClass(cls):
        cls.profile = tempfile.mkdtemp()
        options = webdriver.ChromeOptions()
        options.binary_location = shutil.which("chromium")
        for flag in [*FLAGS, f"--user-data-dir={cls.profile}"]:
            options.add_argument(flag)
        options.set_capability("goog:loggingPrefs", {"browser": "ALL", "performance": "ALL"})
        cls.browser = webdriver.Chrome(service=webdriver.chrome.service.Service(shutil.which("chromedriver")),
                                       options=options)
        cls.browser.set_page_load_timeout(DEADLINE_S)
        cls.browser.set_script_timeout(DEADLINE_S)
        # What the browser did to start is none of the pages' doing.
        cls.browser.get("about:blank")
        cls.browser.get_log("performance")

    @classmethod
    def tearDownClass(cls):
        cls.browser.quit()
        shutil.rmtree(cls.profile, ignore_errors=True)

    def setUp(self):
        self.folder = pathlib.Path(tempfile.mkdtemp())
        self.addCleanup(shutil.rmtree, self.folder)
        self.set_media()
        self.set_width(1400)

    def tearDown(self):
        """Whatever a test did: nothing was complained of, and nothing but the page was asked for."""
        self.assertEqual(self.browser.get_log("browser"), [])
        for entry in self.browser.get_log("performance"):
            message = json.loads(entry["message"])["message"]
            if message["method"] == "Network.requestWillBeSent":
                self.assertRegex(message["params"]["request"]["url"], r"^(file:///.*/page\.html$|data:|about:)")

    # What tests are made of.

    def run_kspdump(self, *arguments):
        done = subprocess.run([KSPDUMP, *arguments], cwd=self.folder, capture_output=True, timeout=DEADLINE_S)
        self.assertIn(done.returncode, (0, 1), done.stderr)
        self.assertEqual(done.stderr, b"")
        return done.stdout

    def open(self, *arguments):
        """Opens the page of a command. Returns its size in bytes."""
        page = self.run_kspdump(*arguments, "--format", "html")
        (self.folder / "page.html").write_bytes(page)
        self.browser.get((self.folder / "page.html").as_uri())
        return len(page)

    def write(self, name, data):
        path = self.folder / name
        path.parent.mkdir(parents=True, exist_ok=True)
        path.write_bytes(data)
        return name

    def cdp(self, command, **arguments):
        return self.browser.execute_cdp_cmd(command, arguments)

    def set_media(self, kind="", scheme="light"):
        self.cdp("Emulation.setEmulatedMedia", media=kind,
                 features=[{"name": "prefers-color-scheme", "value": scheme}])

    def set_width(self, width):
        self.cdp("Emulation.setDeviceMetricsOverride", width=width, height=1000, deviceScaleFactor=1, mobile=False)

    def script(self, code, *arguments):
        return self.browser.execute_script(code, *arguments)

    def find(self, css):
        return self.browser.find_element(By.CSS_SELECTOR, css)

    def rows(self):
        """The table's visible rows as texts, a list a row; what the script has put into them is left out."""
        return self.script("""
            return [...document.querySelectorAll('tr.row')].filter(row => row.getClientRects().length > 0).map(row =>
              [...row.cells].map(cell => (cell.querySelector('.count') ?? cell).textContent))""")

    def row(self, name):
        row = self.script("return [...document.querySelectorAll('tr.row')].find("
                          "row => row.querySelector('th').textContent === arguments[0])", name)
        self.assertIsNotNone(row, name)
        return row

    def open_row(self, name):
        """Opens a row's picture with the keyboard. Returns the row that it stands in."""
        button = self.row(name).find_element(By.CSS_SELECTOR, "button")
        self.assertEqual(button.get_attribute("aria-expanded"), "false")
        button.send_keys(Keys.ENTER)
        self.assertEqual(button.get_attribute("aria-expanded"), "true")
        return self.find("tr.open + tr.detail")

    def values_of(self, detail):
        """The table of a picture's values."""
        detail.find_element(By.CSS_SELECTOR, "summary").click()
        wait = WebDriverWait(self.browser, DEADLINE_S)
        wait.until(lambda _: detail.find_elements(By.CSS_SELECTOR, "details tbody tr"))
        return self.script("return [...arguments[0].querySelectorAll('details tbody tr')].map(row => "
                           "[...row.cells].map(cell => cell.textContent))", detail)

    def point_at(self, element, right, down=0.5):
        """Puts the pointer on a place in an element, both shares of its size."""
        self.script("arguments[0].scrollIntoView({block: 'center'})", element)
        box = element.rect
        ActionChains(self.browser, duration=0).move_to_element_with_offset(
            element, round((right - 0.5) * box["width"]), round((down - 0.5) * box["height"])).perform()

    # Tables.

    def test_the_table_says_all_that_json_says_also_without_scripts(self):
        for kind, file in (("stats", "monday.stats"), ("summary", "monday.stats"), ("media", "monday.media")):
            capture = os.path.join(CAPTURES, file)
            expected = [[str(r["key"]), r["name"], str(sum(r["values"])),
                         str(len(r["values"])) if len(r["values"]) > 1 else ""]
                        for r in json.loads(self.run_kspdump(kind, "--format", "json", capture))["records"]]
            for is_disabled in (True, False):
                self.cdp("Emulation.setScriptExecutionDisabled", value=is_disabled)
                size = self.open(kind, capture)
                self.cdp("Emulation.setScriptExecutionDisabled", value=False)
                self.assertEqual(self.rows(), expected)
                self.assertLess(size, 1.5 * 2**20)
                self.assertEqual(self.find("h1").text, capture)
            self.assertEqual(self.browser.title, capture)

    def test_the_filter_takes_parts_patterns_and_keys(self):
        self.open("stats", os.path.join(CAPTURES, "monday.stats"))
        every = self.rows()
        search = self.find("input[type=search]")
        for text, fits in (("hOsTw", lambda key, name: "hostw" in name.lower()),
                           ("host*Histo", lambda key, name: fnmatch.fnmatch(name.lower(), "host*histo")),
                           ("14", lambda key, name: "14" in key or "14" in name),
                           ("a.b(", lambda key, name: False)):
            search.clear()
            search.send_keys(text)
            expected = [row for row in every if fits(row[0], row[1])]
            self.assertEqual(self.rows(), expected)
            self.assertEqual(self.find("[role=status]").text, f"{len(expected)} of {len(every)} rows")
        search.clear()
        search.send_keys("x", Keys.BACKSPACE)
        self.assertEqual(len(self.rows()), len(every))

    def test_every_column_sorts_both_ways(self):
        files = [os.path.join(CAPTURES, day + ".stats") for day in ("monday", "tuesday")]
        self.open("diff", "stats", *files)
        self.open_row("hostWriteLogHisto")
        every = self.rows()
        heads = self.browser.find_elements(By.CSS_SELECTOR, ".statistics thead button")
        self.assertEqual([head.text for head in heads], ["Key", "Name", "Old", "New", "Change", "%", "Elements"])
        for column, head in enumerate(heads):
            for _ in range(2):
                head.send_keys(Keys.ENTER)
                order = head.find_element(By.XPATH, "..").get_attribute("aria-sort")
                shown = [row[column] for row in self.rows()]
                present = [text for text in shown if text != ""]
                keys = [text.lower() for text in present] if column == 1 else [float(text) for text in present]
                self.assertEqual(keys, sorted(keys, reverse=order == "descending"))
                self.assertEqual(shown, present + [""] * (len(shown) - len(present)), "what is missing comes last")
                self.assertCountEqual(self.rows(), every)
                self.assertEqual(len(self.browser.find_elements(By.CSS_SELECTOR, "[aria-sort]")), 1)
                self.assertEqual(self.find("tr.detail").find_element(By.CSS_SELECTOR, "h3").text, "hostWriteLogHisto")
                self.assertEqual(self.script("return document.querySelector('tr.detail').previousSibling.className"),
                                 "row opens open")

    # Pictures.

    def test_a_histogram_has_its_counts(self):
        values = [0, 1, 9, 99, 999, 18446744073709551615, 0, 5]
        self.write("a.stats", record(900, values) + record(4, [7]))
        self.open("stats", "a.stats")
        self.assertEqual(self.rows()[0], ["900", "Stat_900", str(sum(values)), "8"])
        self.assertEqual(self.row("hostWrites").find_elements(By.CSS_SELECTOR, "button"), [])
        detail = self.open_row("Stat_900")
        heights = "return [...document.querySelectorAll('.picture rect.up')].map(bar => +bar.getAttribute('height'))"
        self.assertEqual([height > 100 for height in self.script(heights)], [value > 999 for value in values])
        self.script("document.querySelectorAll('[aria-label=Scale] button')[1].click()")
        logarithmic = self.script(heights)
        for value, height in zip(values, logarithmic):
            self.assertAlmostEqual(height / max(logarithmic), math.log10(1 + value) / math.log10(2**64), places=3)
        self.assertEqual(self.values_of(detail), [[f"[{i}]", str(value)] for i, value in enumerate(values)])
        picture = detail.find_element(By.CSS_SELECTOR, ".picture svg")
        output = detail.find_element(By.CSS_SELECTOR, "output")
        picture.send_keys(Keys.ARROW_RIGHT, *[Keys.ARROW_RIGHT] * 5)
        self.assertEqual(output.get_attribute("textContent").split(), ["[5]", str(values[5])])
        self.point_at(picture, 0.99)
        self.assertEqual(output.get_attribute("textContent").split(), ["[7]", "5"])
        self.row("Stat_900").find_element(By.CSS_SELECTOR, "button").send_keys(Keys.ENTER)
        self.assertEqual(self.browser.find_elements(By.CSS_SELECTOR, "tr.detail"), [])

    def test_a_difference_draws_falls_downwards(self):
        self.write("a.stats", record(14, [5, 18446744073709551615, 3]) + record(4, [0]) + record(5, [7]))
        self.write("b.stats", record(14, [9, 18446744073709551613, 3]) + record(4, [6]))
        self.open("diff", "stats", "a.stats", "b.stats")
        self.assertEqual(self.rows(), [["4", "hostWrites", "0", "6", "+6", "", ""],
                                       ["5", "hostWritesDyn", "7", "", "", "", ""],
                                       ["14", "hostWriteLogHisto", "18446744073709551623", "18446744073709551625",
                                        "+2", "+0.0", "3"]])
        detail = self.open_row("hostWriteLogHisto")
        self.assertEqual([bar.get_attribute("class") for bar in
                          detail.find_elements(By.CSS_SELECTOR, "rect:not(.reading)")], ["up", "down", "up"])
        self.assertEqual(self.values_of(detail), [["[0]", "5", "9", "4"],
                                                  ["[1]", "18446744073709551615", "18446744073709551613", "-2"],
                                                  ["[2]", "3", "3", "0"]])
        Select(detail.find_element(By.CSS_SELECTOR, "select")).select_by_visible_text("old and new")
        self.assertEqual(len(detail.find_elements(By.CSS_SELECTOR, "rect:not(.reading)")), 6)

    def test_a_trend_shows_how_a_histogram_wanders(self):
        bins, count = 10, 6
        big = 2**63
        names = []
        for i in range(count):
            peak = [1000 if b == i + 1 else 10 for b in range(bins)]
            names.append(self.write(f"day-{i}.stats", record(14, peak) + record(4, [big + 7 * i]) +
                                    (record(11, [100 - i]) if i != 2 else b"") + record(34, [50 + i * i])))
        self.open("trend", "stats", "--over", "powerOnHours", *names)
        self.assertEqual([row[1] for row in self.rows()],
                         ["hostWrites", "uncleanBoots", "hostWriteLogHisto", "powerOnHours"])
        self.assertEqual(self.rows()[0][2:], [str(big), str(big + 35), str(big), str(big + 35), "+35", "+0.0", "1.400", ""])
        detail = self.open_row("hostWriteLogHisto")
        canvas = detail.find_element(By.CSS_SELECTOR, "canvas")
        strongest = """
            const [canvas, colour] = arguments, copy = Object.assign(document.createElement('canvas'), {width: canvas.width, height: canvas.height});
            const paint = copy.getContext('2d', {willReadFrequently: true});
            paint.drawImage(canvas, 0, 0);
            const image = paint.getImageData(0, 0, copy.width, copy.height);
            return Array.from({length: canvas.width}, (_, column) => {
              let bin = -1, most = 0;
              for (let row = 0; row < canvas.height; ++row) {
                const at = (row * canvas.width + column) * 4;
                if (image.data[at + 3] > most && (!colour || image.data[at] > image.data[at + 2] === (colour === 'orange'))) {
                  most = image.data[at + 3];
                  bin = canvas.height - 1 - row;
                }
              }
              return bin;
            })"""
        self.assertEqual(self.script(strongest, canvas), [1, 2, 3, 4, 5, 6])
        output = detail.find_element(By.CSS_SELECTOR, "output")
        canvas.send_keys(Keys.ARROW_UP, Keys.ARROW_UP, *[Keys.ARROW_RIGHT] * 9)
        self.assertEqual(output.get_attribute("textContent"), "[1] powerOnHours 75, day-5.stats 10")
        self.point_at(canvas, 2.5 / count, 1 - 3.5 / bins)
        self.assertEqual(output.get_attribute("textContent"), "[3] powerOnHours 54, day-2.stats 1000")
        Select(detail.find_element(By.CSS_SELECTOR, "select")).select_by_visible_text("change from the one before")
        canvas = detail.find_element(By.CSS_SELECTOR, "canvas")
        self.assertEqual(self.script(strongest, canvas, "blue")[1:], [2, 3, 4, 5, 6])
        self.assertEqual(self.script(strongest, canvas, "orange")[1:], [1, 2, 3, 4, 5])
        self.row("hostWriteLogHisto").find_element(By.CSS_SELECTOR, "button").click()
        # A number over the captures: exact also where doubles are not, and missing where it is.
        detail = self.open_row("hostWrites")
        self.assertEqual(self.values_of(detail)[3], ["powerOnHours 59, day-3.stats", str(big + 21)])
        self.find(".plot").send_keys(Keys.END)
        self.assertEqual(self.readings(), ({"hostWrites": str(big + 35)}, "powerOnHours 75, day-5.stats"))
        self.row("hostWrites").find_element(By.CSS_SELECTOR, "button").click()
        self.open_row("uncleanBoots")
        self.find(".plot").send_keys(Keys.HOME, Keys.ARROW_RIGHT, Keys.ARROW_RIGHT)
        self.assertEqual(self.readings(), ({"uncleanBoots": "–"}, "powerOnHours 54, day-2.stats"))

    # Time charts.

    def readings(self):
        """The labels under the cursor with their values, of all charts; and where the cursor is."""
        return (dict(self.script("""
            return [...document.querySelectorAll('.legend button')].map(button =>
              [button.textContent.replace(/ \\(right\\)/, '').replace(button.querySelector('.value').textContent, ''),
               button.querySelector('.value').textContent])""")), self.find(".cursor-bar output").text)

    def test_one_cursor_reads_all_charts_exactly(self):
        capture = os.path.join(CAPTURES, "day.snapshot")
        records = {}
        for field in json.loads(self.run_kspdump("snapshot", "--format", "json", capture))["records"]:
            values = {field["name"]: field["values"][0]} if len(field["values"]) == 1 else \
                {f"{field['name']}_{i}": value for i, value in enumerate(field["values"])}
            records.setdefault(field["key"], {}).update(values)
        self.open("snapshot", capture)
        titles = [title.text.split("\n")[0] for title in self.browser.find_elements(By.CSS_SELECTOR, ".chart h3")]
        self.assertEqual(titles[:2], ["Traffic sectors of 4 KiB", "Write amplification NW by HW"])
        plots = self.browser.find_elements(By.CSS_SELECTOR, ".plot")
        self.assertGreater(len(plots), 8)

        def check(plot, place):
            self.point_at(plot, place)
            values, where = self.readings()
            number = int(where.split(" ")[-1])
            expected = {name: str(value) for name, value in records[number].items()}
            self.assertEqual(where, f"T {expected.pop('T')}, record {number}")
            ratios = {name: float(value) for name, value in values.items() if "/" in name}
            self.assertEqual({name: value for name, value in values.items() if "/" not in name}, expected)
            self.assertEqual(len(ratios), 9)
            self.assertAlmostEqual(ratios["NW/HW"], int(expected["NW"]) / int(expected["HW"]), places=4)
            self.assertAlmostEqual(ratios["WL/WO_2"], int(expected["WL_2"]) / int(expected["WO_2"]), places=1)
            lines = self.script("return [...document.querySelectorAll('.chart .cursor')].map(line => line.style.left)")
            self.assertEqual(len(set(lines)), 1, "the charts have one cursor")
            return number

        first, middle = check(plots[0], 0.05), check(plots[-1], 0.5)
        self.assertLess(first, 4)
        self.assertAlmostEqual(middle, len(records) / 2, delta=4)
        # The keys do the same, and say it.
        plots[2].send_keys(Keys.HOME, Keys.ARROW_RIGHT)
        self.assertEqual(self.readings()[1], "T 901, record 1")
        expected = ", ".join(f"{name} {records[1][name]}" for name in ("E", "GC", "W", "TH"))
        self.assertEqual(self.find("[aria-live]").get_attribute("textContent"), "T 901, record 1: " + expected)

        # Dragging in one chart zooms all; a double click goes back.
        self.point_at(plots[1], 0.25)
        box = plots[1].rect
        drag = ActionChains(self.browser, duration=0).move_to_element_with_offset(plots[1], -box["width"] / 4, 0)
        drag.click_and_hold().move_by_offset(round(box["width"] / 8), 5).move_by_offset(round(box["width"] / 8), 0)
        drag.release().perform()
        left = check(plots[0], 0.05)
        self.assertAlmostEqual(left, len(records) / 4, delta=5)
        self.assertAlmostEqual(check(plots[4], 0.95), len(records) / 2, delta=5)
        self.point_at(plots[5], 0.5)
        ActionChains(self.browser, duration=0).double_click().perform()
        self.assertEqual(check(plots[0], 0.05), first)
        self.assertFalse(self.find(".cursor-bar button").is_displayed())
        plots[0].send_keys("+")
        self.assertTrue(self.find(".cursor-bar button").is_displayed())
        self.find(".cursor-bar button").click()
        self.assertEqual(check(plots[0], 0.05), first)

    def test_a_spike_in_a_long_capture_is_drawn(self):
        count, spike = 20000, 12345
        self.write("long.snapshot", snapshot({0: 1 + 900 * i, 28: 9000 if i == spike else 10} for i in range(count)))
        self.open("snapshot", "long.snapshot", "--match", "[TH]*")
        # Of the chart's upper half, the columns of the screen that are not empty.
        drawn = self.script("""
            const canvas = document.querySelector('.plot canvas:not([style*="z-index"])') ?? document.querySelector('.plot canvas');
            const paint = canvas.getContext('2d'), height = Math.floor(canvas.height / 2);
            const image = paint.getImageData(0, 0, canvas.width, height), found = [];
            for (let x = 60; x < canvas.width - 60; ++x) {
              for (let y = 8; y < height; ++y) if (image.data[(y * canvas.width + x) * 4 + 3] > 200) { found.push(x); break; }
            }
            return found.map(x => x / canvas.width)""")
        self.assertTrue(drawn)
        for place in drawn:
            self.assertAlmostEqual(place, 0.04 + 0.92 * spike / count, delta=0.03)

    # What any page must be.

    HOSTILE = "<img src=x onerror=window.ran=1><script>window.ran=1<"

    def test_names_titles_and_labels_never_run(self):
        name = self.write(self.HOSTILE + "/script>'\"&amp;\u202e\x1b]0;.stats", record(14, [1, 2]) + b"rest")
        shown = name.replace("\u202e", "\\xe2\\x80\\xae").replace("\x1b", "\\x1b")
        title = b"</script><script>window.ran=1</script><img src=x onerror=window.ran=1>"
        fields = [(0, b"T=%u"), (4, b"<script>=%u"), (8, b"<b onclick=1>%u")]
        table = struct.pack("<II", len(fields), 0) + b"".join(
            struct.pack("<HHII16s", 0, 0, offset, 4, label) for offset, label in fields)
        header = struct.pack("<9I", 0, 6, 12, 5, 0, 0, 36 + len(title) + 1, 0, 0) + title + b"\0" + table
        self.write("h", header)
        snapshots = self.write(self.HOSTILE + "/script>.snapshot", b"".join(struct.pack("<3I", i + 1, i, 9) for i in range(5)))
        for arguments in (["stats", name], ["diff", "stats", name, name], ["snapshot", "--header", "h", snapshots]):
            self.open(*arguments)
            heading = self.find("h1").get_attribute("textContent")
            self.assertIn(snapshots if arguments[0] == "snapshot" else shown, heading)
            self.assertEqual(self.browser.title, heading)
            for row in self.browser.find_elements(By.CSS_SELECTOR, "tr.opens button"):
                row.click()
            self.assertIsNone(self.script("return window.ran"))
            self.assertEqual(self.browser.find_elements(By.CSS_SELECTOR, "img, b, [onclick], [onerror], body script:not([type]) ~ section"), [])
        self.assertEqual([row[1].removesuffix(" ▸") for row in self.rows()], ["T", "<script>", "<b onclick=1>"])
        self.assertIn(title.decode(), self.find("section").text)
        self.assertIn("<script>", self.readings()[0])

    def test_the_policy_lets_nothing_else_run_or_load(self):
        self.open("stats", os.path.join(CAPTURES, "monday.stats"))
        self.script("""
            const add = (tag, more) => document.body.append(Object.assign(document.createElement(tag), more));
            window.asked = 0;
            document.addEventListener('securitypolicyviolation', () => ++window.asked);
            add('script', {textContent: 'window.ran = 1'});
            add('style', {textContent: 'h1 { color: rgb(1, 2, 3) }'});
            add('img', {src: 'https://127.0.0.1:9/x.png'});
            add('iframe', {src: 'https://127.0.0.1:9/'});
            document.querySelector('h1').setAttribute('style', 'color: rgb(1, 2, 3)')""")
        WebDriverWait(self.browser, DEADLINE_S).until(lambda _: self.script("return window.asked") >= 5)
        self.assertIsNone(self.script("return window.ran"))
        self.assertNotEqual(self.find("h1").value_of_css_property("color"), "rgba(1, 2, 3, 1)")
        self.browser.get_log("browser")
        self.browser.get_log("performance")

    def test_findings_stand_on_top(self):
        self.write("a.stats", record(14, list(range(10))) + b"rest")
        self.open("stats", "a.stats")
        findings = self.find(".findings")
        found = json.loads(self.run_kspdump("stats", "--format", "json", "a.stats"))["findings"]
        self.assertEqual(findings.text.split("\n"), [f"a.stats: offset {f['offset']}: {f['reason']}" for f in found])
        self.assertLess(findings.rect["y"], self.find(".statistics").rect["y"])

    def test_light_dark_narrow_wide_and_paper(self):
        def brightness(css, element="body"):
            red, green, blue = (int(part) for part in self.find(element).value_of_css_property(css)[5:].split(",")[:3])
            return red + green + blue

        files = [os.path.join(CAPTURES, day + ".stats") for day in ("monday", "tuesday")]
        for arguments in (["stats", files[0]], ["diff", "stats", *files], ["snapshot", os.path.join(CAPTURES, "day.snapshot")]):
            self.assertLess(self.open(*arguments), 1.5 * 2**20)
            self.script("document.querySelector('tr.opens').click()")
            for scheme, is_dark in (("light", False), ("dark", True)):
                self.set_media(scheme=scheme)
                self.assertEqual(brightness("background-color") < 200, is_dark)
                self.assertEqual(brightness("color") > 500, is_dark)
            for width in (1400, 800, 400):
                self.set_width(width)
                self.assertLessEqual(self.script("return document.documentElement.scrollWidth"), width)
                WebDriverWait(self.browser, DEADLINE_S).until(lambda _: self.script(
                    "return [...document.querySelectorAll('canvas, .picture svg')].every("
                    "drawn => drawn.getBoundingClientRect().right <= innerWidth)"))
            # On paper it is light, and what only a hand can use is gone.
            self.set_media("print", "dark")
            self.assertGreater(brightness("background-color"), 700)
            self.assertFalse(self.find(".tools").is_displayed())
            paper = self.cdp("Page.printToPDF", printBackground=True)["data"]
            self.assertGreater(len(paper), 10000)
            self.set_media()
            self.set_width(1400)
            self.assertTrue(self.find(".tools").is_displayed())

    def test_a_year_of_snapshots_fits_a_page(self):
        # Numbers as long as they get.
        words = random.Random(1).randbytes(35040 * 252)
        year = bytearray(words)
        for i in range(35040):
            struct.pack_into("<I", year, 252 * i, 1 + 900 * i)
        self.write("year.snapshot", year)
        self.assertLess(self.open("snapshot", "year.snapshot"), 24 * 2**20)
        self.find(".plot").send_keys(Keys.END)
        self.assertEqual(self.readings()[1], f"T {1 + 900 * 35039}, record 35039")


if __name__ == "__main__":
    unittest.main(argv=sys.argv[:1] + sys.argv[3:])
