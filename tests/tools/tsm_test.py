#!/usr/bin/env python3
# SPDX-License-Identifier: BSD-2-Clause
"""otrp-tsm as an operator meets it, with real devices: exit codes, standard streams, files left.

The programs, with what runs them where this machine cannot, are in $OTRP_DEVICE and $OTRP_TSM.
"""
import base64
import contextlib
import hashlib
import http.server
import json
import os
import resource
import shutil
import signal
import subprocess
import tempfile
import threading
import unittest

DEVICE, TSM = (os.environ[name].split() for name in ("OTRP_DEVICE", "OTRP_TSM"))
TAID = "77a11e7a000000000000000000000001"


class Operator(unittest.TestCase):
    """A fresh folder with a TSM in ./tsm; its devices are made as they are named."""

    @classmethod
    def setUpClass(cls):
        cls.made = tempfile.mkdtemp()  # a TSM and a device that it knows, to start from
        for words in (TSM + ["init", "--tsmid", "tsm1"],
                      TSM + ["manage", "--state", "d", "get-device-state"]):
            subprocess.run(words, cwd=cls.made, check=True, capture_output=True)
        with open(f"{cls.made}/device.json", "w") as file:
            subprocess.run(DEVICE + ["--state", "d", "info"], cwd=cls.made, check=True, stdout=file)

    @classmethod
    def tearDownClass(cls):
        shutil.rmtree(cls.made)

    def setUp(self):
        self.folder = tempfile.mkdtemp()
        self.addCleanup(shutil.rmtree, self.folder)
        os.rmdir(self.folder)
        shutil.copytree(self.made, self.folder)

    def path(self, name):
        return os.path.join(self.folder, name)

    def write(self, name, text):
        with open(self.path(name), "wb") as file:
            file.write(text if isinstance(text, bytes) else text.encode())

    def read(self, name):
        with open(self.path(name), "rb") as file:
            return file.read()

    def run_words(self, words, code, text="", stdout=subprocess.PIPE):
        """Whatever is printed must have `text` in it."""
        done = subprocess.run(words, cwd=self.folder, stdout=stdout, stderr=subprocess.PIPE)
        done.out, done.err = done.stdout or b"", done.stderr.decode(errors="replace")
        self.assertEqual(done.returncode, code, f"{words}\n{done.err}")
        self.assertIn(text, done.err + done.out.decode(errors="replace"), words)
        return done

    def tsm(self, line, code=0, text="", **more):
        return self.run_words(TSM + line.split(), code, text, **more)

    def device(self, line, code=0, text="", **more):
        return self.run_words(DEVICE + ["--state", "d"] + line.split(), code, text, **more)

    def manage(self, line, code=0, text="", **more):
        return self.tsm("manage --state d " + line, code, text, **more)

    def request(self, line, name, **more):
        return self.tsm(f"request --device device.json -o {name} {line}", **more)

    def response(self, line, code=0, text=""):
        return self.tsm("response --device device.json " + line, code, text)

    def send(self, message, name):
        return self.device(f"send {message} {name} -o {name}.answer")

    def kept(self, name):
        [device] = os.listdir(self.path("tsm/devices"))
        return f"tsm/devices/{device}/{name}"


@contextlib.contextmanager
def serving(answer):
    """A server on this machine; `answer` gets method and body, and gives a reply or None."""
    class Handler(http.server.BaseHTTPRequestHandler):
        def do_GET(self):
            body = self.rfile.read(int(self.headers.get("Content-Length", 0)))
            status, text, headers = answer(f"{self.command} {self.path}", body) or (0, b"", {})
            if not status:
                return  # hangs up
            self.send_response(status)
            for name, value in {"Content-Length": len(text), **headers}.items():
                self.send_header(name, str(value))
            self.end_headers()
            self.wfile.write(text)
        do_POST = do_GET

        def log_message(self, *words):
            pass
    with http.server.ThreadingHTTPServer(("127.0.0.1", 0), Handler) as server:
        threading.Thread(target=server.serve_forever, daemon=True).start()
        yield f"http://127.0.0.1:{server.server_address[1]}"
        server.shutdown()


