"""Attacks any login program on the stage and prints what it withstood, by danger.

  withstand.py BUILD-FOLDER --program FILE [OPTION...]

Runs inside scripts/sandbox; scripts/check login is what a person calls. The program is judged by
outcomes alone: where it sends the browser, what the provider is asked, what is in the log, and what
its processes do. What it writes for people is its own matter.
"""

import argparse
import base64
import email
import json
import os
import subprocess
import sys
import threading
import time
import urllib.parse

sys.path.insert(0, os.path.dirname(os.path.abspath(__file__)))
os.environ["SSOCLIENT_BUILD"] = os.path.abspath(sys.argv[1]) if len(sys.argv) > 1 else ""

from device import LOGIN, device, programs, values_of, wait_until  # noqa: E402, I001
import browser as browsers  # noqa: E402
from browser import Browser, BrowserError, Page  # noqa: E402
from providers.scripted import Script  # noqa: E402
from test_environment import EFFECTIVE  # noqa: E402
from traps import Traps  # noqa: E402

MOST_MEMORY = 128 << 20  # bytes that an exchange may take
FLOOD = 256 << 20        # bytes that a provider sends without end
FOREIGN = "https://other.example.org/"


class Failed(Exception):
    """The program did not withstand; the text says what was seen."""


class Login:
    """A login program on the stage, and what a browser can do with it."""

    def __init__(self, options):
        self.stage, self.provider = device().stage, device().provider
        self.profile, self.relay, self.query = options.profile, options.relay, options.start
        self.patience = options.patience
        device().stage.install_login(options.program, LOGIN, 0o4750)
        device().choose(options.profile)

    def fresh(self):
        """A browser that was never here, and a provider that behaves."""
        self.provider.release()
        self.provider.script = Script()
        self.provider.seen.clear()
        return Browser(self.stage.authority)

    def start(self, browser, query=None):
        page = browser.get(f"{device().login_url}?{query or self.query}")
        if page.location is None or not page.location.startswith(self.provider.url):
            raise Failed(f"the start leads to {page.location or f'status {page.status}'}, "
                         "not to the provider")
        return page.location

    def callback(self, browser, query=None):
        """Signs in at the provider; returns the URL that leads back."""
        page = browser.get(self.start(browser, query))
        if page.location is None:
            page = self.provider.sign_in(browser, page)
        return page.location

    def with_values(self, url, **values):
        """A callback URL with other values."""
        return url.split("?")[0] + "?" + urllib.parse.urlencode({**values_of(url), **values})

    def run(self, browser, url, **variables):
        """Opens a URL as the browser does, without a web server: for what those refuse to pass on,
        and for what a local program can do."""
        cookies = "; ".join(f"{cookie.name}={cookie.value}" for cookie in browser.cookies)
        done = subprocess.run(
            [LOGIN], stdout=subprocess.PIPE, stderr=subprocess.PIPE, stdin=subprocess.DEVNULL,
            timeout=self.patience, check=False, user=33, group=33, extra_groups=[],
            env={"REQUEST_METHOD": "GET", "QUERY_STRING": urllib.parse.urlsplit(url).query,
                 "HTTP_COOKIE": cookies, "SCRIPT_NAME": "/webman/login.cgi", **variables})
        head, _, body = done.stdout.partition(b"\n\n")
        headers = email.message_from_bytes(head + b"\n\n")
        status = headers.get("Status", "302" if "Location" in headers else "200")
        return Page(url, int(status.split()[0]), headers, body.decode("utf-8", "replace"))

    def signed_in(self, page):
        """Whether the page leads to the relay page with a success; its values are returned."""
        parts = urllib.parse.urlsplit(page.location or "")
        values = values_of(page.location or "")
        return values if parts.path == self.relay and values.get("success") == "true" else None

    def must_refuse(self, page, what):
        if self.signed_in(page):
            raise Failed(f"signed in {what}")

    def asked_for_tokens(self):
        return [path for _, path, _, _ in self.provider.seen if path.endswith("/token")]


def state_with(url, **members):
    """The state of a URL with other members."""
    state = json.loads(base64.b64decode(values_of(url)["state"]))
    return base64.b64encode(json.dumps({**state, **members}).encode()).decode()


# -- the attacks: each raises Failed, or returns what is worth knowing -------------------------

