"""The page in a browser: nothing overflows, nothing is fetched, everything can be seen."""

import itertools
import os
import shutil
import unittest
from pathlib import Path
from typing import Any, ClassVar

from fixture import BEGUN, RING, packets, put
from reporting import ReportTest, run
from trouble import trouble

try:
    from browser import Browser

    MISSING = "" if shutil.which("chromedriver") else "chromium-driver is not installed"
except ImportError as error:
    MISSING = str(error)

PICTURES = Path(os.environ.get("CORVEX_REPORT_PICTURES", "/tmp/corvex-report-pictures"))
WIDTHS = (360, 1280)
READABLE = 4.5  # contrast of text
VISIBLE = 3.0  # contrast of what is drawn

# The least contrast of any text, or of what is drawn, with the paper.
CONTRAST = """
const luminance = text => {
  const parts = text.match(/[\\d.]+/g).slice(0, 3).map(c => c / 255)
    .map(c => c <= 0.03928 ? c / 12.92 : ((c + 0.055) / 1.055) ** 2.4);
  return 0.2126 * parts[0] + 0.7152 * parts[1] + 0.0722 * parts[2];
};
const paper = getComputedStyle(document.body).backgroundColor;
const contrast = colour => {
  const [dark, light] = [luminance(paper), luminance(colour)].sort((a, b) => a - b);
  return (light + 0.05) / (dark + 0.05);
};
const texts = [...document.querySelectorAll('body *')].filter(e =>
  [...e.childNodes].some(n => n.nodeType === 3 && n.data.trim()) && e.tagName !== 'title');
const colours = texts.map(e => getComputedStyle(e)[e.namespaceURI.endsWith('svg') ? 'fill' : 'color']);
const drawn = [...document.querySelectorAll('.bar, .mark')].map(e => getComputedStyle(e).fill)
  .concat([...document.querySelectorAll('.trace')].map(e => getComputedStyle(e).stroke));
return {paper, text: Math.min(...colours.map(contrast)), drawn: Math.min(...drawn.map(contrast))};
"""

# The marks of each chart that cannot be seen in it, and how many there are in all.
MARKS = """
const hidden = [];
let count = 0;
for (const chart of document.querySelectorAll('svg[role=img]')) {
  const frame = chart.getBoundingClientRect();
  for (const mark of chart.querySelectorAll('.bar, .mark, .trace')) {
    const box = mark.getBoundingClientRect();
    const inside = box.left >= frame.left - 5 && box.right <= frame.right + 5
      && box.top >= frame.top - 5 && box.bottom <= frame.bottom + 5;
    count += 1;
    if (!inside || box.width + box.height < 2) hidden.push(mark.outerHTML.slice(0, 120));
  }
}
return {hidden, count};
"""


@unittest.skipIf(MISSING, MISSING)
class PageTest(ReportTest):
    browser: ClassVar[Any]

    @classmethod
    def setUpClass(cls) -> None:
        cls.browser = Browser()
        cls.addClassCleanup(cls.browser.close)

    def spoil(self) -> None:
        """A capture with something to tell."""
        trouble(self.capture)
        put(self.capture / RING[2], packets(BEGUN + 430, BEGUN + 595, 0.3)[:-40], BEGUN + 595)
        (self.capture / "radio.log").unlink()
        (self.parent / "KVBR_1--2026-11-22-22-04-11_current").mkdir()
        put(self.capture / "dropbox" / ("long_" * 40), b"x", BEGUN + 9)

    def page(self) -> Path:
        self.report()
        return self.directory / "page" / "page.html"

    def test_layout_and_visibility(self) -> None:
        self.check(self.page(), "healthy")
        self.spoil()
        self.check(self.page(), "odd")

    def check(self, page: Path, name: str, marks: int = 50) -> None:
        """In every width and scheme; keeps a picture of each."""
        for width, scheme in itertools.product(WIDTHS, ("light", "dark")):
            with self.subTest(name=name, width=width, scheme=scheme):
                self.browser.open(page, width, scheme)
                self.assertEqual(self.browser.complaints(), [])
                self.assertEqual(self.browser.requests(), [page.as_uri()])
                sizes = self.browser.run(
                    "return [innerWidth, document.documentElement.scrollWidth]"
                )
                self.assertEqual(sizes, [width, width])
                contrast = self.browser.run(CONTRAST)
                is_dark = sum(map(int, contrast["paper"][4:-1].split(","))) < 384
                self.assertEqual(is_dark, scheme == "dark")
                self.assertGreaterEqual(contrast["text"], READABLE)
                self.assertGreaterEqual(contrast["drawn"] or VISIBLE, VISIBLE)
                found = self.browser.run(MARKS)
                self.assertEqual(found["hidden"], [])
                self.assertGreaterEqual(found["count"], marks)
                self.browser.save(PICTURES / f"{name}-{width}-{scheme}.png")

    def test_unfolded_and_hostile(self) -> None:
        path = self.capture / "anr" / "<svg onload=alert(1)>" / ("w" * 250)
        put(path, b"Cmd line: " + b"m" * 99, BEGUN)
        for number in range(30):
            put(self.capture / "dropbox" / f"tag_{number}@1795386830{number:03}.txt", b"x", BEGUN)
        self.spoil()
        page = self.page()
        for width in WIDTHS:
            self.browser.open(page, width)
            self.browser.run("document.querySelectorAll('details').forEach(d => d.open = true)")
            anchors = "[...document.querySelectorAll('a[href^=\"#\"]')].map(a => a.hash.slice(1))"
            lost = f"return {anchors}.filter(id => !document.getElementById(id))"
            self.assertEqual(self.browser.run(lost), [])
            self.assertEqual(self.browser.run("return document.documentElement.scrollWidth"), width)
            self.assertEqual(self.browser.complaints(), [])
            loaded = "return document.querySelectorAll('[onload]').length"
            self.assertEqual(self.browser.run(loaded), 0)

    def test_index(self) -> None:
        trouble(self.capture)
        shutil.copytree(self.capture, self.parent / "KVBR_1--2026-11-22-10-00-00")
        index = self.directory / "index.html"
        self.assertEqual(run(self.parent, "-o", index).returncode, 0)
        self.check(index, "index", marks=0)

    def test_picture_for_the_readme(self) -> None:
        self.spoil()
        self.browser.open(self.page(), 1120)
        self.browser.save(PICTURES / "report.png", 980)
        self.assertLess((PICTURES / "report.png").stat().st_size, 200 * 1024)
