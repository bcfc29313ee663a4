"""Owners and modes of the files on the device, as device/README.md has them."""

import os
import stat
import unittest

from device import BUILD, LIBEXEC, LOGIN, DeviceTest, Launched
from stage import WWW

WEB_GROUP = 33


def mode_of(path):
    status = os.stat(path)
    return status.st_uid, status.st_gid, stat.S_IMODE(status.st_mode)


class Modes(DeviceTest):
    def test_settings(self):
        self.sign_in()
        for name, mode in (("profile", 0o644), ("azure", 0o600), ("websphere", 0o600),
                           ("login", 0o644)):
            self.assertEqual(mode_of(f"/usr/qova/etc/ssoclient/{name}.conf"), (0, 0, mode), name)

    def test_programs(self):
        self.assertEqual(mode_of(LOGIN), (0, WEB_GROUP, 0o4750))
        self.assertEqual(mode_of(WWW + "/index.cgi")[2] & 0o7022, 0)

    def test_no_program_is_set_id_when_it_is_built(self):
        for name in ("login.cgi", "launcher.cgi", "index.cgi"):
            self.assertEqual(os.stat(f"{BUILD}/device/{name}").st_mode & 0o7000, 0)


class ModesLaunched(Launched, DeviceTest):
    def test_programs(self):
        self.assertEqual(mode_of(LOGIN), (0, WEB_GROUP, 0o4750))
        self.assertEqual(mode_of(LIBEXEC), (0, WEB_GROUP, 0o750))


if __name__ == "__main__":
    unittest.main()
