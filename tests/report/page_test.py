#!/usr/bin/python3
"""The page in a real browser: it shows the report's own values, keeps gaps, asks nobody for anything, and obeys."""
import base64
import glob
import gzip
import json
import os
import random
import re
import shutil
import subprocess
import sys
import tempfile
import time
import unittest

BUILD = sys.argv[1]
HOSTILE = '</script>"\\'
LEADER_OF = {"web1": 1201, "db1": 1202, HOSTILE: 1203}
FLAGS = ("--headless", "--no-sandbox", "--disable-gpu", "--disable-quic", "--no-first-run", "--hide-scrollbars",
         "--disable-background-networking", "--disable-component-update", "--disable-sync")


def quoted(text):
    return '"' + text.replace("\\", "\\\\").replace('"', '\\"') + '"'


def host():
    """Three VMs and an uplink: web1 drops from 60 s on, db1 can't be read from its 20th time on."""
    lines = ["host name=labhost pcpus=3", "pcpu 0..2 busy=300 worldlet=60", "self used=2", "switch vSwitch0",
             'uplink switch=vSwitch0 port=1 nic=nic0 device="0000:04:00.0" txqueues=4 rxqueues=2 tx=9000 rx=8000 errors=2',
             "vector 64 names=nic0-rx rate=1000 time=30000"]
    for place, (name, leader) in enumerate(LEADER_OF.items()):
        lines += [f"vm {quoted(name)} leader={leader} vcpus=2 used=300 ready={20 + 70 * place} costop=4",
                  f"vnic switch=vSwitch0 port={100 + place} vm={quoted(name)} model=parlan3 scheme=1 tx=2000 rx=5000",
                  f"worldlet NetWdt-Async-{leader} used=120 ready=8 wait=870 pcpu={place}"]
    drops = " ".join(f"then={60 + 10 * i}:{i * 700 * (i + 1)}:{140 * (i + 1)}" for i in range(20))
    lines += [f'field 269 "vSwitch0" 100 at=88 width=8 start=0 rate=0 {drops}', 'fault get 269 "vSwitch0" 101 from=20']
    return "\n".join(lines) + "\n"


def report(directory, name, *words, step=10, count=30, text=None):
    with open(f"{directory}/host", "w", encoding="utf-8") as file:
        file.write(text or host())
    environment = dict(os.environ, COREKIT_HOST=f"{directory}/host", LD_PRELOAD=f"{BUILD}/libfixed_clock.so",
                       ASAN_OPTIONS="verify_asan_link_order=0")
    path = f"{directory}/{name}"
    with open(path, "wb") as file:
        subprocess.run([f"{BUILD}/lan-meter", *words, "-i", str(step), "-n", str(count)], env=environment, stdout=file,
                       stderr=subprocess.DEVNULL, check=True)
    return path


def lan_report(*words, status=0):
    done = subprocess.run([f"{BUILD}/lan-report", *words], capture_output=True, check=False)
    assert done.returncode == status, (words, done.returncode, done.stderr[-500:])
    return done


def flat(port):
    """What the page calls the numbers of a port, by the report's own keys."""
    out = {}

    def walk(value, key):
        if isinstance(value, dict):
            for name, part in value.items():
                walk(part, f"{key}.{name}" if key else name)
        elif isinstance(value, (int, float)):
            out[key] = value
    for name, value in port.items():
        if name in ("vcpu", "wdt"):
            for i, element in enumerate(value):
                walk({k: v for k, v in element.items() if k not in ("id", "affval", "histos")}, f"{name}.{i}")
        elif name in ("txqueue", "rxqueue"):
            walk({k: v for k, v in value.items() if k != "details"}, name)
            for i, element in enumerate(value["details"] if name == "txqueue" else []):
                walk(element, f"{name}.{i}")
        elif name not in ("histos", "id", "txwdt"):
            walk(value, name)
    for key in ("ready", "cstp"):
        if port.get("vcpu"):
            out[key] = max(vcpu[key] for vcpu in port["vcpu"])
    return {key: value for key, value in out.items() if not key.startswith("coalesce.rx.intr")}


