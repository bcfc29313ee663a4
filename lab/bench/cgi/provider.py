#!/usr/bin/python3
"""The provider of the benchmark: the same answers over TLS, at once, to everyone.
    provider.py MATERIAL CERTIFICATE KEY PORT"""
import json
import os
import socketserver
import ssl
import sys
from http.server import BaseHTTPRequestHandler

material, certificate, key, port = sys.argv[1:]
base = "https://localhost:" + port


def read(name):
    with open(os.path.join(material, name)) as file:
        return file.read()


ANSWERS = {
    "/token": json.dumps({"token_type": "Bearer", "expires_in": 3599, "access_token": "x" * 1200,
                          "id_token": read("rs256")}),
    "/keys": read("keys-10"),
    "/discovery": json.dumps({
        "issuer": "https://login.example.net/tenant/v2.0", "jwks_uri": base + "/keys",
        "token_endpoint": base + "/token", "authorization_endpoint": base + "/authorize",
        "response_types_supported": ["code"], "subject_types_supported": ["pairwise"],
        "id_token_signing_alg_values_supported": ["RS256"],
        "token_endpoint_auth_methods_supported": ["client_secret_post"]}),
}


class Handler(BaseHTTPRequestHandler):
    protocol_version = "HTTP/1.1"
    wbufsize = -1  # headers and body in one write

    def answer(self):
        body = ANSWERS.get(self.path, "{}").encode()
        self.rfile.read(int(self.headers.get("Content-Length") or 0))
        self.send_response(200 if self.path in ANSWERS else 404)
        self.send_header("Content-Type", "application/json")
        self.send_header("Content-Length", str(len(body)))
        self.end_headers()
        self.wfile.write(body)

    do_GET = do_POST = answer

    def log_message(self, *_):
        pass


class Server(socketserver.ThreadingTCPServer):
    allow_reuse_address = True
    daemon_threads = True
    request_queue_size = 64

    def handle_error(self, *_):
        pass


context = ssl.SSLContext(ssl.PROTOCOL_TLS_SERVER)
context.load_cert_chain(certificate, key)
with Server(("127.0.0.1", int(port)), Handler) as server:
    server.socket = context.wrap_socket(server.socket, server_side=True)
    print("ready", flush=True)
    server.serve_forever()
