#!/usr/bin/python3
"""The same work on a small processor: instructions on 32-bit ARM, memory on 32-bit x86.
scripts/check bench --small runs it in a sandbox.
    small.py BUILD SYSROOTS FOLDER, with the builds in BUILD, BUILD-armhf and BUILD-i386"""
import datetime
import os
import subprocess
import sys
import tempfile
import time

import measure
import report
import run
import settings

HERE = os.path.dirname(os.path.abspath(__file__))
LIBRARIES = "i386-linux-gnu"
# Few rounds of what takes long.
TIMES = {"rs256-1048576": 1, "login-keys-1000": 1}


class Emulated(measure.Programs):
    """The programs of another processor, run by QEMU, which counts their instructions."""

    def __init__(self, folder, material, sysroot, counter):
        super().__init__(folder, material)
        self.emulator = ["qemu-arm", "-L", sysroot]
        self.counter = counter

    def run(self, arguments):
        subprocess.run(self.emulator + arguments, check=True, stdout=subprocess.DEVNULL)

    def process_instructions(self, arguments):
        """Instructions of a whole process, the dynamic linker's included."""
        with tempfile.NamedTemporaryFile() as out:
            self.run(["-plugin", "%s,out=%s" % (self.counter, out.name)] + arguments)
            with open(out.name) as file:
                return int(file.read())

    def instructions(self, program, operations, times=4):
        """Instructions for one of each operation: what more of them cost a process."""
        counts = {}
        for operation in operations:
            more = TIMES.get(operation, times)
            few, many = (self.process_instructions(
                [self.path(program), self.material, "time", "%s:%d" % (operation, count)])
                for count in (1, 1 + more))
            counts[operation] = (many - few) / more
        return counts


def on_arm(programs, authority):
    """Three tables of instructions: operations, programs without requests, a login."""
    library = programs.instructions("bench_library", run.OPERATIONS)
    floor = programs.instructions("bench_floor", run.OPERATIONS)
    operations = [(what, "%d" % floor[name], "%d" % library[name],
                   "%.3f" % (library[name] / floor[name])) for name, what in run.OPERATIONS.items()]
    nothing = programs.process_instructions([programs.path("cgi_nothing")])
    without = [("nothing, linked with the three libraries", nothing, "1.000")]
    for what in ("redirect", "profile", "logout"):
        count = programs.process_instructions([programs.path("cgi_library"), what])
        without.append(("library: " + what, count, "%.3f" % (count / nothing)))
    logins = []
    for what, everything in (("the system's CA bundle", True), ("one CA certificate", False)):
        authority.trust(everything)
        bare, whole = (programs.process_instructions([programs.path(program)] + arguments)
                       for program, arguments in (("cgi_requests", settings.urls()),
                                                  ("cgi_library", ["login"])))
        logins.append((what, bare, whole, "%.3f" % (whole / bare)))
    return operations, without, logins


def memory(runner, folder, sysroot, authority):
    """Peak resident kilobytes of each program, on this machine's own processor."""
    loader = [sysroot + "/lib/ld-linux.so.2", "--library-path",
              "%s/lib/%s:%s/usr/lib/%s" % (sysroot, LIBRARIES, sysroot, LIBRARIES)]
    authority.trust(True)
    library, bare = (os.path.join(folder, name) for name in ("cgi_library", "cgi_requests"))
    commands = {"nothing, linked with the three libraries": [os.path.join(folder, "cgi_nothing")],
                "library: redirect": [library, "redirect"],
                "library: profile": [library, "profile"],
                "library: logout": [library, "logout"],
                "three bare requests": [bare] + settings.urls(),
                "library: login": [library, "login"]}
    taken = measure.processes(runner, 5, [loader + command for command in commands.values()])
    return [(what, found.peak) for what, found in zip(commands, taken)]


def write(arm, rows):
    operations, without, logins = arm
    return "\n\n".join([
        "# What the library costs on small processors",
        "Made by `scripts/check bench --small` on %s: 32-bit ARM (armhf) under QEMU, which counts "
        "instructions; memory of 32-bit programs (i386) on this machine's own processor. "
        "Times of an emulator mean nothing, and are left out." % datetime.date.today().isoformat(),
        "## Instructions within a process, armhf",
        report.table(("work", "baseline", "library", "ratio"), operations),
        "## Instructions of programs that make no request, armhf",
        report.table(("program", "instructions", "ratio"), without),
        "## Instructions of a login over TLS, armhf",
        report.table(("trusting", "three bare requests", "library: login", "ratio"), logins),
        "## Memory of a process, i386",
        report.table(("program", "peak resident memory, KB"), rows)]) + "\n"


def main(arguments):
    build, sysroots, work = arguments
    started = time.time()
    material = os.path.join(work, "material")
    os.mkdir(material)
    programs = Emulated(build + "-armhf/lab/bench", material, sysroots + "/armhf",
                        build + "/lab/bench/libbench_counter.so")
    programs.run([programs.path("bench_material"), material])
    settings.write_settings()
    authority = settings.Authority(work)
    provider = settings.Provider(HERE, material, authority)
    try:
        settings.write_settings("https://localhost:%d" % settings.PORT)
        run.say(started, "instructions, armhf")
        arm = on_arm(programs, authority)
        run.say(started, "memory, i386")
        rows = memory(build + "/lab/bench/bench_process", build + "-i386/lab/bench", sysroots + "/i386",
                      authority)
    finally:
        provider.end()
    print(write(arm, rows))
    return 0


if __name__ == "__main__":
    sys.exit(main(sys.argv[1:]))
