"""The sign-in step by step, with the small browser: each redirect is looked at."""

import urllib.parse

from browser import Browser, BrowserError
from scene import StepError, say, shown, values_of


class SignIn:
    def __init__(self, scene, profile):
        self.scene, self.profile = scene, profile
        self.name = profile
        self.steps = ("device page", "start of the login", "provider's login page",
                      "name and password", "consent", "code and state", "relay page",
                      "signed in", "sign out")
        self.browser = Browser(scene.stage.authority)
        self.step = 0

    def run(self):
        try:
            self._steps()
        except (BrowserError, StepError, KeyError) as error:
            step = self.steps[self.step - 1]
            raise StepError(f"{self.name}: step {self.step} ({step}) failed: {error}") from error

    def _done(self, text):
        say(f"{self.name} {self.step}/{len(self.steps)} {self.steps[self.step - 1]}: {text}")

    def _redirect(self, page, prefix):
        """Where a page sends the browser, which must be below `prefix`."""
        if page.location is None:
            raise StepError(f"no redirect but status {page.status}: {page.text[:200]}")
        if not page.location.startswith(prefix):
            raise StepError(f"redirected to {shown(page.location)}, expected {prefix}...")
        return page.location

    def _steps(self):
        device, provider = self.scene.stage.device, self.scene.provider
        relay = device + "/webman/ssoclient/relay.html"

        self.step = 1
        page = self.browser.get(device + "/index.cgi")
        start = page.link("sign-in")
        self._done(page.text)

        self.step = 2
        url = self._redirect(self.browser.get(start), provider.url)
        self._done(shown(url))

        self.step = 3
        page = self.browser.get(self._redirect(self.browser.get(url), provider.url))
        self._done(f"{shown(page.url)} (status {page.status})")

        self.step = 4
        values = provider.sign_in(self.browser, page)
        self._done(f"{self.scene.person.account} is known to {provider.title}")

        self.step = 5
        page = provider.consent(self.browser, values)
        self._done("granted: " + values["scope"])

        self.step = 6
        url = self._redirect(page, device + "/webman/login.cgi?")
        if not {"code", "state"} <= values_of(url).keys():
            raise StepError(f"no code or no state in {shown(url)}")
        self._done(shown(url))

        self.step = 7
        url = self._redirect(self.browser.get(url), relay + "#")
        if values_of(url).get("success") != "true":
            raise StepError("the device says: " + values_of(url).get("reason", "(no reason)"))
        self.browser.get(url)
        self._done(url)

        self.step = 8
        page = self.browser.get(device + values_of(url)["origin"])
        expected = self.scene.expected(self.profile)
        if f"Signed in as {expected}." not in page.text:
            raise StepError(f"expected user {expected}, the device page says: {page.text}")
        self._done(page.text)

        self.step = 9
        url = self._redirect(self.browser.submit(page, "sign-out"), provider.url)
        back = "?post_logout_redirect_uri=" + urllib.parse.quote(relay, safe="")
        if self.profile == "azure" and not url.endswith(back):
            raise StepError(f"the logout URL does not lead back to the device: {url}")
        if 'id="sign-in"' not in self.browser.get(device + "/index.cgi").body:
            raise StepError("the device still has a session")
        self._done(f"{shown(url)} (status {self.browser.get(url).status})")
        say(f"{self.name}: user name {expected}")
