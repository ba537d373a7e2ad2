"""A headless browser that a test looks at pages with."""

import base64
import json
import os
import pathlib
import shutil
import subprocess
import tempfile

FLAGS = ["--headless", "--no-sandbox", "--disable-gpu", "--disable-quic", "--no-first-run",
         "--disable-background-networking", "--disable-component-update", "--disable-sync", "--remote-debugging-pipe"]


def program():
    """The browser's file; nothing where there is none."""
    return shutil.which("chromium")


class Browser:
    """One page, driven through the two pipes that the browser takes commands from and answers on."""

    def __init__(self):
        self.folder = tempfile.mkdtemp()
        to_browser, self.commands = os.pipe()
        self.answers, from_browser = os.pipe()

        def give_pipes():
            # The browser expects them as 3 and 4. Out of the way first: they may have each other's place.
            reading, writing = os.dup(to_browser), os.dup(from_browser)
            while min(reading, writing) < 5:
                reading, writing = os.dup(reading), os.dup(writing)
            os.dup2(reading, 3)
            os.dup2(writing, 4)

        self.process = subprocess.Popen([program(), *FLAGS, f"--user-data-dir={self.folder}", "about:blank"],
                                        stdin=subprocess.DEVNULL, stdout=subprocess.DEVNULL, stderr=subprocess.DEVNULL,
                                        close_fds=False, preexec_fn=give_pipes)
        os.close(to_browser)
        os.close(from_browser)
        self.number, self.buffer, self.session = 0, b"", None
        self.complaints = []  # what the console and the page's errors said
        self.requests = []  # addresses that the page asked for
        target = self.call("Target.createTarget", url="about:blank")["targetId"]
        self.session = self.call("Target.attachToTarget", targetId=target, flatten=True)["sessionId"]
        for domain in ["Page", "Runtime", "Log", "Network"]:
            self.call(domain + ".enable")

    def close(self):
        self.process.kill()
        self.process.wait()
        os.close(self.commands)
        os.close(self.answers)
        shutil.rmtree(self.folder, ignore_errors=True)

    def receive(self):
        while b"\0" not in self.buffer:
            chunk = os.read(self.answers, 1 << 16)
            if not chunk:
                raise EOFError("the browser has ended")
            self.buffer += chunk
        message, _, self.buffer = self.buffer.partition(b"\0")
        message = json.loads(message)
        method, facts = message.get("method"), message.get("params", {})
        if method == "Runtime.exceptionThrown":
            self.complaints.append(facts["exceptionDetails"].get("exception", {}).get("description", str(facts)))
        elif method == "Runtime.consoleAPICalled" or method == "Log.entryAdded":
            self.complaints.append(json.dumps(facts.get("entry") or facts["args"]))
        elif method == "Network.requestWillBeSent":
            self.requests.append(facts["request"]["url"])
        return message

    def call(self, method, **parameters):
        self.number += 1
        message = {"id": self.number, "method": method, "params": parameters}
        if self.session:
            message["sessionId"] = self.session
        os.write(self.commands, json.dumps(message).encode() + b"\0")
        while True:
            answer = self.receive()
            if answer.get("id") == self.number:
                if "error" in answer:
                    raise RuntimeError(f"{method}: {answer['error']}")
                return answer["result"]

    def wait_for(self, method):
        while self.receive().get("method") != method:
            pass

    def look(self, width, height=900, dark=False):
        self.call("Emulation.setDeviceMetricsOverride", width=width, height=height, deviceScaleFactor=1, mobile=width < 600)
        self.call("Emulation.setEmulatedMedia", features=[{"name": "prefers-color-scheme", "value": "dark" if dark else "light"}])

    def open(self, file):
        self.call("Page.navigate", url=pathlib.Path(file).resolve().as_uri())
        self.wait_for("Page.loadEventFired")

    def ask(self, script):
        """What the script's last expression gives, once it is there."""
        answer = self.call("Runtime.evaluate", expression=script, awaitPromise=True, returnByValue=True, userGesture=True)
        if "exceptionDetails" in answer:
            raise RuntimeError(f"{script}: {answer['exceptionDetails']}")
        return answer["result"].get("value")

    def press(self, key):
        for kind in ["keyDown", "keyUp"]:
            self.call("Input.dispatchKeyEvent", type=kind, key=key)

    def screenshot(self, file, whole=False):
        picture = self.call("Page.captureScreenshot", captureBeyondViewport=whole)
        pathlib.Path(file).write_bytes(base64.b64decode(picture["data"]))
