"""The same login program, unchanged, under four web servers."""

import unittest

from device import DeviceTest, device
from providers.scripted import Script
from servers import Apache, Busybox, Lighttpd, Nginx


class OnServer:
    """What every web server must carry: redirects, two cookies in one answer, a form, the request's
    own variables, and the static relay page."""
    server = None

    @classmethod
    def setUpClass(cls):
        device().use(cls.server)

    @classmethod
    def tearDownClass(cls):
        device().use(Lighttpd)

    def test_signs_in_and_out(self):
        for profile in ("azure", "websphere"):
            with self.subTest(profile=profile):
                self.device.choose(profile)
                self.assert_signed_in(self.sign_in(), profile)
                page = self.sign_out()
                self.assertTrue(page.location.startswith(
                    f"{self.device.provider.url}/{profile}/logout"), page.location)
                self.assertIsNone(self.user())

    def test_head_of_the_start(self):
        page = self.start()
        self.assertEqual(page.status, 302)
        self.assertEqual(len(page.headers.get_all("Set-Cookie")), 1)
        self.assertEqual(page.headers.get_all("Cache-Control"), ["no-store"])
        self.assertTrue(page.headers["Location"].startswith(
            self.device.provider.url + "/websphere/authorization?client_id=device-websphere&"))
        self.assertEqual(page.body.strip(), "")

    def test_refuses(self):
        """The server passes the client's address on."""
        other = self.new_browser()
        self.assert_refused(other.get(self.callback_url()), "expired",
                            "login was not started in this browser, or is used up", browser=other)

    def test_form_of_another_site(self):
        """The server passes on what the browser says of a form's page."""
        self.sign_in()
        for headers in ({"Sec-Fetch-Site": "cross-site"}, {"Origin": "https://other.example.org"}):
            self.reference(self.sign_out(headers=headers), "sign-out-refused")
            self.assertEqual(self.user(), "alice")

    def test_error_with_markup(self):
        self.device.provider.script = Script(refuse={"error": "<b>&%25\"'#"})
        self.assert_refused(self.sign_in(), "provider-error", "provider refused",
                            ", error <b>&%25\"'#: ")

    def test_deadline(self):
        self.device.options(deadline=1)
        self.device.provider.script = Script(silent=("token",))
        self.assert_refused(self.sign_in(), "timeout", "provider did not answer in time")

    def test_relay_page(self):
        page = self.browser.get(self.device.stage.device + "/webman/ssoclient/relay.html")
        self.assertEqual(page.status, 200)
        self.assertTrue(page.headers["Content-Type"].startswith("text/html"))
        for name, kind in (("relay.js", "(text|application)/javascript"),
                           ("relay.css", "text/css")):
            self.assertIn(f'"{name}"', page.body)
            part = self.browser.get(self.device.stage.device + "/webman/ssoclient/" + name)
            self.assertEqual(part.status, 200)
            self.assertRegex(part.headers["Content-Type"], "^" + kind)


class OnLighttpd(OnServer, DeviceTest):
    server = Lighttpd


class OnApache(OnServer, DeviceTest):
    server = Apache


class OnNginx(OnServer, DeviceTest):
    server = Nginx


class OnBusybox(OnServer, DeviceTest):
    server = Busybox


if __name__ == "__main__":
    unittest.main()
