"""Runs corvex-report, and reads its page as a person does: by what is written in it."""

import json
import os
import shutil
import subprocess
import tempfile
import unittest
from html.parser import HTMLParser
from pathlib import Path
from typing import Any

from fixture import PROPERTIES, make_capture, put, put_properties, stamp

PROGRAM = Path(__file__).parent.parent / "corvex-report"
# Root reads everything; without these rights it reads no more than any other owner of a file.
BEYOND_MODES = "-dac_override,-dac_read_search"


class Page(HTMLParser):
    """The texts of a page: what is odd, the cells of each table row, and all of it."""

    def __init__(self, html: str) -> None:
        super().__init__()
        self.html = html
        self.tags: list[str] = []
        self.odd: list[str] = []
        self.rows: list[list[str]] = []
        self.text = ""
        self._target: list[str] | None = None
        self.feed(html)

    def handle_starttag(self, tag: str, attrs: list[tuple[str, str | None]]) -> None:
        self.tags.append(tag)
        if tag == "tr":
            self.rows.append([])
        if tag in ("td", "th", "li"):
            self._target = self.odd if tag == "li" else self.rows[-1]
            self._target.append("")

    def handle_endtag(self, tag: str) -> None:
        if tag in ("td", "th", "li"):
            self._target = None

    def handle_data(self, data: str) -> None:
        if self.tags[-1:] != ["style"]:
            self.text += data
        if self._target is not None:
            self._target[-1] += data

    def row(self, name: str) -> list[str]:
        """The cells of the time line's row of that name, without the bars."""
        found = [row for row in self.rows if len(row) == 5 and row[0].startswith(name)]
        return [name, *found[0][2:]]


def run(*arguments: str | Path, cwd: Path | None = None) -> "subprocess.CompletedProcess[str]":
    as_owner = ["setpriv", f"--bounding-set={BEYOND_MODES}", f"--inh-caps={BEYOND_MODES}"]
    return subprocess.run(
        [*(as_owner if os.geteuid() == 0 else []), PROGRAM, *arguments],
        capture_output=True,
        text=True,
        errors="surrogateescape",
        cwd=cwd,
        timeout=60,
    )


class ReportTest(unittest.TestCase):
    """Each test has a fresh capture, alone in its directory."""

    def setUp(self) -> None:
        self.directory = Path(tempfile.mkdtemp(prefix="corvex-report-"))
        self.addCleanup(shutil.rmtree, self.directory)
        self.parent = self.directory / "pulled"
        self.capture = make_capture(self.parent)

    def calm(self) -> None:
        """Leaves nothing that tells of an incident."""
        for folder in ("tombstones", "dropbox", "anr"):
            shutil.rmtree(self.capture / folder)

    def assert_says(self, page: Page, *texts: str) -> None:
        for text in texts:
            self.assertTrue(text in page.text, f"the page does not say: {text}")

    def report(self) -> Page:
        output = self.directory / "page" / "page.html"
        output.parent.mkdir(exist_ok=True)
        done = run(self.capture, "-o", output)
        self.assertEqual((done.returncode, done.stderr), (0, ""), done.stderr)
        return Page(output.read_text("utf-8"))

    def incidents(self) -> list[dict[str, Any]]:
        """What the capture is said to tell of, by --json."""
        done = run("--json", self.capture)
        self.assertEqual((done.returncode, done.stderr), (0, ""), done.stderr)
        found: list[dict[str, Any]] = json.loads(done.stdout)["incidents"]
        return found

    def bare(self, begun: float, end: float, files: dict[str, bytes]) -> Page:
        """Of a capture of nothing but some files, each written until its end."""
        shutil.rmtree(self.capture)
        name = f"KVBR_2--{stamp(begun, '%Y-%m-%d-%H-%M-%S')}_current"
        self.capture = self.parent / name
        version = "ro.build.ota.versionname"
        zone = {"persist.sys.timezone": "Europe/Helsinki"}
        put_properties(self.capture, zone | {version: PROPERTIES[version]})
        put(self.capture / "versionNumber", PROPERTIES[version].encode().ljust(92, b"\0"), begun)
        for path, data in files.items():
            put(self.capture / path, data, end)
        return self.report()
