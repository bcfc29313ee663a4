"""What a variable of the environment could make a program do: files that notice when they are
opened, a port that notices a connection, and the list of the variables."""

import contextlib
import ctypes
import os
import socket
import struct
import threading

FOLDER = "/run/stage/traps"
IN_OPEN, IN_CREATE = 0x20, 0x100

# From ld.so(8), environ(7), malloc(3), mallopt(3), mtrace(3), locale(7), tzset(3), resolver(3),
# resolv.conf(5), host.conf(5), hostname(7), nscd(8), gconv's and the GNU C library's manual.
LOADER = """
LD_ASSUME_KERNEL LD_AUDIT LD_BIND_NOT LD_BIND_NOW LD_DEBUG LD_DEBUG_OUTPUT LD_DYNAMIC_WEAK
LD_HWCAP_MASK LD_LIBRARY_PATH LD_ORIGIN_PATH LD_POINTER_GUARD LD_PREFER_MAP_32BIT_EXEC LD_PRELOAD
LD_PROFILE LD_PROFILE_OUTPUT LD_SHOW_AUXV LD_TRACE_LOADED_OBJECTS LD_TRACE_PRELINKING
LD_USE_LOAD_BIAS LD_VERBOSE LD_WARN""".split()
LIBC = """
GCONV_PATH GETCONF_DIR GLIBC_TUNABLES HOSTALIASES LANG LANGUAGE LC_ALL LC_COLLATE LC_CTYPE
LC_MESSAGES LC_MONETARY LC_NUMERIC LC_TIME LIBC_FATAL_STDERR_ LOCALDOMAIN LOCPATH MALLOC_ARENA_MAX
MALLOC_ARENA_TEST MALLOC_CHECK_ MALLOC_MMAP_MAX_ MALLOC_MMAP_THRESHOLD_ MALLOC_PERTURB_
MALLOC_TOP_PAD_ MALLOC_TRACE MALLOC_TRIM_THRESHOLD_ NIS_PATH NLSPATH OUTPUT_CHARSET POSIXLY_CORRECT
RESOLV_ADD_TRIM_DOMAINS RESOLV_HOST_CONF RESOLV_MULTI RESOLV_OVERRIDE_TRIM_DOMAINS RESOLV_REORDER
RES_OPTIONS TEXTDOMAIN TEXTDOMAINDIR TMPDIR TZ TZDIR GLIBCXX_FORCE_NEW GLIBCXX_TUNABLES""".split()
# From libcurl-env(3) and libcurl-tutorial(3), and of what Debian's libcurl is linked with.
CURL = """
http_proxy https_proxy ftp_proxy ws_proxy wss_proxy all_proxy no_proxy HTTP_PROXY HTTPS_PROXY
FTP_PROXY ALL_PROXY NO_PROXY CURL_CA_BUNDLE CURL_HOME CURL_SSL_BACKEND CURL_DEBUG CURL_MEMDEBUG HOME
USER LOGNAME NTLMUSER NETRC QLOGDIR SSLKEYLOGFILE SSH_AUTH_SOCK XDG_CONFIG_HOME SOCKS_PROXY
SOCKS_SERVER KRB5_CONFIG KRB5_TRACE KRB5CCNAME KRB5_KTNAME LDAPCONF LDAPRC LDAPTLS_CACERT SASL_PATH
GNUTLS_DEBUG_LEVEL GNUTLS_SYSTEM_PRIORITY_FILE P11_KIT_DEBUG""".split()
# From openssl-env(7). OPENSSL_ia32cap is left out where the program is set-id, see SECURITY.md.
OPENSSL = """
CTLOG_FILE OPENSSL OPENSSL_CONF OPENSSL_CONF_INCLUDE OPENSSL_CONFIG OPENSSL_ENGINES
OPENSSL_MALLOC_FAILURES OPENSSL_MALLOC_FD OPENSSL_MODULES OPENSSL_TRACE OPENSSL_ia32cap RANDFILE
SSL_CERT_DIR SSL_CERT_FILE SSL_CIPHER TSGET""".split()
# What this program read once, and what a browser or a web server could send.
PROGRAM = """
SSO_LOGIN_ROAD SSO_LOGIN_DEADLINE IFS ENV BASH_ENV SHELLOPTS PERL5LIB PYTHONPATH PATH_INFO
HTTP_PROXY_CONNECTION SERVER_NAME DOCUMENT_ROOT""".split()
VARIABLES = [*LOADER, *LIBC, *CURL, *OPENSSL, *PROGRAM]  # jsoncpp reads none

