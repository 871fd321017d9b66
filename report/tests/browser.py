"""A page in a real browser, which tells what it asked for, what it complained of and what it shows."""

import base64
import json
import tempfile
from pathlib import Path
from typing import Any

from selenium import webdriver
from selenium.webdriver.chrome.service import Service

ARGUMENTS = (
    "--headless=new --no-sandbox --disable-gpu --disable-dev-shm-usage --disable-quic"
    " --no-first-run --disable-background-networking --disable-component-update --disable-sync"
    " --hide-scrollbars"
).split()
SENT = "Network.requestWillBeSent"


class Browser:
    def __init__(self) -> None:
        prefix = "corvex-report-browser-"
        self._home = tempfile.TemporaryDirectory(prefix=prefix, ignore_cleanup_errors=True)
        options: Any = webdriver.ChromeOptions()
        options.binary_location = "/usr/bin/chromium"
        for argument in [*ARGUMENTS, f"--user-data-dir={self._home.name}/profile"]:
            options.add_argument(argument)
        options.set_capability("goog:loggingPrefs", {"browser": "ALL", "performance": "ALL"})
        # There may be no home to write to.
        places = dict.fromkeys(("HOME", "XDG_CONFIG_HOME", "TMPDIR"), self._home.name)
        service = Service("/usr/bin/chromedriver", env={"PATH": "/usr/bin:/bin", **places})
        self._driver: Any = webdriver.Chrome(service=service, options=options)

    def close(self) -> None:
        self._driver.quit()
        self._home.cleanup()

    def open(self, page: Path, width: int, scheme: str = "light") -> None:
        """As on a screen of that width."""
        screen = {"width": width, "height": 900, "deviceScaleFactor": 1, "mobile": width < 600}
        media = [{"name": "prefers-color-scheme", "value": scheme}]
        self._driver.execute_cdp_cmd("Emulation.setDeviceMetricsOverride", screen)
        self._driver.execute_cdp_cmd("Emulation.setEmulatedMedia", {"features": media})
        self._driver.get(page.as_uri())

    def run(self, script: str) -> Any:
        return self._driver.execute_script(script)

    def complaints(self) -> list[str]:
        return [entry["message"] for entry in self._log("browser")]

    def requests(self) -> list[str]:
        """The addresses that were asked for, but for those of the browser's own first page."""
        events = (json.loads(entry["message"])["message"] for entry in self._log("performance"))
        sent = [event["params"] for event in events if event["method"] == SENT]
        ours = [one for one in sent if not one["documentURL"].startswith("chrome:")]
        return [one["request"]["url"] for one in ours]

    def _log(self, name: str) -> Any:
        return self._driver.get_log(name)

    def save(self, path: Path, height: int = 0) -> None:
        """A picture of the page, whole or down to a height."""
        width, whole = self.run("return [innerWidth, document.documentElement.scrollHeight]")
        clip = {"x": 0, "y": 0, "width": width, "height": height or whole, "scale": 1}
        shot = self._driver.execute_cdp_cmd(
            "Page.captureScreenshot", {"clip": clip, "captureBeyondViewport": True}
        )
        path.parent.mkdir(parents=True, exist_ok=True)
        path.write_bytes(base64.b64decode(shot["data"]))
