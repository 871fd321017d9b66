#!/usr/bin/python3
"""run.py MODULE [CASE]: runs tests, and tells of them in the form of the C++ tests, so that they
are counted together."""

import sys
import time
import unittest
from pathlib import Path


class Result(unittest.TextTestResult):
    """A case of several parts has failed when one of them has."""

    def startTest(self, test: unittest.TestCase) -> None:
        super().startTest(test)
        self._start = time.monotonic()
        self._outcome = "      OK"
        self._tell(" RUN     ", test)

    def stopTest(self, test: unittest.TestCase) -> None:
        super().stopTest(test)
        failed = any(
            test is getattr(case, "test_case", case) for case, _ in self.failures + self.errors
        )
        outcome = "  FAILED " if failed else f" {self._outcome}"
        self._tell(outcome, test, f" ({(time.monotonic() - self._start) * 1000:.0f} ms)")

    def addSkip(self, test: unittest.TestCase, reason: str) -> None:
        super().addSkip(test, reason)
        self._outcome = " SKIPPED"
        print(reason)

    def _tell(self, what: str, test: unittest.TestCase, end: str = "") -> None:
        print(f"[{what} ] {'.'.join(test.id().split('.')[-2:])}{end}", flush=True)


if __name__ == "__main__":
    sys.path.insert(0, str(Path(__file__).parent))
    sys.dont_write_bytecode = True
    suite = unittest.defaultTestLoader.loadTestsFromNames(sys.argv[1:])
    runner = unittest.TextTestRunner(resultclass=Result, verbosity=0)
    sys.exit(not runner.run(suite).wasSuccessful())