FILES = ("libcurl.so.4", "libssoclient.so.1", "libcrypto.so.3", "libc.so.6", "gconv-modules",
         "openssl.cnf", "hosts", "UTC", ".netrc", "C.utf8")
FOLDERS = ("GCONV_PATH", "GETCONF_DIR", "LD_LIBRARY_PATH", "LD_PROFILE_OUTPUT", "LOCPATH",
           "NIS_PATH", "OPENSSL_CONF_INCLUDE", "OPENSSL_ENGINES", "OPENSSL_MODULES", "SSL_CERT_DIR",
           "TMPDIR", "TZDIR", "HOME", "CURL_HOME", "QLOGDIR", "XDG_CONFIG_HOME", "SASL_PATH",
           "TEXTDOMAINDIR", "PERL5LIB", "PYTHONPATH")
VALUES = {
    "LD_DEBUG": {"LD_DEBUG": "all", "LD_DEBUG_OUTPUT": FOLDER + "/debug"},
    "LD_DEBUG_OUTPUT": {"LD_DEBUG": "libs", "LD_DEBUG_OUTPUT": FOLDER + "/debug-too"},
    "LD_PROFILE": {"LD_PROFILE": "libc.so.6", "LD_PROFILE_OUTPUT": FOLDER},
    "LD_SHOW_AUXV": {"LD_SHOW_AUXV": "1"},
    "LD_BIND_NOW": {"LD_BIND_NOW": "1"},
    "GLIBC_TUNABLES": {"GLIBC_TUNABLES": "glibc.malloc.check=3:glibc.malloc.perturb=165"},
    "TZ": {"TZ": "ABC+11:37"},
    "LANG": {"LANG": "tr_TR.UTF-8"},
    "LC_ALL": {"LC_ALL": "tr_TR.UTF-8"},
    "RES_OPTIONS": {"RES_OPTIONS": "debug attempts:5 timeout:30"},
    "LOCALDOMAIN": {"LOCALDOMAIN": "other.example.org"},
    "no_proxy": {"no_proxy": "*"},
    "NO_PROXY": {"NO_PROXY": "*"},
    "OPENSSL_TRACE": {"OPENSSL_TRACE": "TLS,CONF"},
    "OPENSSL_ia32cap": {"OPENSSL_ia32cap": "~0x200000200000000"},
    "SSO_LOGIN_ROAD": {"SSO_LOGIN_ROAD": "plain"},
    "SSO_LOGIN_DEADLINE": {"SSO_LOGIN_DEADLINE": "1"},
    "IFS": {"IFS": "/"},
}


class Traps:
    """The traps, set. `sprung` returns what has happened, once."""

    def __init__(self):
        os.makedirs(FOLDER, exist_ok=True)
        os.chmod(FOLDER, 0o777)
        for name in (*FILES, *VARIABLES):
            with open(f"{FOLDER}/{name}", "w", encoding="ascii") as file:
                file.write("x\n")
            os.chmod(f"{FOLDER}/{name}", 0o666)
        libc = ctypes.CDLL(None, use_errno=True)
        self._watch = libc.inotify_init1(os.O_NONBLOCK)
        if libc.inotify_add_watch(self._watch, FOLDER.encode(), IN_OPEN | IN_CREATE) < 0:
            raise OSError(ctypes.get_errno(), "inotify")
        self._connections = []
        self._port = socket.create_server(("127.0.0.1", 0))
        threading.Thread(target=self._accept, daemon=True).start()

    def _accept(self):
        with contextlib.suppress(OSError):
            while True:
                connection, _ = self._port.accept()
                self._connections.append("connection")
                connection.close()

    def value(self, name):
        """The environment in which that variable would be noticed."""
        if name in VALUES:
            return VALUES[name]
        if name.lower().endswith("_proxy") or name == "SOCKS_SERVER":
            return {name: f"http://127.0.0.1:{self._port.getsockname()[1]}"}
        return {name: FOLDER if name in FOLDERS else f"{FOLDER}/{name}"}

    def sprung(self):
        found = self._connections[:]
        self._connections.clear()
        with contextlib.suppress(BlockingIOError):
            events = os.read(self._watch, 1 << 20)
            while events:
                _, _, _, size = struct.unpack_from("iIII", events)
                found.append(events[16:16 + size].rstrip(b"\0").decode() or FOLDER)
                events = events[16 + size:]
        return found

    def close(self):
        os.close(self._watch)
        self._port.shutdown(socket.SHUT_RDWR)
        self._port.close()
