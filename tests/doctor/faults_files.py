"""Files: missing, misnamed, unreadable, not JSON, wrong keys, wrong types."""

import os
import shutil

from place import SETTINGS
from row import AZURE, EITHER, PROFILE, WARNING, Fault, profile, put, rename_key, replace, text

EMPTY = r"^the browser is sent to \?client_id=&"  # what an unread settings file gives


OLD_TOKEN = '"azure_token_endpoint": "https://login.example.net:4443/old/oauth2/token"'


def path(name):
    return f"{SETTINGS}/{name}"


def moved(old, new):
    return lambda place: os.rename(path(old), path(new))


def mode(name, bits):
    return lambda place: os.chmod(path(name), bits)


def dangling(place):
    os.unlink(path(AZURE))
    os.symlink("azure.conf.v2", path(AZURE))


def fifo(place):
    os.unlink(path(AZURE))
    os.mkfifo(path(AZURE), 0o600)


def folder(place):
    os.unlink(path(AZURE))
    os.mkdir(path(AZURE))
    place.later(lambda: os.rmdir(path(AZURE)))


def closed_folder(place):
    os.chmod(SETTINGS, 0o700)
    place.later(lambda: os.chmod(SETTINGS, 0o755))


def writable_folder(place):
    os.chmod(SETTINGS, 0o777)
    place.later(lambda: os.chmod(SETTINGS, 0o755))


def in_etc(place):
    os.makedirs("/etc/ssoclient", exist_ok=True)
    for name in (PROFILE, AZURE):
        shutil.move(path(name), "/etc/ssoclient/" + name)


def web_owner(place):
    os.chown(path(AZURE), 33, 33)


def nested(place):
    place.values[AZURE] = {"azure": place.values[AZURE]}
    place.save(AZURE)


def listed(place):
    place.values[AZURE] = [place.values[AZURE]]
    place.save(AZURE)


def of_code(content):
    """UTF-16 with a byte-order mark, as an editor's "Unicode"."""
    return content.encode("utf-16")