def decoded(page):
    """The columns of all ports of a page, as its scripts decode them: key -> rows."""
    manifest = json.loads(re.search(r'id="manifest">(.*?)</script>', page, re.S)[1])
    length, columns = len(manifest["times"]), {}
    for column in manifest["columns"]:
        rows = [None] * len(manifest["ports"]["id"])
        for first, count, value in column["fixed"]:
            rows[first:first + count] = [[None if value is None else value / column["scale"]] * length] * count
        if "block" in column:
            text = re.search(f'id="{column["block"]}">(.*?)</script>', page)[1]
            data = base64.b64decode(text)
            data = gzip.decompress(data) if manifest["compressed"] else data
            count = len(data) // 4
            codes = [sum(data[plane * count + i] << 8 * plane for plane in range(4)) for i in range(count)]
            moving = iter(range(0, count, length))
            for row, fixed in enumerate(rows):
                if fixed is None:
                    start, last, rows[row] = next(moving), 0, []
                    for code in codes[start:start + length]:
                        last += 0 if code == 0xffffffff else (code >> 1) ^ -(code & 1)
                        rows[row].append(None if code == 0xffffffff else last / column["scale"])
        columns[column["key"]] = rows
    return manifest, columns


class Command(unittest.TestCase):
    """What needs no browser."""

    def setUp(self):
        self.directory = tempfile.mkdtemp()
        self.addCleanup(shutil.rmtree, self.directory)

    def page(self, *words, **more):
        lan_report("page", *words, "-o", f"{self.directory}/p.html", **more)
        with open(f"{self.directory}/p.html", encoding="utf-8") as file:
            return file.read()

    def test_ports_of_several_files_join_by_id_and_equal_times_spread(self):
        records = [{"host": "h", "time": time, "interval": 1, "iteration": 0, "ports": ports, "overhead": {"used": 1.0}}
                   for time, ports in [(100, "ab"), (101, "ba"), (101, "b-"), (101, "c"), (99, "a")]]
        for i, record in enumerate(records):
            record["ports"] = [dict(name=p, switch="s", id=ord(p), mac="", rxmode=1, uplink="false",
                                    **{k: 10 * i + ord(p) for k in ("txpps", "txmbps", "txsize", "txeps", "rxpps",
                                                                    "rxmbps", "rxsize", "rxeps")})
                               if p != "-" else {} for p in record["ports"]]
        with open(f"{self.directory}/in", "w", encoding="utf-8") as file:
            file.write("\n".join(map(json.dumps, records)) + "\n")
        for words in ([], ["--no-compress"]):
            manifest, columns = decoded(self.page(f"{self.directory}/in", *words))
            self.assertEqual(manifest["times"], [99, 100, 101, 101.333333, 101.666667])
            self.assertEqual(dict(zip(manifest["ports"]["id"], columns["rxpps"])), {
                "97": [137, 97, 107, None, None], "98": [None, 98, 108, 118, None], "99": [None, None, None, None, 129]})
        with open(f"{self.directory}/in", "a", encoding="utf-8") as file:
            file.write(json.dumps(dict(records[0], host="other")) + "\n")
        self.assertIn(b"--host", lan_report("page", f"{self.directory}/in", status=1).stderr)
        self.assertEqual(len(decoded(self.page(f"{self.directory}/in", "--host", "other"))[0]["times"]), 1)

    def test_counts_of_an_interval_become_rates(self):
        rates, counts = (decoded(self.page(report(self.directory, "r", *words, step=5, count=4), *more))[1]
                         for words, more in ((["-A"], []), (["-A", "-a"], ["--counts"])))
        self.assertGreater(rates["rxpps"][0][0], 1000)
        for key, rows in rates.items():
            for rate, count in zip(sum(rows, []), sum(counts[key], [])):
                self.assertEqual(rate is None, count is None, key)
                self.assertAlmostEqual(rate or 0, count or 0, delta=1.01 if key.endswith("pps") else 0.06, msg=key)

    def test_what_does_not_fit_goes_in_order_and_the_head_tells(self):
        """600 records of 300 ports can't be a megabyte: details, then Mbit/s, then time go; no peak is lost."""
        text = ("host name=h pcpus=1\nself used=1\nvm v leader=9000 vcpus=1 used=300\nswitch s{i} count=1\n"
                "vnic switch=s0 port={100+i} vm=v model=parlan3 tx=1000 rx={2000+i} size={64+i} errors={i} count=300\n")
        path = report(self.directory, "r", "-A", "-t", "v", step=1, count=600, text=text)
        with open(path, encoding="utf-8") as file:
            lines = file.read()
        dice = random.Random(1)
        lines = re.sub(r'"([rt]xpps)": \d+', lambda key: f'"{key[1]}": {dice.randrange(1, 10**6)}', lines)
        with open(path, "w", encoding="utf-8") as file:
            file.write(lines)
        peaks = {}
        for id_, value in re.findall(r'"id": (\d+),.*\n.*"rxpps": (\d+)', lines):
            peaks[id_] = max(peaks.get(id_, 0), int(value))
        page = self.page(path, "--limit", "1")
        self.assertLess(len(page), 1 << 20)
        manifest, columns = decoded(page)
        self.assertEqual((manifest["details"], "rxmbps" in columns), ({}, False))
        self.assertGreater(manifest["every"], 1)
        self.assertEqual({i: max(row) for i, row in zip(manifest["ports"]["id"], columns["rxpps"])}, peaks)
        for most, mean in zip(columns["rxpps"], columns["rxpps~mean"]):
            self.assertTrue(all(a >= b > 0 for a, b in zip(most, mean)))
        head = page[:page.index("</header>")]
        for words in ("Only the columns of all ports", "rxmbps and txmbps are left out", "stands for"):
            self.assertIn(words, head)


