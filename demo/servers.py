"""The web servers under which the login program is run, each with the least configuration.

A server class is made with the stage and starts with the environment that the login program
shall see. `login` and `front` are the paths of the two programs there.
"""

import os
import shutil
import socket
import ssl
import threading

import forward
from stage import FOLDER, WEB_USER, WWW, write

HEADERS = {"X-Content-Type-Options": "nosniff", "X-Frame-Options": "DENY",
           "Referrer-Policy": "same-origin",  # a form says where it comes from
           "Content-Security-Policy": "frame-ancestors 'none'"}


class Server:
    title = ""
    processes = ()
    login = "/webman/login.cgi"
    front = "/index.cgi"

    def __init__(self, stage):
        self.stage = stage

    def start(self, environment):
        raise NotImplementedError

    def stop(self):
        for name in self.processes:
            self.stage.stop(name)

    def _write(self, text, **values):
        """Writes the server's configuration file and returns its path."""
        certificate, key = self.stage.device_certificate
        path = f"{FOLDER}/{self.processes[0]}.conf"
        write(path, text.format(
            port=self.stage.device_listens, user=WEB_USER, www=WWW, folder=FOLDER,
            certificate=certificate, key=key,
            log=self.stage.log_file(self.processes[0], WEB_USER), **values))
        return path


class Lighttpd(Server):
    title = "lighttpd"
    processes = ("lighttpd",)

    CONFIG = """
server.modules = ("mod_openssl", "mod_cgi", "mod_setenv")
server.bind = "127.0.0.1"
server.port = {port}
server.username = "{user}"
server.groupname = "{user}"
server.document-root = "{www}"
server.errorlog = "{log}"
index-file.names = ("index.cgi")
mimetype.assign = (".html" => "text/html; charset=utf-8", ".css" => "text/css",
                   ".js" => "text/javascript", ".svg" => "image/svg+xml")
cgi.assign = (".cgi" => "")
ssl.engine = "enable"
ssl.pemfile = "{certificate}"
ssl.privkey = "{key}"
setenv.add-response-header = ({headers})
setenv.set-environment = ({environment})
"""

    def start(self, environment):
        def pairs(values):
            return ", ".join(f'"{name}" => "{value}"' for name, value in values.items())
        path = self._write(self.CONFIG, headers=pairs(HEADERS), environment=pairs(environment))
        self.stage.spawn("lighttpd", ["lighttpd", "-D", "-f", path])
        self.stage.wait_for("lighttpd", self.stage.device_listens)


class Apache(Server):
    title = "Apache (mod_cgi)"
    processes = ("apache2",)

    CONFIG = """
ServerRoot "{folder}"
ServerName {name}
Listen 127.0.0.1:{port}
PidFile "{folder}/apache2.pid"
DefaultRuntimeDir "{folder}"
ErrorLog "{log}"
User {user}
Group {user}
{modules}
TypesConfig /etc/mime.types
AddType text/css .css
AddType text/javascript .js
AddType text/html .html
AddType image/svg+xml .svg
DocumentRoot "{www}"
DirectoryIndex index.cgi
SSLEngine on
SSLCertificateFile "{certificate}"
SSLCertificateKeyFile "{key}"
<Directory "{www}">
  Options +ExecCGI
  AddHandler cgi-script .cgi
  Require all granted
</Directory>
{headers}
{environment}
"""

    MODULES = ("mpm_prefork", "authz_core", "cgi", "dir", "env", "headers", "mime", "ssl")

    def start(self, environment):
        if not os.path.exists("/etc/mime.types"):
            write("/etc/mime.types", "")
        path = self._write(
            self.CONFIG, name=self.stage.device_name,
            modules="\n".join(f"LoadModule {name}_module /usr/lib/apache2/modules/mod_{name}.so"
                              for name in self.MODULES),
            headers="\n".join(f'Header always set {name} "{value}"'
                              for name, value in HEADERS.items()),
            environment="\n".join(f'SetEnv {name} "{value}"'
                                  for name, value in environment.items()))
        self.stage.spawn("apache2", ["apache2", "-X", "-f", path])
        self.stage.wait_for("apache2", self.stage.device_port)


