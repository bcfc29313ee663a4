"""Runs the tests of a folder; inside scripts/sandbox, called by scripts/check device (this folder)
and scripts/check browser (browser/).

  run.py FOLDER BUILD-FOLDER [PATTERN]
"""

import os
import sys
import time
import unittest

HERE = os.path.dirname(os.path.abspath(__file__))


class Result(unittest.TextTestResult):
    """One line per test as it ends, with its time."""

    def startTest(self, test):
        self._begun = time.monotonic()
        self._bad = len(self.failures) + len(self.errors)
        super().startTest(test)

    def stopTest(self, test):
        good = len(self.failures) + len(self.errors) == self._bad
        print(f"{'ok  ' if good else 'FAIL'} {time.monotonic() - self._begun:5.1f}s "
              f"{type(test).__name__}.{test._testMethodName}", flush=True)
        super().stopTest(test)


def main():
    os.environ["SSOCLIENT_BUILD"] = os.path.abspath(sys.argv[2])
    sys.path.insert(0, HERE)
    loader = unittest.TestLoader()
    if len(sys.argv) > 3:
        loader.testNamePatterns = [f"*{sys.argv[3]}*"]
    suite = loader.discover(os.path.abspath(sys.argv[1]))
    result = unittest.TextTestRunner(sys.stdout, verbosity=0, resultclass=Result).run(suite)
    # A test with parts may fail in several of them.
    failed = len({getattr(test, "test_case", test).id()
                  for test, _ in result.failures + result.errors})
    print(f"{result.testsRun - failed} passed, {failed} failed")
    return 0 if result.wasSuccessful() and result.testsRun > 0 else 1


if __name__ == "__main__":
    sys.exit(main())
