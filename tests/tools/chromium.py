"""A browser for the tests: Debian's Chromium, driven through chromedriver's HTTP interface."""

import base64
import http.server
import json
import re
import shutil
import subprocess
import tempfile
import threading
import urllib.error
import urllib.request

BROWSER = shutil.which("chromium")
DRIVER = shutil.which("chromedriver")
MISSING = "" if BROWSER and DRIVER else "not run: chromium and chromedriver are not installed"

FLAGS = (
    "--headless",
    "--no-sandbox",
    "--disable-gpu",
    "--disable-quic",
    "--no-first-run",
    "--disable-background-networking",
    "--disable-component-update",
    "--disable-sync",
    "--hide-scrollbars",
)


class FileServer:
    """Serves the files of a folder on a free local port. A `with` statement's object.

    Parts of files are served too, because a video element asks for them when it seeks.
    """

    def __init__(self, folder):
        class Handler(http.server.SimpleHTTPRequestHandler):
            def __init__(self, *arguments):
                super().__init__(*arguments, directory=str(folder))

            def log_message(self, *_):
                """Requests are not worth a line."""

            def do_GET(self):
                part = re.fullmatch(r"bytes=(\d+)-(\d*)", self.headers.get("Range", ""))
                if not part:
                    super().do_GET()
                    return
                with open(self.translate_path(self.path), "rb") as file:
                    data = file.read()
                first, last = int(part[1]), int(part[2] or len(data) - 1)
                self.send_response(206)
                self.send_header("Content-Type", self.guess_type(self.path))
                self.send_header("Content-Range", f"bytes {first}-{last}/{len(data)}")
                self.send_header("Content-Length", str(last + 1 - first))
                self.end_headers()
                try:
                    self.wfile.write(data[first : last + 1])
                except (BrokenPipeError, ConnectionResetError):
                    pass  # the browser has enough

        self.server = http.server.ThreadingHTTPServer(("127.0.0.1", 0), Handler)
        self.address = f"http://127.0.0.1:{self.server.server_port}/"

    def __enter__(self):
        threading.Thread(target=self.server.serve_forever, daemon=True).start()
        return self

    def __exit__(self, *_):
        self.server.shutdown()
        self.server.server_close()


class Chromium:
    """One browser with one page and an empty profile. A `with` statement's object."""

    def __enter__(self):
        self.profile = tempfile.TemporaryDirectory()
        self.driver = subprocess.Popen(
            [DRIVER, "--port=0"], stdout=subprocess.PIPE, stderr=subprocess.DEVNULL, text=True
        )
        try:
            self.session = self._start()
        except BaseException:
            self._stop_driver()
            raise
        return self

    def __exit__(self, *_):
        try:
            self._request("DELETE", self.session)
        finally:
            self._stop_driver()

    def open(self, address):
        """Opens a page and waits until it is loaded."""
        self._post("/url", {"url": address})

    def run(self, script, *arguments):
        """What a script returns; it runs as the body of an async function of `arguments`."""
        wrapped = (
            "const done = arguments[arguments.length - 1];"
            f"(async function() {{ {script} }})(...Array.from(arguments).slice(0, -1))"
            ".then(value => done({value}), error => done({error: String(error)}));"
        )
        answer = self._post("/execute/async", {"script": wrapped, "args": list(arguments)})
        if "error" in answer:
            raise RuntimeError(answer["error"])
        return answer.get("value")

    def show_as(self, width, height, dark=False):
        """Gives the page this size in CSS pixels and tells it which colours its reader prefers."""
        self._command(
            "Emulation.setDeviceMetricsOverride",
            {"width": width, "height": height, "deviceScaleFactor": 1, "mobile": width < 600},
        )
        scheme = {"name": "prefers-color-scheme", "value": "dark" if dark else "light"}
        self._command("Emulation.setEmulatedMedia", {"features": [scheme]})

    def screenshot(self):
        """The whole page, below the window too, as a PNG file's bytes."""
        answer = self._command("Page.captureScreenshot", {"captureBeyondViewport": True})
        return base64.b64decode(answer["data"])

    def messages(self):
        """What scripts and the browser have complained about since the last call."""
        return [entry["message"] for entry in self._post("/se/log", {"type": "browser"})
                if entry["level"] in ("SEVERE", "WARNING")]

    def _start(self):
        for line in self.driver.stdout:
            port = re.search(r"started successfully on port (\d+)", line)
            if port:
                self.root = f"http://127.0.0.1:{port[1]}"
                break
        options = {"binary": BROWSER, "args": [*FLAGS, f"--user-data-dir={self.profile.name}"]}
        capabilities = {"goog:chromeOptions": options, "goog:loggingPrefs": {"browser": "ALL"},
                        "timeouts": {"script": 60000}}
        wanted = {"capabilities": {"alwaysMatch": capabilities}}
        return "/session/" + self._request("POST", "/session", wanted)["sessionId"]

    def _stop_driver(self):
        self.driver.terminate()
        self.driver.wait(timeout=30)
        self.driver.stdout.close()
        self.profile.cleanup()

    def _command(self, name, parameters):
        return self._post("/goog/cdp/execute", {"cmd": name, "params": parameters})

    def _post(self, path, content):
        return self._request("POST", self.session + path, content)

    def _request(self, method, path, content=None):
        data = None if content is None else json.dumps(content).encode()
        request = urllib.request.Request(
            self.root + path, data, {"Content-Type": "application/json"}, method=method
        )
        # A proxy that the environment names is not for this machine's own addresses.
        opener = urllib.request.build_opener(urllib.request.ProxyHandler({}))
        try:
            with opener.open(request, timeout=120) as answer:
                return json.load(answer)["value"]
        except urllib.error.HTTPError as error:
            raise RuntimeError(json.load(error)["value"]["message"]) from error
