#!/usr/bin/python3
"""The benchmark itself; scripts/check bench runs it in a sandbox.
    run.py [--guard] PROGRAMS FOLDER BUILD"""
import os
import subprocess
import sys
import time

import growth
import measure
import report
import settings

HERE = os.path.dirname(os.path.abspath(__file__))

# What is timed, and how: the rows of the table.
OPERATIONS = {
    "rs256": "RS256 verification with key import",
    "rs384": "RS384",
    "rs512": "RS512",
    "hs256": "HS256 verification",
    "hs384": "HS384",
    "hs512": "HS512",
    "rs256-65536": "RS256 of a 64 KB token",
    "rs256-1048576": "RS256 of a 1 MB token",
    "parse": "header and claims of a token",
    "url": "authorization URL",
    "urlencode": "URL encoding of an address",
    "md5": "MD5 of the nonce, in hex (floor: the digest alone)",
    "login-keys-1": "token response to user name, 1 key (files for requests)",
    "login-keys-1000": "the same, 1,000 keys",
}
AGAINST_PEERS = {
    "rs256": "RS256: key import and verification",
    "rs384": "RS384",
    "rs512": "RS512",
    "hs256": "HS256: verification",
    "hs384": "HS384",
    "hs512": "HS512",
    "rs256-65536": "RS256, 64 KB token",
    "rs256-1048576": "RS256, 1 MB token",
    "check-rs256": "RS256, and header and claims parsed",
    "check-hs256": "HS256, and header and claims parsed",
    "check-rs256-65536": "RS256, 64 KB token, and parsed",
    "parse": "header and claims of a token alone",
}


def say(started, what):
    print("[%4ds] %s" % (time.time() - started, what), flush=True)


def guard(programs):
    """Compares the instructions of the hot operations with limits.txt."""
    with open(os.path.join(HERE, "limits.txt")) as file:
        limits = {name: float(limit) for name, limit in
                  (line.split() for line in file if line.strip() and line[0] != "#")}
    library = programs.instructions("bench_library", limits)
    floor = programs.instructions("bench_floor", limits)
    failed = 0
    for name, limit in limits.items():
        ratio = library[name] / floor[name]
        good = ratio <= limit
        failed += not good
        print("%-7s %-20s %10d instructions, %10d of the baseline: %.3f, at most %.2f" % (
            "ok" if good else "NOT OK", name, library[name], floor[name], ratio, limit))
    print("%d passed, %d failed" % (len(limits) - failed, failed))
    return 1 if failed or not limits else 0


def measure_operations(programs):
    both = ["bench_library", "bench_floor"]
    counts = {program: programs.instructions(program, OPERATIONS) for program in both}
    rows = []
    for name, what in OPERATIONS.items():
        (floor, _), (library, ratio) = programs.in_turns(name, both[::-1], 41)
        rows.append((name, what, floor, library, ratio,
                     counts["bench_library"][name] / counts["bench_floor"][name]))
    return rows


def measure_peers(programs):
    """Microseconds, and of each peer its time and its instructions for one of the library's; among
    the peers the hand-written baseline."""
    peers = {"baseline": "bench_floor", **{name: "peer_" + name for name in programs.peers()}}
    all_of_them = ["bench_library"] + list(peers.values())
    counts = {program: programs.instructions(program, AGAINST_PEERS, 1)
              for program in all_of_them}
    rows = []
    for name, what in AGAINST_PEERS.items():
        taken = programs.in_turns(name, all_of_them, 21)
        rows.append((name, what, taken[0][0], {
            peer: (ratio, counts[program][name] / counts["bench_library"][name])
            for (peer, program), (_, ratio) in zip(peers.items(), taken[1:])}))
    return rows


def programs_without_requests(programs, linked):
    """Programs that end before their first request, beside one that does nothing. `linked` is built
    with the library that does not load libcurl late."""
    commands = {"nothing, linked with the three libraries": [programs.path("cgi_nothing")]}
    for what in ("redirect", "profile", "logout"):
        commands["library: " + what] = [programs.path("cgi_library"), what]
    commands["library, libcurl linked: redirect"] = [linked, "redirect"]
    native = len(commands)
    if os.path.exists(programs.path("cgi_iddawc")):
        commands["iddawc: redirect"] = [programs.path("cgi_iddawc"), "redirect"]
        native += 1
    authlib = ["/usr/bin/python3", os.path.join(HERE, "cgi/login_authlib.py"), "redirect"]
    commands["Authlib: redirect"] = authlib
    taken = measure.processes(programs.path("bench_process"), 40, list(commands.values()))
    counts = [measure.process_instructions(command)
              for command in list(commands.values())[:native]]
    return list(zip(commands, taken, counts + [None]))


def logins(programs, authority):
    tables = {}
    for what, everything in (("the system's CA bundle", True), ("one CA certificate", False)):
        authority.trust(everything)
        commands = {"three bare requests": [programs.path("cgi_requests")] + settings.urls(),
                    "library: login": [programs.path("cgi_library"), "login"]}
        if os.path.exists(programs.path("cgi_iddawc")):
            commands["iddawc: login"] = [programs.path("cgi_iddawc"), "login"]
        commands["Authlib: login"] = ["/usr/bin/python3", os.path.join(HERE, "cgi/login_authlib.py"),
                                      "login"]
        taken = measure.processes(programs.path("bench_process"), 41,
                                  list(commands.values()))
        tables[what] = list(zip(commands, taken))
    return tables


def main(arguments):
    guarding = arguments[0] == "--guard"
    folder, work, build = arguments[-3:]
    started = time.time()
    material = os.path.join(work, "material")
    os.mkdir(material)
    programs = measure.Programs(folder, material)
    subprocess.run([programs.path("bench_material"), material], check=True)
    settings.write_settings()
    if guarding:
        return guard(programs)

    found = report.Findings()
    say(started, "operations within a process, baseline and library")
    found.operations = measure_operations(programs)
    say(started, "the same by other libraries")
    found.peers = measure_peers(programs)
    say(started, "programs that make no request")
    found.without_requests = programs_without_requests(programs, build + "-linked/lab/bench/cgi_library")
    say(started, "logins over TLS")
    authority = settings.Authority(work)
    provider = settings.Provider(HERE, material, authority)
    try:
        settings.write_settings("https://localhost:%d" % settings.PORT)
        found.logins = logins(programs, authority)
    finally:
        provider.end()
    say(started, "growth")
    found.growth = growth.measure_all(programs)
    found.shared_object = measure.shared_object(os.path.join(build, "sso/libssoclient.so"))

    print(report.write(found))
    return 0


if __name__ == "__main__":
    sys.exit(main(sys.argv[1:]))