class OverHttp(Operator):
    def serve(self, state):
        started = subprocess.Popen(DEVICE + ["--state", state, "serve", "--listen", "127.0.0.1:0"],
                                   cwd=self.folder, stdout=subprocess.PIPE, stderr=subprocess.DEVNULL)
        self.addCleanup(started.stdout.close)
        self.addCleanup(started.wait)
        self.addCleanup(started.terminate)
        return started.stdout.readline().decode().strip()

    def test_a_served_device_is_managed_as_one_in_a_directory(self):
        url = self.serve("d")
        self.tsm(f"manage --url {url}/ get-device-state")  # known from --state
        self.tsm(f"manage --url {url} create-sd --sp sp --sd sd --sp-cert text", 0, "SD sd")
        self.write("file", os.urandom(30000))
        self.tsm("image pack file -o image")
        self.tsm(f"manage --url {url}/otrp --image-out back install-ta --sp sp --sd sd --ta {TAID} "
                 "--ta-version 1 --image image", 0, f"TA {TAID}")
        self.assertEqual(self.read("back"), self.read("image"))
        self.tsm(f"manage --url {url} create-sd --sp sp --sd sd", 1, "OTRP_SD_EXISTS")

    def test_the_key_of_a_device_is_not_taken_from_its_address(self):
        url = self.serve("e")
        unknown = self.tsm(f"manage --url {url} get-device-state", 2, "this TSM does not know")
        self.assertEqual((unknown.out, len(os.listdir(self.path("tsm/devices")))), (b"", 1))
        self.tsm(f"manage --url {url} --device device.json get-device-state", 3)  # d's, not e's
        self.tsm("manage --state f --device device.json get-device-state", 2, "has the key")
        with open(self.path("e.json"), "w") as file:
            subprocess.run(["curl", "-s", url + "/info"], stdout=file, check=True)
        self.tsm(f"manage --url {url} --device e.json get-device-state")
        self.tsm(f"manage --url {url} get-device-state")

    def test_what_an_address_says_is_told_and_not_believed(self):
        self.request("get-device-state", "asked")
        self.send("get-device-state", "asked")
        earlier, info = self.read("asked.answer"), self.read("device.json")
        waiting = self.read(self.kept("requests.json"))
        otrp = {"Content-Type": "application/otrp+json"}
        for code, text, answer in (
                (3, "answers another request", (200, earlier, otrp)),
                (3, "not one JSON object", (200, b"<html>", {})),
                (1, "without a response", (200, b"", otrp)),
                (1, "409: more to say", (400, b'{"message":"409: more to say","code":"0x1"}', {})),
                (1, "404 Not Found: expected the service of a device", (404, b"<html>", {})),
                (1, "the device may have done it", None)):
            with self.subTest(text), serving(
                    lambda call, body: (200, info, {}) if "GET" in call else answer) as url:
                out = self.tsm(f"manage --url {url} get-device-state", code, text).out
                self.assertEqual(out, b"")
        self.assertEqual(json.loads(self.read(self.kept("requests.json")))["waiting"],
                         json.loads(waiting)["waiting"])
        self.tsm("manage --url http://127.0.0.1:1 get-device-state", 1, "no connection")

    def test_an_image_that_was_changed_on_its_way_back_is_not_kept(self):
        self.manage("create-sd --sp sp --sd sd --sp-cert text")
        self.write("file", "code")
        self.tsm("image pack file -o image")

        def on_the_way(call, body):
            if call.startswith("GET"):
                return 200, self.read("device.json") if "info" in call else b"another", {}
            self.write("sent", body)
            self.send("install-ta", "sent")
            return 200, self.read("sent.answer"), {"OTrP-TA-Image": "/images/1"}
        with serving(on_the_way) as url:
            self.tsm(f"manage --url {url} --image-out back install-ta --sp sp --sd sd --ta {TAID} "
                     "--ta-version 1 --image image", 3, "not the one that it was sent")
        self.assertFalse(os.path.exists(self.path("back")))
        self.tsm("show", 0, f"TA {TAID}")


