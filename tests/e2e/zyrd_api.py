"""A JSON-RPC client for zyrd's HTTP API, and helpers to seed a daemon's root."""

import http.client
import json
import pathlib
import subprocess
import time

from daemon_process import SOURCE_DIR, BUILD_DIR

TOOLS = SOURCE_DIR / "tools"


class Client:
    """One kept-alive HTTP connection to a daemon."""

    def __init__(self, port, host="127.0.0.1"):
        self.conn = http.client.HTTPConnection(host, port, timeout=30)
        self.next_id = 1

    def close(self):
        self.conn.close()

    def call(self, method, params=None, token=None):
        """Returns (lumo-error header or None, the decoded JSON-RPC response)."""
        body = {"jsonrpc": "2.0", "id": self.next_id, "method": method}
        self.next_id += 1
        if params is not None:
            body["params"] = params
        headers = {"Content-Type": "application/json"}
        if token:
            headers["Authorization"] = "Bearer " + token
        self.conn.request("POST", "/api", json.dumps(body), headers)
        response = self.conn.getresponse()
        data = response.read()
        assert response.status == 200, (response.status, data)
        return response.getheader("lumo-error"), json.loads(data)


def output(response):
    return response["result"]["output"]


def error(response):
    return response["result"]["error"]


def seed(root, spec):
    """Stores providers (and the attestation certificate) in the root's store."""
    subprocess.run([str(TOOLS / "zyrd-seed"), "--cfgvault", str(BUILD_DIR / "cfgvault"), "-"],
                   input=json.dumps(spec).encode(), check=True,
                   env={"ZYRD_ROOT": str(root), "PATH": "/usr/bin:/bin"})


def make_attestation_key(directory):
    subprocess.run([str(TOOLS / "make-attestation-key"), str(directory)], check=True,
                   stdout=subprocess.DEVNULL)
    d = pathlib.Path(directory)
    return d / "attestation-key.pem", (d / "attestation-cert.pem").read_text()


def mint(key_path, *args):
    done = subprocess.run([str(TOOLS / "mint-attestation-token"), "--key", str(key_path)]
                          + list(args), check=True, stdout=subprocess.PIPE)
    return done.stdout.decode().strip()


def admin_token(root):
    return (pathlib.Path(root) / "var/lib/zyrd/admin.token").read_text().strip()


def audit_records(root, at_least=0, timeout=5.0):
    """The audit records so far; waits until there are `at_least` of them
    (a call's record is written as it completes, around its response)."""
    path = pathlib.Path(root) / "var/log/zyrd/audit.log"
    deadline = time.monotonic() + timeout
    while True:
        lines = path.read_text().splitlines() if path.exists() else []
        if len(lines) >= at_least or time.monotonic() > deadline:
            return [json.loads(line) for line in lines if line]
        time.sleep(0.02)