FAULTS = [
    Fault("profile.conf is missing", lambda place: os.unlink(path(PROFILE)), "sign-in is off",
          ("profile.conf", "missing|does not exist|not exist|no such"),
          do=("profile.conf|file|it",)),
    Fault("azure.conf is missing", lambda place: os.unlink(path(AZURE)), EMPTY,
          ("azure.conf", "missing|does not exist|not exist|no such")),
    Fault("settings file in upper case", moved(AZURE, "Azure.conf"), EMPTY, ("azure.conf",),
          do=("Azure.conf",)),
    Fault("settings file with .txt behind it", moved(AZURE, "azure.conf.txt"), EMPTY,
          ("azure.conf",), do=("azure.conf.txt",)),
    Fault("settings file still called .example", moved(AZURE, "azure.conf.example"), EMPTY,
          ("azure.conf",), do=("azure.conf.example",)),
    Fault("azure.conf is a dangling link", dangling, EMPTY, ("link",), at=("azure.conf",)),
    Fault("files in /etc/ssoclient", in_etc, "sign-in is off", ("profile.conf",),
          at=("/usr/qova/etc/ssoclient",), more=1),
    Fault("azure.conf is a FIFO", fifo, "does not end", ("fifo|pipe|regular",), at=("azure.conf",)),
    Fault("azure.conf is a folder", folder, EMPTY, ("folder|directory",), at=("azure.conf",)),
    Fault("azure.conf is empty", text(lambda _: ""), EMPTY, ("empty",), at=("azure.conf",)),
    Fault("azure.conf is all zero bytes", text(lambda content: "\0" * len(content)), EMPTY,
          ("json|zero|nul|empty",), at=("azure.conf",)),
    Fault("settings nested under a name", nested, EMPTY, ("nested|inside|under|within",),
          at=("azure.conf",)),
    Fault("settings in a list", listed, "", ("object|list|array",), at=("azure.conf",)),
    Fault("keys without their prefix", replace('"azure_', '"'), EMPTY, ("azure_client_id|keys?",),
          at=("azure.conf",), do=("azure_",), more=8),
    Fault("a key with hyphens", rename_key("azure_client_id", "azure-client-id"), "client_id",
          ("azure_client_id|azure-client-id",), at=("azure.conf",), do=("azure_client_id",)),
    Fault("a key in camel case", rename_key("azure_token_endpoint", "azureTokenEndpoint"),
          "parse json falied", ("azure_?token_?endpoint",), do=("azure_token_endpoint",)),
    Fault("secret's key misspelt", rename_key("azure_client_secret", "azure_client_secert"),
          "client_secret", ("azure_client_sec(ret|ert)",), do=("azure_client_secret",)),
    Fault("redirect_url for redirect_uri", rename_key("azure_redirect_uri", "azure_redirect_url"),
          "50011", ("azure_redirect_ur",), do=("azure_redirect_uri",)),
    Fault("well_known for wellknown", rename_key("azure_wellknown", "azure_well_known"),
          "kid does not exist", ("azure_well_?known",), do=("azure_wellknown",)),
    Fault("key with a blank at its end", rename_key("azure_tenant_id", "azure_tenant_id "),
          "tenant ID invalid", ("azure_tenant_id",), do=("azure_tenant_id",)),
    Fault("websphere's keys in azure.conf", replace('"azure_client', '"websphere_client'),
          "client_id", ("azure_client_id|websphere_client_id|keys",), more=1, at=("azure.conf",)),
    Fault("comma missing between lines", replace(f'true,\n', 'true\n'), EMPTY, ("json|comma",),
          at=("azure.conf", r"line 3|3:\d"), do=("comma",)),
    Fault("closing brace missing", text(lambda content: content.rstrip().rstrip("}")), EMPTY,
          ("json|brace|end",), at=("azure.conf",)),
    Fault("curly quotation marks",
          text(lambda content: content.replace('"azure_client_id"', "“azure_client_id”")), EMPTY,
          ("quot|json",), at=("azure.conf", r"line 3|3:\d"), do=("quot|straight|\"",)),
    Fault("single quotation marks", text(lambda content: content.replace('"', "'")), EMPTY,
          ("json|quot",), at=("azure.conf",), do=("quot|\"",)),
    Fault("no-break space before a value",
          text(lambda content: content.replace('"azure_client_id": ', '"azure_client_id":\u00a0')),
          EMPTY, ("no-break|non-breaking|u\\+00a0|json",), at=("azure.conf", r"line 3|3:\d")),
    Fault("KEY=VALUE lines", text(lambda _: "azure_client_id=x\nazure_tenant_id=y\n"), EMPTY,
          ("json",), at=("azure.conf",)),
    Fault("byte-order mark", text(lambda content: "\ufeff" + content), EMPTY, ("byte-order|bom",),
          at=("azure.conf",)),
    Fault("byte-order mark in profile.conf", text(lambda content: "\ufeff" + content, PROFILE),
          "sign-in is off", ("byte-order|bom",), at=("profile.conf",)),
    Fault("saved as UTF-16", text(of_code), EMPTY, ("utf-16|utf-8|encod|byte-order",),
          at=("azure.conf",)),
    Fault("a name in Latin-1",
          text(lambda content: content.replace("{", '{\n  "site": "Geb\udce4ude",', 1)),
          "signed in", ("utf-8|encod|site",), at=("azure.conf",), grade=WARNING),
    Fault("Python's True", replace("true", "True", PROFILE), "sign-in is off", ("json|true",),
          at=("profile.conf",)),
    Fault("a second text behind the object", text(lambda content: content + "azure_debug: 1\n"),
          "signed in", ("after|behind|follow",), at=("azure.conf",), grade=WARNING),
    Fault("old value of a key left below the new one",
          replace('"azure_tenant_id"', OLD_TOKEN + ',\n  "azure_tenant_id"'), "signed in",
          ("azure_token_endpoint", "twice|again|more than once|two|duplicate"), grade=WARNING),
    Fault("new value of a key above the old one",
          text(lambda content: content.replace("}", '  ,' + OLD_TOKEN + '}')), "parse json falied",
          ("connect|refuse|reach",), at=("4443",)),
    Fault("sso_enable as a string", profile(sso_enable="true"), "sign-in is off", ("sso_enable",),
          at=("profile.conf",), do=("true",)),
    Fault("sso_enable as a number", profile(sso_enable=1), "sign-in is off", ("sso_enable",),
          at=("profile.conf",), do=("true",)),
    Fault("sso_enable false", profile(sso_enable=False), "sign-in is off",
          ("sso_enable|off|disabled|not enabled",), at=("sso_enable",), do=("true",)),
    Fault("enabled instead of sso_enable", replace('"sso_enable"', '"sso_enabled"', PROFILE),
          "sign-in is off", ("sso_enable",), at=("profile.conf",), do=("sso_enable",)),
    Fault("azure_sso_enable as a string", put(sso_enable="true"), "signed in",
          ("azure_sso_enable",), grade=WARNING, do=("true",)),
    Fault("provider with a capital letter", profile(sso_profile="Azure"), "profile not support",
          ("profile",), at=("sso_profile",), do=("azure",)),
    Fault("provider's product name", profile(sso_profile="entra"), "profile not support",
          ("profile",), at=("sso_profile",), do=("azure",)),
    Fault("liberty instead of websphere", profile(sso_profile="liberty"), "profile not support",
          ("profile",), at=("sso_profile",), do=("websphere",), base="liberty"),
    Fault("provider with a blank", profile(sso_profile="azure "), "profile not support",
          ("profile",), at=("sso_profile",), do=("azure",)),
    Fault("profile names the provider without a file", profile(sso_profile="websphere"), EMPTY,
          ("websphere.conf",)),
    Fault("profile.conf closed to the web server", mode(PROFILE, 0o600), "read profile file failed",
          ("profile.conf",), do=("chmod|0?644",)),
    Fault("folder closed to the web server", closed_folder, "read profile file failed",
          ("folder|directory|profile.conf",), at=("/usr/qova/etc/ssoclient",),
          do=("chmod|755|open",)),
    Fault("secret readable by all", mode(AZURE, 0o644), "signed in", ("secret|read",),
          at=("azure.conf",), do=("chmod|0?600",), grade=WARNING),
    Fault("azure.conf writable by all", mode(AZURE, 0o666), "signed in", ("write|change",),
          at=("azure.conf",), do=("chmod",), grade=EITHER),
    Fault("azure.conf is the web server's", web_owner, "signed in", ("own|write|change|www-data",),
          at=("azure.conf",), do=("chown",), grade=WARNING),
    Fault("settings folder writable by all", writable_folder, "signed in", ("folder|directory",),
          at=("ssoclient",), do=("chmod",), grade=WARNING),
    Fault("client ID as a number", put(client_id=4711), "CWOAU0033E", ("websphere_client_id",),
          base="liberty"),
    Fault("tenant ID null",
          lambda place: (place.values[AZURE].update(azure_tenant_id=None), place.save(AZURE)),
          "tenant ID invalid", ("azure_tenant_id",)),
    Fault("tenant ID empty", put(tenant_id=""), "tenant ID invalid", ("azure_tenant_id",)),
    Fault("redirect URI in a list",
          put(redirect_uri=["https://device.example.net/webman/login.cgi"]), "50011",
          ("azure_redirect_uri",)),
]