class Fleet(Operator):
    def setUp(self):
        super().setUp()
        self.tsm("device add d1 --state d")

    def names(self):
        return [line.split()[0] for line in self.tsm("device list").out.decode().splitlines()]

    def test_a_name_is_one_device_and_its_key_the_one_that_was_told(self):
        self.tsm("device add d1 --state e", 2, "d1 is another device")
        self.tsm("device add d2 --state d", 2, "is called d1 already")
        for name in ("all", "-x", "a/b", "a*", "x" * 65, ".", ""):
            self.run_words(TSM + ["device", "add", "--state", "d", "--", name], 2, "bad device name")
        self.tsm("device add d2", 2, "no device is named")
        self.tsm("manage --on d get-device-state", 2, "did you mean d1?")
        self.tsm("device add d2 --state missing --existing", 2)
        self.tsm("device add d1 --device device.json")  # and no way to it any more
        self.tsm("manage --on d1 get-device-state", 2, "no way to d1")
        self.tsm("request --on d1 -o asked get-device-state")
        self.send("get-device-state", "asked")
        self.tsm("response asked.answer --on d1")
        info = self.read("device.json")
        stranger = self.run_words(DEVICE + ["--state", "e", "info"], 0).out
        with serving(lambda call, body: (200, stranger, {})) as url:
            self.tsm(f"device add web --url {url}", 0, "proves nothing")
            self.tsm(f"device add d1 --url {url}", 2, "d1 is another device")
        with serving(lambda call, body: (200, info, {})) as url:
            self.assertEqual(self.tsm(f"device add d1 --url {url}/").err, "")
        self.assertIn("its own word", self.tsm("device list web").out.decode())
        self.tsm("device rm w*")
        self.assertEqual((self.names(), len(os.listdir(self.path("tsm/devices")))), (["d1"], 1))
        self.write("tsm/inventory.json", '{"devices": {"d1": {"key": "../x"}}}')
        self.tsm("device list", 2, "inventory.json is damaged")

    def test_several_devices_are_managed_at_once(self):
        self.write("list", "# more\n\n" + "".join(f"d{i} --state more/{i}\n" for i in range(2, 6)))
        self.assertEqual(self.tsm("device add --list list -j 3").out, b"4 added\n")
        self.assertEqual(self.names(), ["d1", "d2", "d3", "d4", "d5"])
        self.assertEqual(self.tsm("manage --on all -j 3 get-device-state").out, b"5 pass\n")
        create = "create-sd --sp sp --sd sd --sp-cert text"
        self.assertEqual(self.tsm(f"manage --on d[23] --on d2 -j 9 {create}").out, b"2 pass\n")
        shutil.rmtree(self.path("more/5"))
        mixed = self.tsm(f"manage --on d* -j 2 {create}", 2)
        self.assertEqual(mixed.out, b"2 pass, 1 not asked: d5, 2 refused: OTRP_SD_EXISTS (d2, d3)\n")
        self.assertEqual(sorted(line[:14] for line in mixed.err.splitlines()),
                         ["otrp-tsm: d%d: " % i for i in (2, 3, 5)])
        told = {row["device"]: row for row in json.loads(
            self.tsm(f"manage --on d* --json {create}", 2).out)}
        self.assertEqual(told["d2"]["answer"]["reason"]["code"], "0xdead0002")
        self.assertEqual((told["d5"]["exit"], "answer" in told["d5"]), (2, False))
        self.tsm(f"manage --on d1 {create}", 1, "the device refused create-sd")  # told in full
        self.assertEqual(self.tsm("show --summary").out, b"5 devices\n     4  sp/sd  (d1, d2, d3, "
                         b"d4)\n     1  no security domains  (d5)\n")
        self.assertTrue(self.tsm("show --on d4").out.startswith(b"d4  device "))
        for line in ("manage --on x* get-device-state", "manage --on d1 --state d get-device-state",
                     "manage --on all --image-out x get-device-state", "show --on d1 --on dd",
                     "request --on d* get-device-state", "manage --on all -j 0 get-device-state",
                     "device add d9 --list list", "device rm d9"):
            self.assertEqual(self.tsm(line, 2).out, b"", line)
        told = {**json.loads(self.read("device.json")), "name": "d1"}
        self.write("list", json.dumps(told))
        self.tsm("device add --list list --url http://127.0.0.1:1", 2, "expected {name}")
        self.tsm("device add --list list --url http://127.0.0.1:1/{name}/otrp", 0, "1 added")
        self.tsm("manage --on d1 get-device-state", 1, "http://127.0.0.1:1/d1/otrp: no connection")
        for line in ("d9", "d9 --state", "d9 --what x", "a/b --state x", "d9 --state x --url y",
                     '{"name": "d9"}', json.dumps({**told, "name": "a/b"})):
            self.write("list", "d8 --state more/8\n" + line)
            self.tsm("device add --list list", 2, "list, line 2: ")
        self.assertFalse(os.path.exists(self.path("more/8")))

    def test_a_thousand_devices_are_shown_on_a_screen(self):
        device, state = json.loads(self.read("device.json")), self.read(self.kept("dsi.json"))
        entries = {}
        for i in range(1000):
            folder = f"tsm/devices/{i:016x}"
            os.mkdir(self.path(folder))
            self.write(f"{folder}/device.json", json.dumps({**device, "device_id": str(i)}))
            sd = f'{{"name":"sd{i % 40}","spid":"sp","talist":[]}}'.encode()
            self.write(f"{folder}/dsi.json", state.replace(b'"sd":[]', b'"sd":[' + sd + b"]"))
            entries[f"n{i}"] = {"key": f"{i:016x}", "state": f"/nowhere/{i}"}
        self.write("tsm/inventory.json", json.dumps({"devices": entries}))
        lines = self.tsm("show --summary").out.decode().splitlines()
        self.assertEqual((lines[0], lines[1].split()[0], lines[-1]),
                         ("1001 devices", "25", "and 551 in other states"))
        self.assertTrue(len(lines) < 24 and max(map(len, lines)) < 101, lines)
        self.assertEqual(len(self.tsm("device list").out.splitlines()), 1000)


