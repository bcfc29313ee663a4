"""A relay from this machine's loopback into the demo's network namespace.

Called as a program, before the namespace is made, it opens listening sockets and runs a
command that inherits them: a socket belongs to the network in which it was opened, whoever
accepts on it. start() then runs inside and hands each connection on to the same port there.
The command, and with it the namespace, ends when this program ends.
"""

import signal
import socket
import subprocess
import sys
import threading


def _copy(source, target):
    try:
        while data := source.recv(65536):
            target.sendall(data)
    except OSError:
        pass
    try:
        target.shutdown(socket.SHUT_WR)
    except OSError:
        pass


def carry(outer, port):
    """Hands a connection on to a port of this namespace, until both sides are done."""
    with outer, socket.create_connection(("127.0.0.1", port), 10) as inner:
        inner.settimeout(None)
        back = threading.Thread(target=_copy, args=(inner, outer), daemon=True)
        back.start()
        _copy(outer, inner)
        back.join()


def _accept(listener):
    port = listener.getsockname()[1]
    while True:
        outer, _ = listener.accept()
        threading.Thread(target=carry, args=(outer, port), daemon=True).start()


def start(descriptors):
    for descriptor in descriptors:
        threading.Thread(target=_accept, args=(socket.socket(fileno=descriptor),),
                         daemon=True).start()


def _open(port):
    listener = socket.socket()
    listener.setsockopt(socket.SOL_SOCKET, socket.SO_REUSEADDR, 1)
    try:
        listener.bind(("127.0.0.1", port))
    except OSError as error:
        sys.exit(f"demo: port {port} of 127.0.0.1: {error.strerror}; give another one with --port")
    listener.listen(64)
    return listener


def main():
    listeners = [_open(int(port)) for port in sys.argv[1:3]]
    descriptors = [listener.fileno() for listener in listeners]
    signals = {signal.SIGINT, signal.SIGTERM, signal.SIGHUP, signal.SIGCHLD}
    signal.pthread_sigmask(signal.SIG_BLOCK, signals)
    for number in signals:  # an ignored signal would not even be waited for
        signal.signal(number, lambda *_: None)
    with subprocess.Popen(sys.argv[3:] + ["--sockets", *map(str, descriptors)],
                          pass_fds=descriptors, preexec_fn=lambda: signal.pthread_sigmask(
                              signal.SIG_UNBLOCK, signals)) as command:
        for listener in listeners:
            listener.close()
        if signal.sigwait(signals) == signal.SIGCHLD:
            return command.wait()
        # The namespace goes with its first process, and nothing of it is outside.
        command.kill()
    print("\nstopped")
    return 0


if __name__ == "__main__":
    sys.exit(main())
