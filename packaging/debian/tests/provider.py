"""A token endpoint on loopback: answers every code with an ID token for the client's secret.

provider.py CLIENT SECRET USER: writes its port on the first line, and serves until it is ended.
"""

import base64
import hashlib
import hmac
import http.server
import json
import sys
import time
import urllib.parse

CLIENT, SECRET, USER = sys.argv[1:]


def part(data):
    return base64.urlsafe_b64encode(data).rstrip(b"=").decode()


def id_token():
    signed = ".".join(part(json.dumps(piece).encode()) for piece in (
        {"alg": "HS256"}, {"aud": CLIENT, "sub": USER, "exp": int(time.time()) + 60}))
    return signed + "." + part(hmac.new(SECRET.encode(), signed.encode(), hashlib.sha256).digest())


class Handler(http.server.BaseHTTPRequestHandler):
    def do_POST(self):
        form = urllib.parse.parse_qs(self.rfile.read(int(self.headers["Content-Length"])).decode())
        if form.get("client_id") == [CLIENT] and form.get("client_secret") == [SECRET] \
                and form.get("code") == ["right"]:
            answer = {"id_token": id_token()}
        else:
            answer = {"error": "invalid_grant", "error_description": "wrong code"}
        body = json.dumps(answer).encode()
        self.send_response(200 if "id_token" in answer else 400)
        self.send_header("Content-Length", str(len(body)))
        self.end_headers()
        self.wfile.write(body)


with http.server.HTTPServer(("127.0.0.1", 0), Handler) as server:
    print(server.server_port, flush=True)
    server.serve_forever()