class Plans(Operator):
    def setUp(self):
        super().setUp()
        self.write("payload", "app")
        self.tsm("image pack payload -o app.img")
        self.write("sp.pem", "certificate")
        self.plan("1")

    def plan(self, version, **more):
        app = {"taid": TAID, "version": version, "image": "app.img"}
        domain = {"sd": "wallet", "sp": "bank", "cert_file": "sp.pem", "apps": [app]}
        self.write("plan.json", json.dumps({"domains": [domain], **more}))

    def orders(self, line, code=0):
        done = json.loads(self.tsm(line + " --json", code).out)
        return [(step["message"], step.get("outcome")) for step in done["messages"]]

    def test_a_device_is_brought_to_its_plan_and_then_left_alone(self):
        self.manage("create-sd --sd old --sp else --sp-cert text:x")
        new = ["create-sd", "install-ta"]
        self.assertEqual(self.orders("plan plan.json --state d"), [(name, None) for name in new])
        self.assertEqual(self.orders("apply plan.json --state d"), [(name, "pass") for name in new])
        self.tsm("apply plan.json --state d", 0, "as planned")
        self.assertEqual(self.orders("apply plan.json --state d"), [])
        self.plan("2", others="delete")
        self.assertEqual(self.orders("apply plan.json --state d"),
                         [("delete-sd", "pass"), ("update-ta", "pass")])
        self.tsm("device add d1 --state d")
        self.tsm("apply plan.json --on all", 0, "1 as planned")
        self.manage("create-sd --sd other --sp bank")
        self.tsm("--home two init --tsmid tsm2")
        self.plan("1")
        self.tsm("--home two apply plan.json --state d", 1, '"wallet" is managed by another TSM')
        self.tsm("plan plan.json", 2, "expected")
        self.write("plan.json", "{")
        self.tsm("apply plan.json --state d", 2, "plan.json:1: not JSON")

    def test_what_a_lost_answer_left_is_found_by_the_next(self):
        lost = []

        def serve(call, body):
            name = next(iter(json.loads(body)))
            self.write("asked", body)
            done = self.device("send asked")
            if name in ("CreateSDRequest", "InstallTARequest") and name not in lost:
                lost.append(name)
                return None
            return 200, done.out, {}

        with serving(serve) as url:
            for _ in range(6):
                done = subprocess.run(TSM + ["apply", "plan.json", "--url", url, "--device",
                                             "device.json"], cwd=self.folder, capture_output=True)
                if done.returncode == 0:
                    break
            self.assertEqual((done.returncode, lost), (0, ["CreateSDRequest", "InstallTARequest"]), done.stderr)
            self.assertEqual(self.orders(f"apply plan.json --url {url} --device device.json"), [])


