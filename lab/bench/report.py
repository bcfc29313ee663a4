"""The table: what was found, beside what is asked for."""
import datetime
import platform
import re
import subprocess


class Findings:
    operations = ()
    peers = ()
    without_requests = ()
    logins = {}
    growth = ()
    shared_object = (0, 0, 0, 0)


def table(head, rows):
    lines = ["| " + " | ".join(head) + " |", "|---" * len(head) + "|"]
    return "\n".join(lines + ["| " + " | ".join(str(cell) for cell in row) + " |"
                              for row in rows])


def microseconds(nanoseconds):
    return "%.1f" % (nanoseconds / 1000)


def machine():
    with open("/proc/cpuinfo") as file:
        model = re.search(r"model name\s*: (.*)", file.read())
    with open("/etc/os-release") as file:
        system = re.search(r'PRETTY_NAME="(.*)"', file.read())
    with open("/proc/loadavg") as file:
        load = file.read().split()[0]
    return "%s, %s, Linux %s, %s; load average at the end of the run %s" % (
        model.group(1) if model else platform.machine(), system.group(1), platform.release(),
        platform.machine(), load)


def versions():
    packages = ["g++", "libssl3", "libcurl4", "libjsoncpp25", "libboost-dev", "valgrind",
                "libjwt0", "libcjose0", "librhonabwy1.1", "libiddawc1.1", "python3-authlib"]
    listed = subprocess.run(["dpkg-query", "-W", "-f=${binary:Package} ${Version}, "] + packages,
                            capture_output=True, text=True, check=False).stdout
    return listed.rstrip(", ")


class Bars:
    """The limits that the project has set itself, and how they are kept."""

    def __init__(self, found):
        self.rows = []
        by_name = {row[0]: row for row in found.operations}
        without = {what: (taken, count) for what, taken, count in found.without_requests}
        nothing = without["nothing, linked with the three libraries"]
        redirect = without["library: redirect"]
        self.at_most("redirect, of a program that does nothing", redirect[0].ratio, 0.50)
        self.at_most("the same, in processor time", redirect[0].processor_ratio, 0.50)
        self.at_most("the same, in instructions", redirect[1] / nothing[1], 0.50)
        linked = without["library, libcurl linked: redirect"]
        self.at_most("redirect with libcurl linked", linked[0].ratio, 1.08)
        self.at_most("the same, in processor time", linked[0].processor_ratio, 1.08)
        self.at_most("the same, in instructions", linked[1] / nothing[1], 1.08)
        for what, limit in (("the system's CA bundle", 1.02), ("one CA certificate", 1.06)):
            rows = dict(found.logins[what])
            login = rows["library: login"]
            self.at_most("login with %s, of the bare requests" % what, login.ratio, limit)
            self.at_most("the same, in processor time", login.processor_ratio, limit)
        rows = dict(found.logins["the system's CA bundle"])
        self.at_most("peak resident memory of a login, of the bare requests",
                     rows["library: login"].peak / rows["three bare requests"].peak, 1.02)
        for name, limit in (("rs256", 1.10), ("rs384", 1.10), ("rs512", 1.10), ("hs256", 1.14),
                            ("rs256-65536", 1.08), ("rs256-1048576", 1.20), ("url", 1.20),
                            ("login-keys-1000", 1.06)):
            row = by_name[name]
            self.at_most(row[1] + ", time", row[4], limit)
            self.at_most(row[1] + ", instructions", row[5], limit)
        keys = found.growth[1]
        self.at_most("one more key in the set, of its parsing alone",
                     keys.slope("library") / keys.slope("parser"), 1.08)
        self.at_most("the same, of the hand-written baseline of a login", keys.slope("library") /
                     keys.slope("baseline"), 1.08)
        size, named, _, foreign = found.shared_object
        self.at_most("stripped object, bytes", size, 110 * 1024)
        self.at_most("relocations bound by name", named, 60)
        self.at_most("foreign symbols exported", foreign, 0)
        peers = {row[0]: row for row in found.peers}
        for name, limit in (("rs256", 0.95), ("hs256", 0.70), ("rs256-65536", 0.45)):
            _, what, _, others = peers[name]
            self.of_fastest(what, dict(others), limit)

    def of_fastest(self, what, others, limit):
        by_hand = others.pop("baseline")
        for number, unit in enumerate(("time", "instructions") if others else ()):
            fastest = min(other[number] for other in others.values())
            self.at_most("%s, of the fastest peer, %s" % (what, unit), 1 / fastest, limit)
            self.rows.append(("the same of the baseline, %s" % unit, "%.3f" % (by_hand[number] / fastest),
                              "-", "-"))

    def at_most(self, what, value, limit):
        shown = "%.3f" % value if isinstance(value, float) else str(value)
        self.rows.append((what, shown, "at most %s" % limit, "yes" if value <= limit else "**no**"))


