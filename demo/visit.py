"""A person's visit in Chromium: from the device's page to the provider's, in, back, and out."""

import os
import urllib.parse

from chromium import TabError
from scene import StepError, say, shown

CLIENTS = {"azure": "the client for Azure AD, whose ID tokens are checked with a published key "
                    "(RS256)",
           "websphere": "the client for WebSphere, whose ID tokens are checked with the client "
                        "secret (HS256)"}
SCREEN = {"width": 760, "height": 560, "deviceScaleFactor": 1, "mobile": False}
PHONE = {"width": 390, "height": 700, "deviceScaleFactor": 1, "mobile": True}


class Visit:
    STEPS = ("device page", "provider's login page", "name and password", "relay page",
             "back at the origin", "sign out", "signed out on the device", "sign in again")

    def __init__(self, scene, chromium, profile):
        self.scene, self.profile = scene, profile
        self.name = profile
        self.tab = chromium.person()
        self.step = 0

    def run(self):
        try:
            self._steps()
        except (TabError, StepError) as error:
            step = self.STEPS[self.step - 1]
            raise StepError(f"{self.name}: step {self.step} ({step}) failed: {error}") from error

    def _begin(self):
        self.step += 1

    def _done(self, text):
        say(f"{self.name} {self.step}/{len(self.STEPS)} {self.STEPS[self.step - 1]}: "
            f"{' '.join(text.split())}")

    def _at(self, prefix):
        self.tab.wait(lambda: self.tab.url.startswith(prefix), prefix)

    def _steps(self):
        device, provider, tab = self.scene.stage.device, self.scene.provider, self.tab

        self._begin()
        tab.open(device + "/index.cgi")
        tab.find("#sign-in")
        self._done(tab.text)

        self._begin()
        tab.click("#sign-in")
        name, password = provider.fields
        tab.find(name)
        self._at(provider.url)
        self._done(f"\"{tab.title}\" at {shown(tab.url)}")

        self._begin()
        tab.type(name, provider.login_name)
        tab.type(password, self.scene.person.password)
        tab.press("ENTER")
        provider.agree(tab)
        self._done("typed, and agreed to what the provider asked")

        self._begin()
        self._at(device)
        tab.wait(tab.relay, "the relay page")
        if "#origin=%2Findex.cgi&success=true" not in tab.relay()[-1]["url"]:
            raise StepError("the relay page says: " + tab.relay()[-1]["text"])
        self._done(tab.relay()[-1]["text"])

        self._begin()
        tab.wait(lambda: tab.url == device + "/index.cgi", "the origin")
        expected = self.scene.expected(self.profile)
        if tab.find("#user").text != expected:
            raise StepError(f"expected user {expected}, the device page says: {tab.text}")
        self._done(tab.text)

        self._begin()
        tab.click("#sign-out button")
        provider.agree_to_leave(tab)
        if provider.comes_back:
            tab.wait(lambda: tab.title == "Signed out", "the relay page")
            self._done(tab.text)
        else:
            tab.wait(lambda: provider.goodbye in tab.text, "the provider's last page")
            self._done(f"\"{provider.goodbye}\" on the provider's page: {provider.why_not_back}")

        self._begin()
        tab.open(device + "/index.cgi")
        if not tab.all("#sign-in"):
            raise StepError("the device still has a session: " + tab.text)
        self._done(tab.text)

        self._begin()
        tab.click("#sign-in")
        tab.find(password)
        self._done("the provider asks for the password")

    def outcome(self):
        """What happened, in one sentence."""
        provider = self.scene.provider
        end = "the device's page" if provider.comes_back else "the provider's page"
        profile = provider.setups[self.profile][0]
        return (f"{self.name}: {CLIENTS[profile]}. {self.scene.person.account} signed in at "
                f"{provider.title}, was {self.scene.expected(self.profile)} on the device, and "
                f"signed out, which ended on {end}; the next sign-in asked for the password.")


class Pictures:
    """Takes pictures of the pages that a person meets."""

    def __init__(self, scene, chromium, folder):
        self.scene, self.chromium, self.folder = scene, chromium, folder
        os.makedirs(folder, exist_ok=True)

    def take(self):
        tab = self.chromium.person()
        tab.command("Emulation.setDeviceMetricsOverride", **SCREEN)
        device, provider = self.scene.stage.device, self.scene.provider
        relay = device + "/webman/ssoclient/relay.html"
        tab.open(device + "/index.cgi")
        self._picture(tab, "device", "#sign-in")
        tab.click("#sign-in")
        self._picture(tab, "provider", provider.fields[1])
        tab.paste(provider.fields[0], provider.login_name)
        tab.paste(provider.fields[1], self.scene.person.password)
        tab.press("ENTER")
        provider.agree(tab)
        self._picture(tab, "device-signed-in", "#user")
        self._relay(tab, relay)
        tab.command("Emulation.setDeviceMetricsOverride", **PHONE)
        tab.command("Emulation.setEmulatedMedia",
                    features=[{"name": "prefers-color-scheme", "value": "dark"}])
        tab.speak("de-DE,de")
        self._picture(tab, "phone-dark-german", "#again")

    def _relay(self, tab, relay):
        """The three outcomes; the last one is a refusal."""
        tab.open(relay + "#success=true&origin=" + urllib.parse.quote("/index.cgi", safe=""))
        self._picture(tab, "relay-signed-in", "#onward")
        tab.open("about:blank")
        tab.open(relay)
        self._picture(tab, "relay-signed-out", "#onward")
        tab.open("about:blank")
        tab.open(relay + "#reason=timeout.K7Q2M9XB&success=false")
        self._picture(tab, "relay-not-signed-in", "#again")

    def _picture(self, tab, name, sign):
        tab.find(sign)
        path = f"{self.folder}/{name}.png"
        tab.screenshot(path)
        say(f"picture: {path}")