class Answers(Operator):
    def delete_sd(self, name):
        self.request("delete-sd --sd sd --delete-ta true", name)
        self.send("delete-sd", name)

    def test_an_earlier_answer_is_not_taken_for_that_of_a_later_request(self):
        self.manage("create-sd --sp sp --sd sd --sp-cert text")
        self.delete_sd("one")
        self.response("one.answer")
        self.manage("create-sd --sp sp --sd sd --sp-cert text")
        state = self.read(self.kept("dsi.json"))
        self.request("delete-sd --sd sd --delete-ta true", "two")  # and never sent
        for line in ("one.answer", "one.answer --request two", "one.answer --request one"):
            self.assertEqual(self.response(line, 3).out, b"")
        self.assertEqual(self.read(self.kept("dsi.json")), state)
        self.response("one.answer --accept-old", 0, "tied by")
        self.assertNotEqual(self.read(self.kept("dsi.json")), state)

    def test_each_waiting_request_is_answered_once_and_in_order(self):
        for name in ("one", "two"):
            self.request("get-device-state", name)
            self.send("get-device-state", name)
            self.manage("create-sd --sp sp --sd %s --sp-cert text" % name)
        self.response("two.answer", 3, "older")  # than what create-sd brought
        self.response("one.answer --accept-old")
        self.response("two.answer")
        self.response("two.answer", 3, "no request that waits")

    def test_answers_without_ids_are_tied_to_the_only_request_of_their_kind(self):
        self.manage("create-sd --sp sp --sd sd --sp-cert text")
        stale = self.path(self.kept("dsi.json")) + ".old"
        shutil.copy(self.path(self.kept("dsi.json")), stale)
        self.manage("create-sd --sp sp --sd more --sp-cert text")
        for name in ("one", "two"):
            self.request(f"--dsi {stale} update-sd --sp sp --sd sd", name)
        self.send("update-sd", "one")
        self.response("one.answer", 3, "carries no IDs, and 2 requests wait")
        self.response("one.answer --request one", 1, "tied by its kind alone")
        self.response("one.answer", 1, "tied by its kind alone")  # two's it could be
        self.response("one.answer", 3, "no request that waits")

    def test_ta_info_is_tied_by_sp_and_ta(self):
        self.manage("create-sd --sp sp --sd sd --sp-cert text")
        self.write("file", "code")
        self.tsm("image pack file -o image")
        self.manage(f"install-ta --sp sp --sd sd --ta {TAID} --ta-version 1 --image image")
        self.request(f"get-ta-info --sp sp --ta {TAID}", "one")
        self.send("get-ta-info", "one")
        self.request(f"get-ta-info --sp sp --ta {TAID[:-1]}2", "two")
        self.response("one.answer --request two", 3)
        self.response("one.answer", 0, "SP and TA alone")
        self.response("one.answer", 3)

    def test_what_does_not_verify_is_not_shown(self):
        self.request("get-device-state", "one")
        self.send("get-device-state", "one")
        answer = self.read("one.answer")
        self.write("tampered", answer[:60] + (b"B" if answer[60:61] == b"A" else b"A") + answer[61:])
        for flags in ("", " --json", " --accept-old"):
            self.assertEqual(self.response("tampered --dsi-out dsi.json" + flags, 3).out, b"")
        self.assertFalse(os.path.exists(self.path("dsi.json")))
        self.response("one.answer --dsi-out dsi.json", 0, "no service providers")
        self.assertEqual(self.read("dsi.json"), self.read(self.kept("dsi.json")))


