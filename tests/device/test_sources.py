"""What can be read off the sources of the login program and the launcher."""

import os
import re
import unittest

from device import HERE

DEVICE = os.path.join(HERE, "..", "..", "device")
LONGEST_FILE, LONGEST_FUNCTION = 199, 40  # lines


def sources():
    for folder in ("login", "launcher"):
        for name in sorted(os.listdir(f"{DEVICE}/{folder}")):
            if name.endswith((".cpp", ".h")):
                with open(f"{DEVICE}/{folder}/{name}", encoding="utf-8") as file:
                    yield f"{folder}/{name}", file.read().splitlines()


def functions(lines):
    """Line number and length of each function, as the formatter writes them."""
    begin = None
    for number, line in enumerate(lines, 1):
        if re.match(r"[A-Za-z\[].*\(", line) and begin is None:
            begin = number
        if begin is not None and line.endswith(";") and not line.startswith(" "):
            begin = None
        if line == "}" and begin is not None:
            yield begin, number - begin + 1
            begin = None


class Sources(unittest.TestCase):
    def test_small(self):
        found = list(sources())
        self.assertGreater(len(found), 20)
        count = 0
        for name, lines in found:
            self.assertLessEqual(len(lines), LONGEST_FILE, name)
            for begin, length in functions(lines):
                count += 1
                self.assertLessEqual(length, LONGEST_FUNCTION, f"{name}:{begin}")
        self.assertGreater(count, 100)

    def test_what_is_not_called(self):
        """Threads: the library changes the ids of the whole process. The signature check with a
        key from elsewhere: pads in the wrong place of a key are the empty key. The environment:
        nothing but the request is read from it. libcurl: the library gives up a reference too much."""
        for name, lines in sources():
            text = "\n".join(lines)
            for word in ("std::thread", "pthread_create", "std::async", "JwtHMACVerify",
                         "system(", "popen(", "curl_"):
                self.assertNotIn(word, text, name)
            if name not in ("login/cgi.cpp", "launcher/main.cpp"):
                self.assertNotIn("getenv", text, name)


if __name__ == "__main__":
    unittest.main()
