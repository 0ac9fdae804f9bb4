"""A real KMIP server (PyKMIP) for end-to-end tests, with throwaway certificates.

    server = KmipServer(tmp_path)      # makes the PKI (see pykmip_tool.PKI_NAMES)
    server.start()                     # free 127.0.0.1 port, waits until it accepts
    key_id = server.create_key(256)    # created and activated as client "client"
    server.get(key_id)                 # the key bytes the server holds
    server.stop()                      # SIGINT; always call it (the fixture does)

The certificates are server.cert_path(name) / server.key_path(name), their
texts server.pem(name). Keys belong to the CN of the client that created them.
"""

import os
import pathlib
import signal
import socket
import subprocess
import sys
import time

sys.path.insert(0, str(pathlib.Path(__file__).resolve().parent.parent.parent / "tools"))

import pykmip_tool  # noqa: E402

SERVER = "/usr/bin/pykmip-server"


def free_port():
    with socket.socket(socket.AF_INET, socket.SOCK_STREAM) as s:
        s.bind(("127.0.0.1", 0))
        return s.getsockname()[1]


def accepts(port):
    try:
        with socket.create_connection(("127.0.0.1", port), timeout=0.5):
            return True
    except OSError:
        return False


class KmipServer:
    def __init__(self, workdir):
        self.dir = pathlib.Path(workdir)
        self.pki = self.dir / "pki"
        self.run = self.dir / "run"
        pykmip_tool.make_pki(self.pki)
        self.port = None
        self.proc = None

    def cert_path(self, name):
        return self.pki / (name + ".pem")

    def key_path(self, name):
        return self.pki / (name + ".key")

    def pem(self, name):
        return self.cert_path(name).read_text()

    def start(self, timeout=30.0):
        self.port = free_port()
        conf = pykmip_tool.write_server_config(self.pki, self.port, self.run)
        out = open(self.run / "server.out", "ab")
        self.proc = subprocess.Popen([SERVER, "-f", str(conf), "-l", str(self.run / "server.log")],
                                     stdin=subprocess.DEVNULL, stdout=out, stderr=out)
        out.close()
        deadline = time.monotonic() + timeout
        while not accepts(self.port):
            if self.proc.poll() is not None or time.monotonic() > deadline:
                self.stop()
                raise AssertionError("PyKMIP did not start:\n" + self.log())
            time.sleep(0.05)
        return self

    def log(self):
        text = ""
        for name in ("server.out", "server.log"):
            path = self.run / name
            if path.exists():
                text += path.read_text(errors="replace")
        return text

    def stop(self):
        if self.proc is None:
            return
        if self.proc.poll() is None:
            self.proc.send_signal(signal.SIGINT)
            try:
                self.proc.wait(10)
            except subprocess.TimeoutExpired:
                self.proc.kill()
                self.proc.wait()
        self.proc = None

    def admin(self, client="client"):
        """A connected pykmip_tool.Admin; close() it when done."""
        return pykmip_tool.Admin(self.pki, self.port, client)

    def _one(self, fn, client="client"):
        admin = self.admin(client)
        try:
            return fn(admin)
        finally:
            admin.close()

    def create_key(self, bits, activate=True, client="client"):
        def create(admin):
            uid = admin.create(bits)
            if activate:
                admin.activate(uid)
            return uid
        return self._one(create, client)

    def revoke(self, uid, how):
        """how: "deactivated" or "compromised"."""
        self._one(lambda a: a.revoke(uid, how))

    def destroy(self, uid):
        self._one(lambda a: a.destroy(uid))

    def get(self, uid):
        return self._one(lambda a: a.get(uid))

    def state(self, uid):
        return self._one(lambda a: a.state(uid))
