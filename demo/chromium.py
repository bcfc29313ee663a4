"""Chromium without a window, in front of which a person sits.

One browser serves one person after the other; nobody finds anything of who was there before.
What is read from a page is what a person sees, and what is entered goes through keys and clicks.
"""

import base64
import os
import time

from selenium import webdriver
from selenium.common.exceptions import WebDriverException
from selenium.webdriver.chrome.service import Service
from selenium.webdriver.common.keys import Keys
from selenium.webdriver.remote.remote_connection import RemoteConnection

from stage import StageError, run

PATIENCE = 30  # seconds until a page that does not come is given up

# The first line: root needs it, and the namespace is the sandbox here. The second: a small machine
# without a screen. The last three: fewer processes, and no limit to how often an address
# changes. The rest: no word to anybody but the pages.
FLAGS = ("--no-sandbox",
         "--headless", "--disable-gpu", "--disable-dev-shm-usage", "--hide-scrollbars",
         "--disable-quic", "--no-first-run", "--disable-background-networking",
         "--disable-component-update", "--disable-sync", "--disable-default-apps",
         "--disable-extensions", "--no-proxy-server", "--lang=en-US",
         "--disable-site-isolation-trials", "--renderer-process-limit=1",
         "--disable-ipc-flooding-protection")

# The relay page goes on by itself, and so does the one that is shown during the exchange: what they
# showed, and for how long, is kept for who comes to look a moment later.
KEEP = """
const name = /[/](relay|login)[.](html|cgi)$/.exec(location.pathname)?.[1];
if (name) {
  const kept = JSON.parse(sessionStorage.getItem(name) || "[]");
  const keep = () => sessionStorage.setItem(name, JSON.stringify(kept));
  addEventListener("DOMContentLoaded", () => {
    kept.push({url: location.href, text: document.body.innerText});
    keep();
  });
  addEventListener("pagehide", () => {
    kept[kept.length - 1].seconds = performance.now() / 1000;
    keep();
  });
}
"""


class TabError(Exception):
    """A page is not what the person in front of it expects."""


class Chromium:
    def __init__(self, stage):
        self._folder = stage.folder + "/chromium"
        self._driver = None
        self._trust(stage.authority)
        RemoteConnection.set_timeout(2 * PATIENCE)
        options = webdriver.ChromeOptions()
        options.binary_location = "/usr/bin/chromium"
        options.set_capability("goog:loggingPrefs", {"browser": "ALL"})
        for flag in (*FLAGS, f"--user-data-dir={self._folder}/profile"):
            options.add_argument(flag)
        service = Service("/usr/bin/chromedriver", log_path=stage.logs + "/chromedriver.log",
                          env={**os.environ, "HOME": self._folder})
        try:
            self._driver = webdriver.Chrome(service=service, options=options)
        except WebDriverException as error:
            raise StageError(f"Chromium does not start: {error.msg}") from error
        self._driver.set_page_load_timeout(PATIENCE)
        self._driver.set_script_timeout(PATIENCE)

    def _trust(self, authority):
        """Makes the stage's authority known where Chromium looks: in its user's database. A flag
        that ignores errors would not notice a certificate that a person is warned of."""
        database = self._folder + "/.pki/nssdb"
        os.makedirs(database)
        run("certutil", "-N", "-d", "sql:" + database, "--empty-password")
        run("certutil", "-A", "-d", "sql:" + database, "-n", "stage", "-t", "C,,", "-i", authority)

    def person(self):
        """A tab for a person who was never here; the one before is gone."""
        driver = self._driver
        old = driver.window_handles
        driver.switch_to.new_window("tab")
        new = driver.current_window_handle
        for handle in old:
            driver.switch_to.window(handle)
            driver.close()
        driver.switch_to.window(new)
        driver.execute_cdp_cmd("Network.clearBrowserCookies", {})
        driver.execute_cdp_cmd("Network.clearBrowserCache", {})
        return Tab(driver)

    def close(self):
        self._driver.quit()


class Tab:
    def __init__(self, driver):
        self.driver = driver
        self.command("Page.addScriptToEvaluateOnNewDocument", source=KEEP)
        # As if the window was in front: without one, nothing would have the focus.
        self.command("Emulation.setFocusEmulationEnabled", enabled=True)
        self.complaints()

    def command(self, name, **parameters):
        """A command of the developer tools."""
        return self.driver.execute_cdp_cmd(name, parameters)

    # -- what a person does ----------------------------------------------------------------

    def open(self, url):
        """Goes to an address. Where the browser shows its own page instead, that is it."""
        try:
            self.driver.get(url)
        except WebDriverException as error:
            if "net::ERR_" not in (error.msg or ""):
                raise TabError(f"{url} does not open: {error.msg}") from error

    def type(self, field, text):
        """Types a text into a field, key by key."""
        element = self.find(field)
        element.clear()
        element.send_keys(text)

    def paste(self, field, text):
        """Puts a text into a field at once: key by key takes most of a test's time."""
        self.script("arguments[0].focus(); arguments[0].select()", self.find(field))
        self.command("Input.insertText", text=text)

    def click(self, what):
        self.find(what).click()

    def press(self, *keys):
        """Presses keys, by their names in selenium's list, or characters."""
        for key in keys:
            self.driver.switch_to.active_element.send_keys(getattr(Keys, key, key))

    def speak(self, languages):
        """Sets the browser's languages, as Accept-Language lists them, and reloads the page."""
        agent = self.script("return navigator.userAgent")
        self.command("Emulation.setUserAgentOverride", userAgent=agent, acceptLanguage=languages)
        self.driver.refresh()

    # -- what a person sees ----------------------------------------------------------------

    @property
    def url(self):
        return self.driver.current_url

    @property
    def title(self):
        return self.driver.title

    @property
    def text(self):
        return self.script("return document.body ? document.body.innerText : ''")

    def script(self, text, *arguments):
        return self.driver.execute_script(text, *arguments)

    def find(self, what):
        """The first element of a CSS selector that a person can see, as soon as it is there."""
        return self.wait(lambda: next(iter(self.all(what)), None), f"'{what}'")

    def all(self, what):
        """All elements of a CSS selector that a person can see now."""
        return self.script("return [...document.querySelectorAll(arguments[0])].filter("
                           "element => element.checkVisibility({visibilityProperty: true}) && "
                           "element.getClientRects().length > 0)", what)

    def wait(self, condition, what, seconds=PATIENCE):
        """Waits until a condition holds, and returns what it gave."""
        end = time.monotonic() + seconds
        while True:
            try:
                if value := condition():
                    return value
            except WebDriverException:  # the page changed under our eyes
                pass
            if time.monotonic() > end:
                raise TabError(f"waited in vain for {what}; the page is {self.url}: "
                               f"{' '.join(self.text.split())[:200]}")
            time.sleep(0.05)

    def relay(self):
        """What relay pages showed to this person, oldest first: their URLs and texts."""
        return self._kept("relay")

    def waited(self):
        """The same of the pages that are shown while the device asks the provider."""
        return self._kept("login")

    def _kept(self, name):
        return self.script("return JSON.parse(sessionStorage.getItem(arguments[0]) || '[]')", name)

    def complaints(self):
        """What the browser has logged since the last time: scripts that fail, violations of a
        policy, missing files."""
        return [entry["message"] for entry in self.driver.get_log("browser")]

    def screenshot(self, path):
        picture = self.command("Page.captureScreenshot", format="png")["data"]
        with open(path, "wb") as file:
            file.write(base64.b64decode(picture))