def honest(login):
    browser = login.fresh()
    page = browser.get(login.callback(browser))
    if not login.signed_in(page):
        raise Failed(f"it leads to {page.location or f'status {page.status}'}")


def no_login_started(login):
    url = login.callback(login.fresh())
    login.must_refuse(login.fresh().get(url), "a browser that started no login, as the attacker")


def other_login_started(login):
    url, victim = login.callback(login.fresh()), login.fresh()
    login.start(victim)
    login.must_refuse(victim.get(url), "as the attacker, in the middle of a login of one's own")


def own_code_injected(login):
    code = values_of(login.callback(login.fresh()))["code"]
    thief = login.fresh()
    url = login.with_values(login.callback(thief), code=code)
    login.must_refuse(thief.get(url), "with a code that was handed out to another browser")


def nonce_in_the_state(login):
    victims, thief = login.callback(login.fresh()), login.fresh()
    nonce = json.loads(base64.b64decode(values_of(victims)["state"])).get("nonce", "")
    own = login.callback(thief)
    url = login.with_values(own, code=values_of(victims)["code"],
                            state=state_with(own, nonce=nonce))
    login.must_refuse(thief.get(url), "with a stolen code and a state that was made to fit")


def sent_twice(login):
    browser = login.fresh()
    url = login.callback(browser)
    browser.get(url)
    login.provider.seen.clear()
    login.must_refuse(browser.get(url), "a second time with the same code")
    if login.asked_for_tokens():
        raise Failed("sent the code to the provider a second time")


def token_with(script):
    def attack(login):
        browser = login.fresh()
        url = login.callback(browser)
        login.provider.script = script(login)
        login.must_refuse(browser.get(url), "with that token")
    return attack


def other_claims(**claims):
    return token_with(lambda login: Script(claims=lambda own: {**own, **claims}))


def without_nonce(login):
    token_with(lambda login: Script(claims=lambda own: {
        name: value for name, value in own.items() if name != "nonce"}))(login)


changed_signature = token_with(lambda login: Script(
    signature=lambda sign: bytes([sign[0] ^ 1]) + sign[1:]))
no_signature = token_with(lambda login: Script(
    header=lambda header: {**header, "alg": "none"}, signature=lambda sign: b""))


def silent(login):
    browser = login.fresh()
    url = login.callback(browser)
    login.provider.script = Script(silent=("token",))
    begun = time.monotonic()
    try:
        login.must_refuse(browser.get(url), "without a token")
    except BrowserError as error:
        raise Failed(f"no answer within {login.patience} seconds") from error
    finally:
        took = time.monotonic() - begun
        time.sleep(2)
        left = programs()
        login.provider.release()
    if left:
        raise Failed(f"{len(left)} processes still run after the answer")
    return f"answered after {took:.0f} s"


