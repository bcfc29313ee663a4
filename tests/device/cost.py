"""How long a login takes, with two login programs in turn. Inside scripts/sandbox, called by
check-cost.

  cost.py BUILD-FOLDER OTHER-PROGRAM [ROUNDS]
"""

import os
import shutil
import statistics
import sys
import time
import urllib.parse

os.environ["SSOCLIENT_BUILD"] = os.path.abspath(sys.argv[1])

from device import BUILD, LOGIN, STORE, device  # noqa: E402
from browser import Browser  # noqa: E402

BLOCK = 10  # logins with one program before it is the other one's turn
MOST = 2.0  # milliseconds that a login may take longer


def put(program, others):
    """Makes a program the device's login program; `others` is kept apart for the other one."""
    device().stage.install_login(program, LOGIN, 0o4750)
    folder = STORE + "-" + os.path.basename(program)
    if os.path.exists(STORE):
        os.rename(STORE, others)
    if os.path.exists(folder):
        os.rename(folder, STORE)
    elif program.endswith("-before"):  # which had its folder made at every start of the device
        os.mkdir(STORE, 0o700)
        os.chown(STORE, 33, 33)


def login():
    """The seconds of start and callback, as the browser sees them."""
    browser = Browser(device().stage.authority)
    begun = time.monotonic()
    page = browser.get(device().login_url + "?action=start&origin=/index.cgi")
    took = time.monotonic() - begun
    back = device().provider.sign_in(browser, browser.get(page.location)).location
    begun = time.monotonic()
    page = browser.get(back)
    took += time.monotonic() - begun
    if urllib.parse.urlsplit(page.location).fragment.split("&")[-1] != "success=true":
        raise SystemExit("cost: nobody was signed in: " + page.location)
    return took * 1000


def main():
    rounds = int(sys.argv[3]) if len(sys.argv) > 3 else 15
    stage = device().stage
    before, now = "/run/stage/login-before", "/run/stage/login-now"
    shutil.copy(sys.argv[2], before)
    shutil.copy(BUILD + "/device/login.cgi", now)
    failed = False
    for profile in ("websphere", "azure"):
        device().choose(profile)
        times = {before: [], now: []}
        for number in range(rounds):
            for program in (before, now)[::1 if number % 2 else -1]:
                last = [other for other in times if other != program][0]
                put(program, STORE + "-" + os.path.basename(last))
                login()
                times[program] += [login() for _ in range(BLOCK)]
                shutil.rmtree(STORE + "/sessions")
                os.rename(STORE, STORE + "-" + os.path.basename(program))
        old, new = (statistics.median(times[program]) for program in (before, now))
        print(f"{profile}: {rounds * BLOCK} logins each; median {old:.2f} ms before, {new:.2f} ms "
              f"now, ratio {new / old:.3f}, difference {new - old:+.2f} ms")
        failed = failed or new - old > MOST
    stage.close()
    return 1 if failed else 0


if __name__ == "__main__":
    sys.exit(main())