def write(found):
    size, named, slots, foreign = found.shared_object
    parts = ["# What the library costs",
             "Made by `scripts/check bench` on %s.\n\nMachine: %s.\n\nVersions: %s." % (
                 datetime.date.today().isoformat(), machine(), versions()),
             "Ratios are medians of ratios within a round; in a round all programs run in turn. "
             "\"Baseline\" is the same work, hand-written on the same libraries with nothing between the steps "
             "that have to be made (`lab/bench/floor.cpp`). lab/bench/README.md describes the method.",
             "## Limits", table(("what", "found", "limit", "kept"), Bars(found).rows),
             "## Within a process",
             table(("work", "baseline, µs", "library, µs", "ratio, time", "ratio, instructions"),
                   [(what, microseconds(floor), microseconds(library), "%.3f" % ratio,
                     "%.3f" % counted)
                    for _, what, floor, library, ratio, counted in found.operations]),
             "## Other libraries",
             "How much of this library's time another takes (in brackets: instructions). Its "
             "shortest way each: libjwt has one call for everything and takes the key as PEM. Not "
             "all do the same: cjose decodes with its own code, not through OpenSSL's filters. "
             "The baseline is as above: no limit below it can be kept.",
             peer_table(found.peers),
             "## Programs that make no request",
             table(("program", "ms", "ratio", "ratio, processor time", "instructions",
                    "peak memory, KB"),
                   [(what, "%.2f" % taken.milliseconds, "%.3f" % taken.ratio,
                     "%.3f" % taken.processor_ratio, count or "-", taken.peak)
                    for what, taken, count in found.without_requests])]
    for what, rows in found.logins.items():
        parts += ["## A login over TLS, %s" % what,
                  table(("program", "ms", "ratio", "ratio, processor time", "peak memory, KB"),
                        [(program, "%.2f" % taken.milliseconds, "%.3f" % taken.ratio,
                          "%.3f" % taken.processor_ratio, taken.peak)
                         for program, taken in rows])]
    parts += ["npm's openid-client is not among the peers: Debian does not carry it.",
              "## Growth"]
    for curve in found.growth:
        labels = list(curve.lines)
        parts += ["Instructions for %s:" % curve.title,
                  table([curve.unit] + labels, [
                      [curve_size] + ["%d" % curve.lines[label][i] for label in labels]
                      for i, curve_size in enumerate(curve.sizes)] + [
                          ["for one more"] + ["%.2f" % curve.slope(label) for label in labels]])]
    parts += ["## The shared object",
              "Stripped %d bytes; %d relocations of data bound by name, %d functions bound by "
              "name; %d foreign symbols exported." % (size, named, slots, foreign)]
    return "\n\n".join(parts) + "\n"


def peer_table(rows):
    peers = sorted({peer for row in rows for peer in row[3]})
    return table(["work", "this library, µs"] + peers, [
        [what, microseconds(library)] + ["%.2f (%.2f)" % others[peer] for peer in peers]
        for _, what, library, others in rows])