class Nginx(Server):
    title = "nginx + fcgiwrap"
    processes = ("nginx", "fcgiwrap")

    CONFIG = """
daemon off;
user {user};
worker_processes 1;
pid {folder}/nginx.pid;
error_log {log};
events {{ }}
http {{
  access_log off;
  types {{ text/html html; text/css css; text/javascript js; image/svg+xml svg; }}
  client_body_temp_path {folder}/nginx-body;
  fastcgi_temp_path {folder}/nginx-fastcgi;
  proxy_temp_path {folder}/nginx-proxy;
  uwsgi_temp_path {folder}/nginx-uwsgi;
  scgi_temp_path {folder}/nginx-scgi;
  server {{
    listen 127.0.0.1:{port} ssl;
    ssl_certificate {certificate};
    ssl_certificate_key {key};
    root {www};
    index index.cgi;
    {headers}
    location ~ \\.cgi$ {{
      fastcgi_pass unix:{socket};
      fastcgi_param SCRIPT_FILENAME $document_root$fastcgi_script_name;
      fastcgi_param SCRIPT_NAME $fastcgi_script_name;
      fastcgi_param REQUEST_METHOD $request_method;
      fastcgi_param QUERY_STRING $query_string;
      fastcgi_param CONTENT_TYPE $content_type;
      fastcgi_param CONTENT_LENGTH $content_length;
      fastcgi_param SERVER_PROTOCOL $server_protocol;
      fastcgi_param REMOTE_ADDR $remote_addr;
      {environment}
    }}
  }}
}}
"""

    def start(self, environment):
        address = FOLDER + "/fcgi/socket"
        os.makedirs(os.path.dirname(address), exist_ok=True)
        shutil.chown(os.path.dirname(address), WEB_USER)
        if os.path.exists(address):
            os.unlink(address)
        path = self._write(
            self.CONFIG, socket=address,
            headers="\n    ".join(f'add_header {name} "{value}" always;'
                                  for name, value in HEADERS.items()),
            environment="\n      ".join(f'fastcgi_param {name} "{value}";'
                                        for name, value in environment.items()))
        self.stage.spawn("fcgiwrap", ["fcgiwrap", "-s", "unix:" + address, "-c", "4"], WEB_USER)
        self.stage.spawn("nginx", ["nginx", "-c", path, "-e", f"{self.stage.logs}/nginx.out"])
        self.stage.wait_for("nginx", self.stage.device_port)


class Busybox(Server):
    """Runs programs below /cgi-bin alone, and has no TLS: a proxy in front of it adds that."""
    title = "busybox httpd"
    processes = ("busybox",)
    login = "/cgi-bin/login.cgi"
    front = "/cgi-bin/index.cgi"

    def start(self, environment):
        os.makedirs(WWW + "/cgi-bin", exist_ok=True)
        for name in ("index.cgi", "webman/login.cgi"):
            target = f"{WWW}/cgi-bin/{os.path.basename(name)}"
            if not os.path.exists(target):
                os.link(f"{WWW}/{name}", target)
        port = self.stage.device_port + 100
        self.stage.spawn("busybox", ["busybox", "httpd", "-f", "-p", f"127.0.0.1:{port}", "-h",
                                     WWW, "-u", WEB_USER], environment=environment)
        self.stage.wait_for("busybox", port)
        context = ssl.create_default_context(ssl.Purpose.CLIENT_AUTH)
        context.load_cert_chain(*self.stage.device_certificate)
        self._door = socket.create_server(("127.0.0.1", self.stage.device_port))
        threading.Thread(target=self._accept, args=(context, port), daemon=True).start()

    def _accept(self, context, port):
        while True:
            try:
                outer, _ = self._door.accept()
            except OSError:
                return
            threading.Thread(target=self._carry, args=(context, outer, port), daemon=True).start()

    @staticmethod
    def _carry(context, outer, port):
        try:
            forward.carry(context.wrap_socket(outer, server_side=True), port)
        except OSError:
            outer.close()

    def stop(self):
        self._door.shutdown(socket.SHUT_RDWR)
        self._door.close()
        super().stop()


