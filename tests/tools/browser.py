"""A page in headless chromium, driven over a pair of pipes: evaluate, press keys, take pictures."""
import base64
import json
import subprocess
import tempfile
from pathlib import Path


class Browser:
    """One page of one browser. `messages` has what its console and its errors said."""

    def __init__(self, program="chromium", height=900):
        self.messages = []
        self.count = 0
        self.folder = tempfile.TemporaryDirectory(ignore_cleanup_errors=True)
        # The browser reads from 3 and writes on 4.
        self.process = subprocess.Popen(
            ["sh", "-c", 'exec "$0" "$@" 3<&0 4>&1 </dev/null >/dev/null 2>&1', program,
             "--headless", "--no-sandbox", "--disable-gpu", "--remote-debugging-pipe",
             f"--user-data-dir={self.folder.name}", "--hide-scrollbars", "about:blank"],
            stdin=subprocess.PIPE, stdout=subprocess.PIPE)
        self.session = {}
        targets = self.call("Target.getTargets")["targetInfos"]
        page = next(target["targetId"] for target in targets if target["type"] == "page")
        attached = self.call("Target.attachToTarget", targetId=page, flatten=True)
        self.session = {"sessionId": attached["sessionId"]}
        for domain in ("Page", "Runtime", "Log", "Network"):
            self.call(f"{domain}.enable")
        self.height = height
        self.resize(1280)

    def __enter__(self):
        return self

    def __exit__(self, *_):
        self.process.terminate()
        self.process.communicate()
        self.folder.cleanup()

    def read(self):
        text = b""
        while not text.endswith(b"\0"):
            byte = self.process.stdout.read(1)
            if not byte:
                raise RuntimeError("the browser has ended")
            text += byte
        message = json.loads(text[:-1])
        method, params = message.get("method"), message.get("params", {})
        if method in ("Runtime.consoleAPICalled", "Runtime.exceptionThrown", "Log.entryAdded"):
            self.messages.append(json.dumps(params))
        elif method == "Network.requestWillBeSent":
            url = params["request"]["url"]
            if not url.startswith(("file:", "about:")):
                self.messages.append(f"a request to {url}")
        return message

    def call(self, method, **params):
        self.count += 1
        message = {"id": self.count, "method": method, "params": params, **self.session}
        self.process.stdin.write(json.dumps(message).encode() + b"\0")
        self.process.stdin.flush()
        while True:
            reply = self.read()
            if reply.get("id") == self.count:
                if "error" in reply:
                    raise RuntimeError(f"{method}: {reply['error']['message']}")
                return reply["result"]

    def open(self, path):
        """Opens a file and waits until it is drawn."""
        self.call("Page.navigate", url=Path(path).resolve().as_uri())
        while self.read().get("method") != "Page.loadEventFired":
            pass
        self.settle()

    def resize(self, width):
        self.call("Emulation.setDeviceMetricsOverride", width=width, height=self.height,
                  deviceScaleFactor=1, mobile=width < 600)

    def evaluate(self, expression):
        result = self.call("Runtime.evaluate", expression=expression, returnByValue=True,
                           awaitPromise=True)
        if "exceptionDetails" in result:
            raise RuntimeError(json.dumps(result["exceptionDetails"]))
        return result["result"].get("value")

    def press(self, *keys):
        for key in keys:
            text = {"text": key} if len(key) == 1 else {"text": "\r"} if key == "Enter" else {}
            code = {"Tab": 9, "Enter": 13}.get(key, 0)
            self.call("Input.dispatchKeyEvent", type="keyDown", key=key, windowsVirtualKeyCode=code,
                      **text)
            self.call("Input.dispatchKeyEvent", type="keyUp", key=key)

    def move(self, x, y):
        self.call("Input.dispatchMouseEvent", type="mouseMoved", x=x, y=y)

    def tap(self, x, y):
        self.call("Emulation.setTouchEmulationEnabled", enabled=True)
        self.call("Input.dispatchTouchEvent", type="touchStart", touchPoints=[{"x": x, "y": y}])
        self.call("Input.dispatchTouchEvent", type="touchEnd", touchPoints=[])
        self.call("Emulation.setTouchEmulationEnabled", enabled=False)
        self.settle()

    def settle(self):
        """Waits for what is due in the next frame."""
        self.evaluate("""new Promise((done) =>
            requestAnimationFrame(() => requestAnimationFrame(done)))""")

    def screenshot(self, path):
        picture = self.call("Page.captureScreenshot", format="png")["data"]
        Path(path).write_bytes(base64.b64decode(picture))
