"""Headless Chromium, controlled with the DevTools protocol over a pipe."""

import json
import os
import shutil
import subprocess
import tempfile


class Browser:
    """Opens one page. As a context manager, ends the browser."""

    def __init__(self):
        program = os.environ.get("CHROMIUM") or shutil.which("chromium")
        if not program:
            raise SystemExit("page test: there is no chromium: script/test installs it")
        self.profile = tempfile.mkdtemp(prefix="tavrel_chromium.")
        to_browser, self.commands = os.pipe()
        self.replies, from_browser = os.pipe()
        # The browser reads commands from descriptor 3 and writes to 4.
        self.process = subprocess.Popen(
            ["sh", "-c", f'exec "$@" 3<&{to_browser} 4>&{from_browser}', "sh", program, "--headless",
             "--no-sandbox", "--remote-debugging-pipe", "--disable-gpu", "--disable-dev-shm-usage",
             "--no-first-run", "--hide-scrollbars", f"--user-data-dir={self.profile}", "about:blank"],
            pass_fds=(to_browser, from_browser), stdout=subprocess.DEVNULL,
            stderr=subprocess.DEVNULL, stdin=subprocess.DEVNULL)
        os.close(to_browser)
        os.close(from_browser)
        self.reader = os.fdopen(self.replies, "rb")
        self.number, self.session, self.events = 0, None, []
        target = next(t for t in self.call("Target.getTargets")["targetInfos"] if t["type"] == "page")
        self.session = self.call("Target.attachToTarget", targetId=target["targetId"],
                                 flatten=True)["sessionId"]
        for domain in ("Page", "Network", "Runtime", "Accessibility"):
            self.call(domain + ".enable")

    def __enter__(self):
        return self

    def __exit__(self, *_):
        self.process.terminate()
        self.process.wait()
        shutil.rmtree(self.profile, ignore_errors=True)

    def fail(self):
        self.__exit__()
        raise SystemExit("page test: chromium ended: does 'chromium --headless' run here?")

    def receive(self):
        message = bytearray()
        while not message.endswith(b"\0"):
            byte = self.reader.read(1) if not self.reader.peek(1) else self.take()
            if not byte:
                self.fail()
            message += byte
        return json.loads(message[:-1])

    def take(self):
        """The part of a message that has arrived."""
        ready = self.reader.peek()
        end = ready.find(b"\0") + 1
        return self.reader.read(end or len(ready))

    def call(self, method, **parameters):
        self.number += 1
        command = {"id": self.number, "method": method, "params": parameters}
        if self.session:
            command["sessionId"] = self.session
        try:
            os.write(self.commands, json.dumps(command).encode() + b"\0")
        except BrokenPipeError:
            self.fail()
        while True:
            reply = self.receive()
            if reply.get("id") == self.number:
                if "error" in reply:
                    raise AssertionError(f"{method}: {reply['error']}")
                return reply["result"]
            self.events.append(reply)

    def wait_for(self, method):
        while True:
            for event in self.events:
                if event.get("method") == method:
                    self.events.remove(event)
                    return event["params"]
            self.events.append(self.receive())

    def open(self, file, width, scheme):
        """Loads a file; afterwards, `events` has the page's requests."""
        self.call("Emulation.setDeviceMetricsOverride", width=width, height=900,
                  deviceScaleFactor=1, mobile=width < 500)
        self.call("Emulation.setEmulatedMedia",
                  features=[{"name": "prefers-color-scheme", "value": scheme}])
        self.events.clear()
        self.call("Page.navigate", url="file://" + os.path.abspath(file))
        self.wait_for("Page.loadEventFired")

    def evaluate(self, expression):
        result = self.call("Runtime.evaluate", expression=expression, returnByValue=True,
                           awaitPromise=True)
        if "exceptionDetails" in result:
            raise AssertionError(result["exceptionDetails"])
        return result["result"].get("value")