class Requests(Operator):
    def test_wrong_input_gets_one_line_and_leaves_no_file(self):
        device = " --device device.json -o made.json"
        sd = "request create-sd --sp sp --sp-cert c --sd "
        self.write("file", "code")
        for line in (
                "fly", "explain 0xdead0003", "request", "request get-device-state -o made.json",
                "request get-device-state --device missing.json -o made.json",
                "request get-device-state --device file -o made.json",
                "request get-device-state --device device.json -o missing/made.json",
                'request get-device-state --rid a"b' + device,
                sd + "sd --dsi device.json" + device, sd + "sd --sp-cert \udcff" + device,
                sd + "s\1" + device, sd + "\udcff" + device, sd + "x" * 57 + device,
                "request install-ta --sd sd --sp sp --ta short --ta-version 1 --image file" + device,
                "request update-ta --sd sd --sp sp --ta short --ta-version 1 --image file" + device,
                f"request install-ta --sd sd --sp sp --ta {TAID} --ta-version 1 --image file" + device,
                "request delete-sd --sd sd --delete-ta maybe" + device,
                "response missing.json --device device.json", "response file --device device.json",
                "image show file", "image pack missing -o made.json",
                "--home nowhere request get-device-state" + device,
                "--home new init --tsmid a\1b", "--home new init --ca device.json",
                "manage --state file get-device-state --home nowhere"):
            with self.subTest(line):
                outcome = self.tsm(line, 3 if line.startswith("response file") else 2)
                self.assertEqual(outcome.out, b"")
                self.assertRegex(outcome.err, r"\Aotrp-tsm: [^\n]+\n\Z")
                for name in ("made.json", "new", "nowhere"):
                    self.assertFalse(os.path.exists(self.path(name)))

    def test_requests_are_made_from_the_kept_state_or_a_named_one(self):
        self.manage("create-sd --sp sp --sd sd --sp-cert text --dsi-out dsi.json", 0, "SD sd")
        expected = hashlib.sha256(base64.b64encode(self.read("dsi.json"))).hexdigest()
        for source in ("", " --dsi dsi.json"):
            self.request("delete-sd --sd sd --delete-ta true" + source, "made")
            payload = json.loads(self.read("made"))["DeleteSDRequest"]["payload"]
            members = json.loads(base64.urlsafe_b64decode(payload + "=="))["DeleteSDTBSRequest"]
            self.assertEqual(members["dsihash"], expected)
        self.write("file", "code")
        self.tsm("image pack file -o image")
        install = f"install-ta --sd sd --ta {TAID} --ta-version 1 --image image --sp "
        self.request(install + "sp", "made")
        self.request(install + "other", "made", code=2, text="no AIK")
        os.remove(self.path("tsm/ca-tsm.pem"))
        self.request(install + "sp", "made", code=2, text="CA-TSM key's signature")


    def test_a_certificate_is_a_file_or_plainly_a_text(self):
        self.write("certs.txt", "from a file")
        os.mkdir(self.path("certs"))
        create = "request create-sd --sp sp --sd sd --device device.json -o made --sp-cert "
        for value in ("bank.pem", "./bank", "/bank", "certs/bank", "../x", "certs"):
            self.tsm(create + value, 2, value)
            self.tsm(create + "text:" + value)
        self.tsm(create + "certs.txt")
        for value in ("MII/ab+c=", "1.0", "text", "x." + "y" * 300):
            self.tsm(create + value)

    def test_the_agent_is_heard_when_something_failed(self):
        create = "create-sd --sp sp --sd sd --sp-cert text"
        self.assertEqual(self.manage(create).err, "")
        self.assertIn("ERR [", self.manage(create, 1).err)
        self.assertIn("ERR [", self.manage("--trace create-sd --sp sp --sd more").err)
        self.tsm("manage --state typo --existing get-device-state", 2, "no device in typo")
        self.assertFalse(os.path.exists(self.path("typo")))
        self.tsm("manage --state e get-device-state", 0, f"note: made a new device in {self.folder}/e")


