# SPDX-License-Identifier: BSD-2-Clause
"""A real Chromium, driven by its own driver over the W3C WebDriver protocol."""
import json
import os
import subprocess
import tempfile
import time
import urllib.request

ELEMENT = "element-6066-11e4-a52e-4f735466cecf"
CHROMIUM = ["--headless=new", "--no-sandbox", "--disable-gpu", "--disable-dev-shm-usage", "--window-size=1100,900"]


class Browser:
    def __init__(self):
        self.folder = tempfile.TemporaryDirectory()
        self.log = open(os.path.join(self.folder.name, "log"), "w+")
        self.driver = subprocess.Popen(["chromedriver", "--port=0"], stdout=subprocess.PIPE, stderr=self.log, text=True)
        line = next(line for line in self.driver.stdout if "started successfully on port" in line)
        self.url = "http://127.0.0.1:" + line.rstrip(".\n").rsplit(" ", 1)[1]
        options = {"goog:chromeOptions": {"args": CHROMIUM + ["--user-data-dir=" + self.folder.name]},
                   "goog:loggingPrefs": {"browser": "ALL"}}
        session = self.ask("POST", "/session", {"capabilities": {"alwaysMatch": options}})
        self.url += "/session/" + session["sessionId"]

    def close(self):
        self.ask("DELETE", "")
        self.driver.terminate()
        self.driver.communicate()
        self.log.close()
        self.folder.cleanup()

    def ask(self, method, path, body=None):
        data = json.dumps(body or {}).encode() if method == "POST" else None
        request = urllib.request.Request(self.url + path, data, {"Content-Type": "application/json"}, method=method)
        try:
            with urllib.request.urlopen(request, timeout=60) as answer:
                return json.load(answer)["value"]
        except urllib.error.HTTPError as error:
            raise AssertionError(error.read().decode()) from None

    def open(self, url):
        self.ask("POST", "/url", {"url": url})

    def run(self, script, *values):
        return self.ask("POST", "/execute/sync", {"script": script, "args": list(values)})

    def chromium(self, command, **values):
        return self.ask("POST", "/goog/cdp/execute", {"cmd": command, "params": values})

    def wait(self, script, *values):
        """What the script gives, as soon as it is something."""
        end = time.monotonic() + 20
        while not (value := self.run("return " + script, *values)):
            if time.monotonic() > end:
                raise AssertionError(f"not within 20 s: {script}\n" + self.run("return document.body.innerText"))
            time.sleep(0.02)
        return value

    def type(self, selector, text):
        element = self.run("return document.querySelector(arguments[0])", selector)[ELEMENT]
        self.ask("POST", f"/element/{element}/value", {"text": text})

    def click(self, selector):
        element = self.run("return document.querySelector(arguments[0])", selector)[ELEMENT]
        self.ask("POST", f"/element/{element}/click")

    def problems(self):
        return [entry["message"] for entry in self.ask("POST", "/se/log", {"type": "browser"})]
