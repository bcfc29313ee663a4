"""What the tests of the doctor's diagnosis share: a run of the doctor, and its report."""

import json
import re
import unittest

from place import LIBERTY_SECRET, SECRET, place

INTERNALS = r"std::|sso_err_resp|sso_op_failed|invalid_argument|Json::"


def shown(finding):
    where = "; ".join(" ".join(one.values()) for one in finding["places"])
    return f"  {finding['grade']} {finding['id']}: {finding['cause']}\n    [{where}] -> " \
           f"{finding['action']}"


def whole(finding):
    places = " ".join(" ".join(one.values()) for one in finding["places"])
    return "\n".join((finding["cause"], places, finding["action"]))


class DoctorTest(unittest.TestCase):
    longMessage = True

    def setUp(self):
        self.place = place()

    def findings(self, document):
        """What an administrator sees without asking for more."""
        return [one for one in document["findings"]
                if one["grade"] != "good" and not one["because"]]

    def check(self, good, what, expected=""):
        if not good:
            self.fail(f"{what}\n sign-in: {self.result[:200]!r}\n expected: {expected}\n"
                      f" got (status {self.status}):\n" +
                      "\n".join(shown(one) for one in self.seen))

    def assert_silent(self, secrets=()):
        """No secret, no internals, in nothing that was written."""
        for one in self.seen:
            self.assertNotRegex(whole(one), INTERNALS)
        for secret in (*secrets, SECRET, LIBERTY_SECRET):
            self.assertNotIn(secret, self.written)

    def run_doctor(self, *arguments):
        self.status, document = self.place.doctor(*arguments)
        self.written = json.dumps(document, ensure_ascii=False)
        self.seen = self.findings(document)
        return document


def add(test_class, name, function):
    name = "test_" + re.sub(r"\W+", "_", name).strip("_")
    assert not hasattr(test_class, name), name
    setattr(test_class, name, function)