class HomeFolder(Operator):
    def test_damage_is_named_with_its_remedy(self):
        state = self.kept("dsi.json")
        self.write(state, "{}")
        create = "create-sd --sp sp --sd sd --sp-cert text"
        self.manage(create, 2, f"{state} is damaged: expected a device state document; "
                    "get-device-state replaces it")
        self.tsm("show", 2, state)
        self.manage("get-device-state")
        self.manage(create)
        for name, remedy in (("requests.json", "remove it"), ("device.json", "remove it")):
            self.write(self.kept(name), "{")
            self.tsm("show", 2 if name == "device.json" else 0)
            self.manage("get-device-state", 2 if name == "requests.json" else 0)
            os.remove(self.path(self.kept(name)))
            self.manage("get-device-state")

    def test_what_cannot_be_read_is_not_taken_for_empty(self):
        self.tsm("--home nowhere show", 2, "no TSM lives in nowhere")
        shutil.rmtree(self.path("tsm/devices"))
        os.symlink("devices", self.path("tsm/devices"))  # a loop, which root cannot read either
        self.tsm("show", 2, "tsm/devices")
        os.symlink("loop", self.path("loop"))
        self.tsm("--home loop/tsm show", 2, "loop/tsm")

    def test_init_is_repeated_and_wins_once(self):
        self.tsm("init", 2, "lives in")
        key = self.read("tsm/tsm-key.pem")
        for name in ("tsm/tsm-key.pem", "tsm/ca-tsm.pem"):
            self.assertEqual(os.stat(self.path(name)).st_mode & 0o777, 0o600)
        os.remove(self.path("tsm/tsm.json"))  # the last file that is written
        self.tsm("init")
        self.assertEqual(self.read("tsm/tsm-key.pem"), key)
        started = [subprocess.Popen(TSM + ["--home", "new", "init"], cwd=self.folder,
                                    stdout=subprocess.PIPE, stderr=subprocess.DEVNULL)
                   for _ in range(4)]
        outputs = [process.communicate()[0].decode() for process in started]
        self.assertEqual(sorted(process.returncode for process in started), [0, 2, 2, 2])
        shown = "".join(outputs).split()[1]
        self.assertEqual(json.loads(self.read("new/tsm.json"))["tsmid"], shown)

    def test_device_files_hold_keys_that_devices_have(self):
        def key(n, e):
            fields = [n.to_bytes(-(-n.bit_length() // 8), "big"), e.to_bytes(3, "big").lstrip(b"\0")]
            return b"".join(len(field).to_bytes(4, "little") + field for field in fields)
        modulus = (1 << 2047) + 12345
        for n, e, code in ((modulus, 65537, 0), (modulus, 1, 2), (modulus, 2, 2),
                           (modulus >> 1536 | 1, 65537, 2), (modulus << 4096 | 1, 3, 2)):
            text = base64.urlsafe_b64encode(key(n, e)).decode().rstrip("=")
            self.write("device.json", json.dumps({"device_id": "x", "tee_public_key": text}))
            self.request("get-device-state", "made", code=code)


class Streams(Operator):
    def test_closed_streams_are_not_taken_by_files(self):
        for closed in ("1>&-", "2>&-", "0<&- 1>&- 2>&-"):
            for words in (DEVICE + ["--state d info"], TSM + ["manage --state d get-device-state"]):
                self.run_words(["sh", "-c", " ".join(words) + " " + closed], 2 if "1" in closed else 0)
        self.assertEqual([name for name in os.listdir(self.path("d")) if b"OTrP" in self.read("d/" + name)
                          or b"device_id" in self.read("d/" + name)], [])
        self.manage("get-device-state")

    def test_no_core_is_dumped_with_keys_in_it(self):
        def dumps_core(words):
            unlimited = (resource.RLIM_INFINITY, resource.RLIM_INFINITY)
            with subprocess.Popen(
                    words, cwd=self.folder, stdin=subprocess.PIPE, stdout=subprocess.PIPE,
                    env=os.environ | {"ASAN_OPTIONS": "disable_coredump=0"},
                    preexec_fn=lambda: resource.setrlimit(resource.RLIMIT_CORE, unlimited)) as process:
                process.stdin.write(b"reopen\n")
                process.stdin.flush()
                process.stdout.readline()
                os.kill(process.pid, signal.SIGQUIT)
                _, status = os.waitpid(process.pid, 0)
                process.returncode = os.waitstatus_to_exitcode(status)
            return os.WCOREDUMP(status)
        if len(DEVICE) > 1 or not dumps_core(["cat"]):  # the emulator is no program of ours
            self.skipTest("nothing dumps core here")
        self.assertFalse(dumps_core(DEVICE + ["--state", "d", "session"]))

    def test_no_answer_is_lost(self):
        for name in ("one", "two"):
            self.request("create-sd --sp sp --sd %s --sp-cert text" % name, name)
        self.device("send create-sd one -o nowhere/answer", 2, "cannot write nowhere/answer")
        self.manage("--dsi-out nowhere/dsi get-device-state", 2, "cannot write nowhere/dsi")
        self.assertNotIn(b"one", self.device("objects list").out)
        printed = self.device("send create-sd one -o /dev/full", 2, "went to standard output")
        self.write("answer", printed.out)
        self.response("answer", 0, "SD one")
        printed = self.manage("--dsi-out /dev/full get-device-state", 2, "went to standard output")
        self.assertIn(b"GetDeviceTEEStateResponse", printed.out)

    def test_an_image_that_is_too_large_is_called_so(self):
        self.manage("create-sd --sp sp --sd sd --sp-cert text")
        self.write("file", bytes(1_600_000))
        self.tsm("image pack file -o image")
        line = f"install-ta --sp sp --sd sd --ta {TAID} --ta-version 1 --image image"
        self.manage(line, 1, "image is too large")
        self.request(line, "one")
        self.device("send install-ta one", 1, "image is too large")

    def test_help_that_cannot_be_written_fails(self):
        with open("/dev/full", "wb") as full:
            for program in (DEVICE, TSM):
                for word in ("--help", "--version"):
                    self.run_words(program + [word], 2, stdout=full)


if __name__ == "__main__":
    unittest.main()