class Browser(unittest.TestCase):
    @classmethod
    def setUpClass(cls):
        cls.directory = tempfile.mkdtemp()
        cls.addClassCleanup(shutil.rmtree, cls.directory)
        first = report(cls.directory, "r.json", "-A", "-t", "vqiWhVc")
        cls.records = [json.loads(line) for line in lan_report("records", first).stdout.splitlines()]
        cls.path = f"{cls.directory}/page.html"
        lan_report("page", first, "-o", cls.path)
        options = webdriver.ChromeOptions()
        options.binary_location = shutil.which("chromium")
        for flag in (*FLAGS, f"--user-data-dir={cls.directory}/profile"):
            options.add_argument(flag)
        options.set_capability("goog:loggingPrefs", {"browser": "ALL", "performance": "ALL"})
        cls.driver = webdriver.Chrome(service=Service(shutil.which("chromedriver")), options=options)
        cls.addClassCleanup(cls.driver.quit)
        cls.driver.set_script_timeout(60)

    def setUp(self):
        self.emulate(1280, 800)
        self.open()

    def emulate(self, width, height, **media):
        self.driver.execute_cdp_cmd("Emulation.setDeviceMetricsOverride", {
            "width": width, "height": height, "deviceScaleFactor": 1, "mobile": False})
        self.driver.execute_cdp_cmd("Emulation.setEmulatedMedia", {
            "media": media.get("media", ""),
            "features": [{"name": "prefers-color-scheme", "value": media.get("scheme", "light")}]})

    def open(self, address=""):
        self.driver.get("about:blank")
        self.driver.get_log("browser")
        self.driver.get_log("performance")
        self.driver.get(f"file://{self.path}{address}")
        self.run_js("return lanReport.ready.then(() => new Promise((done) => setTimeout(done, 100)))")

    def tearDown(self):
        """Whatever was done: no error, no request but for the page itself, nothing that its policy refused."""
        told = self.driver.get_log("browser")
        self.assertEqual([entry for entry in told if "willReadFrequently" not in entry["message"]], [])  # that is us
        asked = [json.loads(entry["message"])["message"] for entry in self.driver.get_log("performance")]
        urls = {event["params"]["request"]["url"].split("#")[0] for event in asked
                if event["method"] == "Network.requestWillBeSent"}
        self.assertLessEqual({url for url in urls if not url.startswith("blob:")}, {f"file://{self.path}"})
        self.assertEqual(self.run_js("return performance.getEntriesByType('resource').length"), 0)

    def run_js(self, script, *arguments):
        done = self.driver.execute_async_script(
            "const back = arguments[arguments.length - 1], given = [...arguments].slice(0, -1);"
            f"(async (...a) => {{ {script} }})(...given).then((value) => back([value]), (error) => back(String(error)))",
            *arguments)
        self.assertIsInstance(done, list, done)
        return done[0]

    def state(self):
        return self.run_js("return lanReport.state")

    def press(self, *keys):
        for key in keys:
            self.driver.switch_to.active_element.send_keys(key)
        time.sleep(0.3)

    def rows(self):
        return self.run_js("return [...document.querySelectorAll('#ports-box .map-label b')].map((e) => e.textContent)")

    def test_values_are_the_report_s(self):
        series = {}
        for number, record in enumerate(self.records):
            for place, port in enumerate(record["ports"]):
                identity = self.records[0]["ports"][place]["id"]
                for key, value in flat(port).items():
                    series.setdefault((str(identity), key), [None] * len(self.records))[number] = value
        self.assertGreater(len(series), 200)
        shown = self.run_js(
            "const out = []; for (const [id, key] of a[0]) out.push(await lanReport.series(id, key)); return out;",
            list(series))
        for (port, key), values in zip(series, shown):
            self.assertEqual(values, series[port, key], (port, key))
        pcpu = self.run_js("return lanReport.pcpu(2, 'cpu.used')")
        self.assertEqual(pcpu, [record["cpu"]["used"][2] for record in self.records])
        shown = self.run_js("return (await lanReport.histograms('100')).map((h) => [h.name, h.at(3)])")
        port = self.records[3]["ports"][1]
        wanted = [[f"vcpu.{i}.{h['name']}", {k: h[k] for k in ("count", "mean", "values")}]
                  for i, vcpu in enumerate(port["vcpu"]) for h in vcpu["histos"]["values"]]
        wanted += [[h["name"], {"count": h["count"], "mean": h["mean"], "values": [v[1] for v in h["values"]]}]
                   for h in port["histos"]]
        self.assertEqual(sorted(shown), sorted(wanted))

    def ink(self, plot, part):
        """Pixels in the colour of received packets, in the first or last third of a plot."""
        return self.run_js("""
            const canvas = document.querySelector(`#plot-${a[0]} canvas:not(.swatch)`);
            const from = Math.round(canvas.width * (a[1] ? 0.72 : 0.15)), data = canvas.getContext('2d')
              .getImageData(from, 0, Math.round(canvas.width * 0.25), canvas.height).data;
            let ink = 0;
            for (let i = 0; i < data.length; i += 4) {
              if (data[i + 3] > 200 && Math.max(...data.slice(i, i + 3)) - Math.min(...data.slice(i, i + 3)) > 60) ink++;
            }
            return ink;""", plot, part)

    def test_plots_and_maps_have_ink_and_a_gap_has_none(self):
        self.run_js("location.hash = 'port=100'; await new Promise((done) => setTimeout(done, 300))")
        for plot in ("A", "B", "C", "D", "E", "E2", "F"):
            self.assertGreater(self.ink(plot, 0) + self.ink(plot, 1), 30, plot)
        self.run_js("location.hash = 'port=101&at=1700000100'; await new Promise((done) => setTimeout(done, 300))")
        self.assertGreater(self.ink("E", 0), 30)
        self.assertEqual(self.ink("E", 1), 0)
        rows = self.run_js("""
            const canvas = document.querySelector('#ports-box canvas');
            return [...document.querySelectorAll('#ports-box .map-label b')].map((label, row) => {
              const alpha = (part) => canvas.getContext('2d').getImageData(canvas.width * part, 18 * row + 8, 1, 1).data[3];
              return [label.textContent, alpha(0.1), alpha(0.9)];
            });""")
        self.assertEqual(sorted(rows), sorted([["nic0", 255, 255], ["web1", 255, 255], ["db1", 255, 0], [HOSTILE, 255, 255]]))

    def test_search_order_and_keys(self):
        self.assertEqual(self.rows()[:2], ["web1", "nic0"])
        self.press("/", "s", "c", "r", "i")
        self.assertEqual(self.rows(), [HOSTILE])
        self.press(Keys.ENTER)
        self.assertEqual(self.driver.find_element("id", "port-name").text, HOSTILE)
        self.press(Keys.ESCAPE)
        self.assertEqual(len(self.rows()), 4)
        Select(self.driver.find_element("id", "sort")).select_by_visible_text("id")
        time.sleep(0.3)
        self.driver.execute_script("document.activeElement.blur()")
        self.assertEqual(self.rows(), ["nic0", "web1", "db1", HOSTILE])
        self.press(Keys.UP)
        self.assertEqual(self.driver.find_element("id", "port-name").text, "db1")
        before = self.state()
        self.press(Keys.LEFT)
        self.assertEqual(self.state()["record"], before["record"] - 1)
        self.press("+")
        half = self.state()
        self.assertAlmostEqual(half["to"] - half["from"], (before["to"] - before["from"]) / 2)
        scales = self.run_js("return [...document.querySelectorAll('#ports-axis span')].map((e) => e.textContent)")
        self.assertEqual(len(set(scales)), 3)
        self.press("0")
        self.assertEqual(self.state()["from"], before["from"])
        self.press("?")
        self.assertTrue(self.driver.find_element("id", "help").is_displayed())
        self.press(Keys.ESCAPE)
        self.assertIn("db1", self.driver.find_element("id", "live").get_attribute("textContent"))

    def test_drawing_with_the_mouse_zooms_everything_and_a_click_chooses(self):
        whole = self.state()
        plot = self.driver.find_element("css selector", "#plot-E .u-over")
        width = plot.size["width"]
        ActionChains(self.driver).move_to_element(plot).move_by_offset(-width // 4, 0).click_and_hold() \
            .move_by_offset(width // 8, 0).move_by_offset(width // 8, 0).release().perform()
        time.sleep(0.3)
        span = self.state()
        self.assertAlmostEqual((span["to"] - span["from"]) / (whole["to"] - whole["from"]), 0.25, delta=0.05)
        cells = self.driver.find_element("css selector", "#ports-box .map-cells")
        ActionChains(self.driver).double_click(cells).perform()
        time.sleep(0.3)
        self.assertEqual(self.state()["to"], whole["to"])
        ActionChains(self.driver).move_to_element_with_offset(
            cells, 0, -cells.size["height"] // 2 + 18 * self.rows().index("db1") + 9).click().perform()
        time.sleep(0.5)
        self.assertEqual(self.driver.find_element("id", "port-name").text, "db1")
        self.assertAlmostEqual(self.state()["record"], 15, delta=1)

    def test_uplink_single_values_and_turning_names(self):
        nic = dict(switch="s", mac="", rxmode=1, uplink="true", txmbps=1, txsize=9, txeps=0, rxmbps=1, rxsize=9, rxeps=0)
        ports = [dict(nic, name=f"nic{i}", id=i, txpps=10, rxpps=10, physnic={"devname": "", "rxeps": 5 * i % 7}) for i in range(3)]
        ports.append(dict(nic, name="\u202evm", id=9, uplink="false", txpps=1, rxpps=5))
        path = f"{self.directory}/strange"
        with open(path, "w", encoding="utf-8") as file:
            for i in range(80):
                record = {"host": "h", "time": 1700000000 + 10 * i, "interval": 10, "iteration": i, "ports": ports[:3] + ports[3 + i % 2:]}
                file.write(json.dumps(record) + "\n")
        lan_report("page", path, "-o", f"{path}.html")
        self.path = f"{path}.html"
        self.open("#port=9")
        self.assertEqual(self.driver.find_element("id", "port-name").text, "\\u{202e}vm")
        self.assertIn("nic1, worst of 3", self.driver.find_element("id", "plot-F").text)
        self.assertGreater(self.run_js("""const canvas = document.querySelector('#plot-E canvas:not(.swatch)');
            const { data } = canvas.getContext('2d').getImageData(60, 0, canvas.width - 60, canvas.height);
            let ink = 0;
            for (let i = 0; i < data.length; i += 4) ink += data[i + 3] > 200 && data[i + 2] - data[i] > 100;
            return ink;"""), 200, "points of rxpps")

    def test_the_address_restores_the_view(self):
        self.open("#port=102&at=1700000120&from=1700000100&to=1700000200&view=ready&sort=name&q=s")
        state = self.state()
        self.assertEqual((state["view"], state["sort"], state["query"], state["from"], state["to"]),
                         ("ready", "name", "s", 1700000100, 1700000200))
        self.assertEqual(self.driver.find_element("id", "port-name").text, HOSTILE)
        self.assertIn("22:15:20", self.driver.find_element("id", "at").text)
        self.press(Keys.RIGHT)
        address = self.driver.current_url
        self.assertIn("at=1700000130", address)
        self.open(address[address.index("#"):])
        self.assertEqual(self.state(), dict(state, record=state["record"] + 1))

    def test_sizes(self):
        for width, height in ((360, 640), (1280, 800), (1920, 1080)):
            self.emulate(width, height)
            self.open()
            boxes = self.run_js("""
                const parts = ['header', '#findings', '#ports', '#pcpus', '#port', '#plots', '#cursor'];
                return { wide: document.documentElement.scrollWidth, high: document.documentElement.scrollHeight,
                  boxes: parts.map((part) => document.querySelector(part).getBoundingClientRect().toJSON()) };""")
            self.assertLessEqual(boxes["wide"], width)
            if width > 900:
                self.assertLessEqual(boxes["high"], height)
            for i, one in enumerate(boxes["boxes"]):
                self.assertGreater(min(one["width"], one["height"]), 20)
                for other in boxes["boxes"][:i]:
                    apart = one["left"] >= other["right"] - 1 or other["left"] >= one["right"] - 1 \
                        or one["top"] >= other["bottom"] - 1 or other["top"] >= one["bottom"] - 1
                    self.assertTrue(apart, (width, one, other))

    def test_dark_page_and_paper(self):
        self.emulate(1280, 800, scheme="dark")
        time.sleep(0.3)
        look = "return [getComputedStyle(document.body).backgroundColor, " \
               "getComputedStyle(document.documentElement).getPropertyValue('--received').trim()]"
        self.assertEqual(self.run_js(look), ["rgb(20, 23, 26)", "#56b4e9"])
        self.run_js("dispatchEvent(new Event('beforeprint'))")
        self.assertEqual(self.run_js(look), ["rgb(255, 255, 255)", "#0072b2"])
        self.emulate(720, 1000, scheme="dark", media="print")
        for part, seen in (("findings", True), ("worst", True), ("plots", True), ("ports-box", False), ("search", False)):
            self.assertEqual(self.driver.find_element("id", part).is_displayed(), seen, part)
        self.emulate(1280, 800, scheme="dark")
        self.run_js("dispatchEvent(new Event('afterprint'))")
        self.assertEqual(self.run_js(look)[0], "rgb(20, 23, 26)")
        paper = self.driver.execute_cdp_cmd("Page.printToPDF", {"printBackground": True})
        self.assertGreater(len(base64.b64decode(paper["data"])), 20000)

    def test_reads_without_script(self):
        self.driver.execute_cdp_cmd("Emulation.setScriptExecutionDisabled", {"value": True})
        try:
            self.driver.get("about:blank")
            self.driver.get(f"file://{self.path}")
            text = self.driver.find_element("tag name", "body").text
        finally:
            self.driver.execute_cdp_cmd("Emulation.setScriptExecutionDisabled", {"value": False})
        for words in ("labhost", "30 records of 10 s", "web1 (100)", HOSTILE, "vSwitch0", "loses"):
            self.assertIn(words, text)
        self.assertNotIn("search", text)
        self.open()

    def test_csv_and_words_for_those_who_cannot_see(self):
        self.run_js("location.hash = 'port=101'; await new Promise((done) => setTimeout(done, 600))")
        self.driver.execute_cdp_cmd("Browser.setDownloadBehavior", {"behavior": "allow", "downloadPath": self.directory})
        for button, rows in (("save-port", 31), ("save-table", 5)):
            self.driver.find_element("id", button).click()
            for _ in range(50):
                files = glob.glob(f"{self.directory}/*.csv")
                if files:
                    break
                time.sleep(0.1)
            with open(files[0], encoding="utf-8", newline="") as file:
                table = list(csv.reader(file))
            os.remove(files[0])
            self.assertEqual(len(table), rows)
            self.assertEqual({len(row) for row in table}, {len(table[0])})
            if button == "save-port":
                rxpps = table[0].index("rxpps")
                self.assertEqual(table[1][:3], ["2023-11-14T22:13:30.000Z", "db1", "101"])
                self.assertEqual((table[2][rxpps], table[-1][rxpps]), (str(self.records[1]["ports"][2]["rxpps"]), ""))
            else:
                self.assertIn(HOSTILE, [row[0] for row in table])
        figure = self.driver.find_element("id", "plot-E")
        self.assertRegex(figure.get_attribute("aria-label"), r"Traffic of db1 in packets/s: rxpps at most [\d,]+ at 22:")
        self.assertEqual(len(figure.find_elements("css selector", ".unseen tbody tr")), 25)


if __name__ == "__main__":
    del sys.argv[1]
    try:
        import csv

        from selenium import webdriver
        from selenium.webdriver import ActionChains, Keys
        from selenium.webdriver.chrome.service import Service
        from selenium.webdriver.support.ui import Select
        missing = [tool for tool in ("chromium", "chromedriver") if shutil.which(tool) is None]
    except ImportError:
        missing = ["python3-selenium"]
    if missing:
        print("skipped: without", " and ".join(missing))
        sys.exit(77)
    unittest.main(verbosity=1)
