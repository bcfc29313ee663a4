"""The doctor's diagnosis of each fault, beside the real sign-in."""

import json
import re

import faults_files
import faults_network
import faults_people
import faults_values
from diagnosis import DoctorTest, add, whole
from place import LIBERTY_SECRET, SECRET


def holds(patterns, content):
    return all(re.search(pattern, content, re.I) for pattern in patterns)


def fits(fault, finding):
    where = whole(finding)
    return (finding["grade"] in fault.grade and holds(fault.says, finding["cause"]) and
            holds(fault.at, where) and holds(fault.do, finding["action"]))


class FaultTest(DoctorTest):
    def run_fault(self, fault):
        self.place.reset(fault.base)
        self.addCleanup(self.place.reset, "v1")
        fault.set_up(self.place)
        silent = fault.sign_in == "does not end"
        if silent:
            self.place.timeout = 2
        self.result = self.place.run_program() if fault.program else self.place.sign_in(
            2 if silent else 30)
        self.assertRegex(self.result, re.compile(fault.sign_in, re.I), "the sign-in itself")
        self.run_doctor(*fault.run)
        expected = f"{'/'.join(fault.grade)} says {fault.says} at {fault.at} do {fault.do}"
        failures = [one for one in self.seen if one["grade"] == "failure"]
        self.assert_silent()
        self.check("capabilities" not in self.written, "root is said to lack capabilities")
        for pattern in fault.never:
            self.check(pattern not in self.written, "written: " + pattern)
        self.check(any(fits(fault, one) for one in self.seen), "not named", expected)
        if fault.grade == ("warning",):
            self.check(not failures, "a failure where a sign-in works", expected)
        self.check(len(failures) <= 1 + fault.more, "further failures", expected)
        self.check(self.status == (1 if failures else 3 if any(
            one["grade"] == "unchecked" for one in self.seen) else 0), "exit status")


class Files(FaultTest):
    module = faults_files


class Values(FaultTest):
    module = faults_values


class Network(FaultTest):
    module = faults_network


class People(FaultTest):
    module = faults_people


class Explained(DoctorTest):
    def run_paste(self, base, set_up, words, action):
        self.place.reset(base)
        self.addCleanup(self.place.reset, "v1")
        set_up(self.place)
        self.assertIn(words, self.place.explained, "the sign-in itself")
        status, document = self.place.doctor()
        found = [one for one in document.get("explanations", [])
                 if one["name"].lower() in words.lower() or words in one["name"]]
        self.assertEqual(status, 0, document)
        self.assertTrue(found, document)
        self.assertRegex(found[0]["meaning"] + " " + found[0]["action"], re.compile(action, re.I))
        self.assertTrue(found[0]["action"])
        written = json.dumps(document)
        for secret in (SECRET, LIBERTY_SECRET):
            self.assertNotIn(secret, written)


def add_rows(test_class):
    for row in test_class.module.FAULTS:
        add(test_class, row.name, lambda self, row=row: self.run_fault(row))


for one in (Files, Values, Network, People):
    add_rows(one)
del one  # the loader would take it for a further class
for name, *paste in faults_people.EXPLAINED:
    add(Explained, name, lambda self, paste=paste: self.run_paste(*paste))