def _endless(file):
    file.write(b"HTTP/1.1 200 OK\r\nConnection: close\r\n\r\n")
    part = b"x" * 65536
    for _ in range(FLOOD // len(part)):
        file.write(part)


def endless(login):
    browser, largest = login.fresh(), [0]
    url = login.callback(browser)
    login.provider.script = Script(flood={"token": _endless})
    done = threading.Event()

    def watch():
        while not done.wait(0.02):
            sizes = [int(field(pid, "VmHWM", 1) or 0) << 10 for pid in programs()]
            largest[0] = max(largest[0], *sizes, 0)
    watcher = threading.Thread(target=watch)
    watcher.start()
    try:
        login.must_refuse(browser.get(url), "without a token")
    finally:
        done.set()
        watcher.join()
    if largest[0] > MOST_MEMORY:
        raise Failed(f"took {largest[0] >> 20} MB of memory")
    return f"{largest[0] >> 20} MB at most"


def field(pid, name, at):
    """A word of /proc/PID/status; "" once the process has ended."""
    try:
        with open(f"/proc/{pid}/status", encoding="ascii") as file:
            return next(line.split()[at] for line in file if line.startswith(name + ":"))
    except (OSError, StopIteration):
        return ""


def cut(login):
    token_with(lambda login: Script(cut=("token",)))(login)


def words_of_the_provider(login):
    """An error answer whose words would be header lines or markup."""
    browser = login.fresh()
    url = login.callback(browser)
    words = "x\r\nSet-Cookie: injected=1\r\n\r\n<script>alert(1)</script>"
    login.provider.script = Script(token_answer=lambda *_: (
        400, "application/json", json.dumps({"error": words, "error_description": words})))
    no_injection(browser.get(url))


def words_in_the_address(login):
    browser = login.fresh()
    url = login.callback(browser)
    words = "x\r\nSet-Cookie: injected=1\r\n\r\n<script>alert(1)</script>"
    no_injection(login.run(browser, login.with_values(
        url.replace("code=", "no_code="), error=words, error_description=words)))


def no_injection(page):
    cookies = " ".join(page.headers.get_all("Set-Cookie", []))
    if "injected=1" in cookies or "<script>alert" in page.body:
        raise Failed("the words became a header line or markup")
    if page.status >= 500 or page.location is None:
        raise Failed(f"status {page.status} and no redirect to the relay page")
    if "<" in page.location or "\n" in page.location:
        raise Failed("the words are in the relay page's address as they came")


def foreign_origin(login):
    for origin in (FOREIGN, "//other.example.org/", "/\\other.example.org",
                   "javascript:alert(1)", "/..//other.example.org/"):
        browser = login.fresh()
        query = urllib.parse.urlencode({**dict(urllib.parse.parse_qsl(login.query)),
                                        "origin": origin})
        refuse_origin(login, browser.get(login.callback(browser, query)), origin)


def foreign_origin_in_the_state(login):
    browser = login.fresh()
    url = login.callback(browser)
    page = browser.get(login.with_values(url, state=state_with(url, origin=FOREIGN)))
    refuse_origin(login, page, FOREIGN)


def refuse_origin(login, page, origin):
    if (login.signed_in(page) or {}).get("origin") == origin:
        raise Failed(f"the relay page is told to go on to {origin}")


def unusable_states(login):
    for state in ("", "=", "AAAA", "bnVsbA==", "e30=", "W1td", "\0", "é" * 50, "A" * 6000,
                  base64.b64encode(b"[" * 700).decode()):
        browser = login.fresh()
        page = login.run(browser, login.with_values(login.callback(browser), state=state))
        login.must_refuse(page, f"with the state {state[:10]!r}")
        if page.status >= 500 or page.location is None:
            raise Failed(f"status {page.status} for the state {state[:10]!r}")


def environment(login):
    traps, effective = Traps(), []
    for name in EFFECTIVE:
        browser = login.fresh()
        url = login.callback(browser)
        traps.sprung()
        login.run(browser, url, **traps.value(name))
        if traps.sprung():
            effective.append(name)
    traps.close()
    if effective:
        raise Failed("have an effect: " + ", ".join(effective))


def not_as_root(login):
    browser = login.fresh()
    url = login.callback(browser)
    login.provider.script = Script(silent=("token",))
    asking = threading.Thread(target=_get, args=(browser, url))
    asking.start()
    try:
        wait_until(login.asked_for_tokens)
        users = {field(pid, "Uid", 2) for pid in programs()} - {""}
    finally:
        login.provider.release()
        asking.join(login.patience)
    if "0" in users or not users:
        raise Failed("the provider is asked with root's rights")


def _get(browser, url):
    try:
        browser.get(url)
    except BrowserError:
        pass


def cookies(login):
    browser = login.fresh()
    url = login.callback(browser)
    page = browser.get(url)
    values = page.headers.get_all("Set-Cookie", [])
    if not any("Max-Age=0" not in value for value in values):
        raise Failed("no cookie is set: the browser has no session")
    for value in values:
        lacking = [word for word in ("Secure", "HttpOnly", "SameSite")
                   if word.lower() not in value.lower()]
        if lacking:
            raise Failed(f"{value.split('=')[0]} lacks {', '.join(lacking)}")


def session_of_the_attacker(login):
    browser = login.fresh()
    url = login.callback(browser)
    names = [value.split("=")[0] for value in browser.get(url).headers.get_all("Set-Cookie", [])]
    for name in names:
        victim = login.fresh()
        url = login.callback(victim)
        own = "; ".join(f"{cookie.name}={cookie.value}" for cookie in victim.cookies)
        page = victim.get(url, {"Cookie": f"{own}; {name}={'a' * 64}"})
        if any(f"{name}={'a' * 64}" in value
               for value in page.headers.get_all("Set-Cookie", [])):
            raise Failed(f"{name} keeps the value that the attacker chose")


def not_cached(login):
    browser = login.fresh()
    pages = [browser.get(f"{device().login_url}?{login.query}"),
             browser.get(login.callback(browser))]
    if any("no-store" not in page.headers.get("Cache-Control", "") for page in pages):
        raise Failed("answers with cookies or a code lack Cache-Control: no-store")


def secrets_in_the_log(login):
    """What the log holds after all the others, and after an exchange that fails."""
    browser = login.fresh()
    url = login.callback(browser)
    login.provider.script = Script(token_answer=lambda *_: (
        400, "application/json", json.dumps({"error": "x", "error_description": "echo " + " ".join(
            str(value) for value in login.provider.seen[-1][3].values())})))
    page = browser.get(url)
    log = "\n".join(login.stage.log.lines)
    secret, code = device().clients[login.profile].secret, values_of(url)["code"]
    places = {"the log": log, "the address of the relay page": urllib.parse.unquote(
        page.location or ""), "the page": page.body}
    for place, text in places.items():
        for what, value in (("client secret", secret), ("code", code)):
            if value in text:
                raise Failed(f"the {what} is in {place}")


DANGERS = (
    ("Somebody else's login", (
        ("a code in a browser that started no login", no_login_started),
        ("another login's code and state while one's own is open", other_login_started))),
    ("A stolen code", (
        ("in a login of the thief's own", own_code_injected),
        ("with a state that was made to fit", nonce_in_the_state),
        ("the same code twice", sent_twice))),
    ("A token that is not for this login", (
        ("another nonce", other_claims(nonce="other")),
        ("no nonce", without_nonce),
        ("a changed signature", changed_signature),
        ("no signature", no_signature),
        ("for another client", other_claims(aud="other")),
        ("expired", other_claims(exp=1000000000)))),
    ("A provider that misbehaves", (
        ("takes the code and stays silent", silent),
        ("sends without end", endless),
        ("ends in the middle of its answer", cut),
        ("sends line breaks and markup in its error", words_of_the_provider))),
    ("What a browser sends", (
        ("line breaks and markup in an error", words_in_the_address),
        ("a page of another site as the origin", foreign_origin),
        ("the same in a changed state", foreign_origin_in_the_state),
        ("malformed states", unusable_states))),
    ("The program itself", (
        ("variables of the environment have an effect", environment),
        ("the provider is asked with root's rights", not_as_root),
        ("cookies that scripts or other sites can use", cookies),
        ("the session is one that an attacker chose", session_of_the_attacker),
        ("answers that a cache keeps", not_cached),
        ("secrets in log or address", secrets_in_the_log))),
)


def judge(login, attack):
    """Mark and remark of a line of the table."""
    try:
        return "withstood", attack(login) or ""
    except Failed as failure:
        return "FAILED", str(failure)
    except (BrowserError, subprocess.TimeoutExpired) as error:
        return "FAILED", f"no answer: {error}"


def show(mark, what, remark):
    print(f"  {mark:10} {what}{': ' + remark if remark else ''}", flush=True)


def read_options():
    parser = argparse.ArgumentParser()
    parser.add_argument("build")
    parser.add_argument("--program", required=True)
    parser.add_argument("--profile", choices=("azure", "websphere"), default="azure")
    parser.add_argument("--start", default="action=start&origin=/index.cgi")
    parser.add_argument("--relay", default="/webman/ssoclient/relay.html")
    parser.add_argument("--patience", type=int, default=45)
    return parser.parse_args()


def main():
    options = read_options()
    browsers.TIMEOUT = options.patience
    login = Login(options)
    mark, remark = judge(login, honest)
    if mark != "withstood":
        print(f"An honest user cannot sign in, so nothing can be said: {remark}")
        print("\n".join("  log: " + line for line in login.stage.log.lines[-5:]))
        return 2
    print(f"{options.program}, profile {options.profile}: an honest user signs in.")
    failed = count = 0
    for danger, attacks in DANGERS:
        print(f"\n{danger}")
        for what, attack in attacks:
            mark, remark = judge(login, attack)
            show(mark, what, remark)
            count += 1
            failed += mark != "withstood"
    login.stage.close()
    print(f"\nIt withstood {count - failed} of {count} attacks"
          f"{'.' if not failed else '; see docs/integrating.md for the others.'}")
    return 1 if failed else 0


if __name__ == "__main__":
    sys.exit(main())
