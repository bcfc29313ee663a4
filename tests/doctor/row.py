"""A fault as data: what the administrator did, what a sign-in then does, what the doctor says."""

import dataclasses
from typing import Callable

from place import AZURE, PROFILE, WEBSPHERE

FAILURE, WARNING, EITHER = ("failure",), ("warning",), ("failure", "warning")


@dataclasses.dataclass
class Fault:
    """Patterns are regular expressions, without regard to case. `says` are about the first line of
    one finding, `at` about its file, key or URL (or the first line), `do` about its action. `more`
    is how many further failures are true too. `never` may appear nowhere."""
    name: str
    set_up: Callable
    sign_in: str
    says: tuple
    at: tuple = ()
    do: tuple = ()
    grade: tuple = FAILURE
    base: str = "v1"
    run: tuple = ()
    never: tuple = ()
    more: int = 0
    program: bool = False  # the login program itself answers instead of the sign-in


def all_of(*steps):
    def do(place):
        for step in steps:
            step(place)
    return do


def put(**changes):
    """Changes keys of the provider's file, named without their prefix; None removes one, a
    function gets the old value."""
    def do(place):
        prefix = "websphere_" if place.base == "liberty" else "azure_"
        values = place.values[place.file]
        for key, value in changes.items():
            key = prefix + key
            if callable(value):
                value = value(values[key])
            if value is None:
                values.pop(key, None)
            else:
                values[key] = value
        place.save(place.file)
    return do


def profile(**changes):
    def do(place):
        place.values[PROFILE].update(changes)
        place.save(PROFILE)
    return do


def text(change, name=None):
    """Changes the text of a file: the provider's, or another."""
    def do(place):
        place.write(name or place.file, change(place.read(name or place.file)))
    return do


def replace(old, new, name=None):
    def change(content):
        assert old in content, old
        return content.replace(old, new)
    return text(change, name)


def twin(**settings):
    return lambda place: place.twin.set(**settings)


def rename_key(old, new):
    return replace(f'"{old}"', f'"{new}"')


__all__ = ["AZURE", "EITHER", "FAILURE", "Fault", "PROFILE", "WARNING", "WEBSPHERE", "all_of",
           "profile", "put", "rename_key", "replace", "text", "twin"]
