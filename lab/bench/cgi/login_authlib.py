#!/usr/bin/python3
"""A login program that Authlib serves, settings from the same file.
    login_authlib.py redirect|login"""
import json
import sys

from authlib.common.security import generate_token

with open("/usr/qova/etc/ssoclient/azure.conf") as file:
    settings = json.load(file)


def redirect():
    from authlib.oauth2.rfc6749.parameters import prepare_grant_uri

    url = prepare_grant_uri(
        settings["azure_authorization_endpoint"], settings["azure_client_id"], "code",
        redirect_uri=settings["azure_redirect_uri"], scope="openid", state=generate_token(),
        nonce=generate_token())
    sys.stdout.write("Location: %s\n\n" % url)


def login():
    from authlib.integrations.requests_client import OAuth2Session
    from authlib.jose import JsonWebKey, jwt

    session = OAuth2Session(
        settings["azure_client_id"], settings["azure_client_secret"],
        redirect_uri=settings["azure_redirect_uri"],
        token_endpoint_auth_method="client_secret_post")
    token = session.fetch_token(settings["azure_token_endpoint"], code="0.AXoAcode",
                                grant_type="authorization_code",
                                verify="/etc/ssl/certs/ca-certificates.crt")
    verify = {"verify": "/etc/ssl/certs/ca-certificates.crt", "withhold_token": True}
    discovery = session.get(settings["azure_wellknown"], **verify).json()
    keys = session.get(discovery["jwks_uri"], **verify).json()
    claims = jwt.decode(token["id_token"], JsonWebKey.import_key_set(keys), claims_options={
        "aud": {"essential": True, "value": settings["azure_client_id"]}})
    claims.validate()
    print(claims["unique_name"])


{"redirect": redirect, "login": login}[sys.argv[1]]()
