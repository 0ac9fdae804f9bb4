# Real processes for black-box tests: zyrd under a scratch root, a PyKMIP
# server with a throwaway PKI, a JSON-RPC client, and the developer tools.

import base64
import http.client
import json
import os
import pathlib
import signal
import socket
import subprocess
import sys
import tempfile
import time
import types

BUILD_DIR = pathlib.Path(os.environ.get("ZYRD_BUILD_DIR", "build")).resolve()
# Multiplies every time-out of the harness: a sanitizer build runs several
# times slower (the thread sanitizer sets 5).
TIME_SCALE = float(os.environ.get("ZYRD_TEST_TIME_SCALE", "1"))
SOURCE_DIR = pathlib.Path(__file__).resolve().parents[2]
TOOLS = SOURCE_DIR / "tools"
sys.path.insert(0, str(TOOLS))

import pykmip_tool  # noqa: E402

# Every secret the tests handed to a daemon or got from one (text -> what it
# is), and every root a daemon ran under: at the end the suite checks that
# no log line and no audit record there holds any of them.
SECRETS = {}
PUBLIC = set()  # texts a test also sent as plain data: never taken for a leak
DAEMON_ROOTS = []
SECRET_NAMES = {"key", "keys", "credential", "privateKey", "password"}


def secret(value, what):
    # Remembers value (and the forms a log could show it in: each long line,
    # the bytes it encodes in Base64 as hex and as text); returns it.
    if not isinstance(value, str) or len(value) < 12:
        return value
    SECRETS[value] = what
    for line in value.splitlines():
        if len(line) >= 40:
            SECRETS[line] = what + " (a line)"
    try:
        raw = base64.b64decode(value, validate=True)
    except ValueError:
        return value
    if len(raw) >= 12:
        SECRETS[raw.hex()] = what + " (hex)"
        if raw.isascii() and raw.decode().isprintable():
            SECRETS[raw.decode()] = what + " (decoded)"
    return value


def remember_secrets(value, what):
    # secret() for every string under a secret's name in a JSON value.
    if isinstance(value, dict):
        for name, item in value.items():
            if name in SECRET_NAMES:
                for text in item if isinstance(item, list) else [item]:
                    secret(text, "%s %r" % (what, name))
            else:
                remember_secrets(item, what)
    elif isinstance(value, str) and len(value) >= 12:
        PUBLIC.add(value)
    elif isinstance(value, list):
        for item in value:
            remember_secrets(item, what)


def leaked_secrets():
    # (file, what) for each remembered secret found in a daemon's log or
    # audit files.
    secrets = {value: what for value, what in SECRETS.items()
               if not any(value in public for public in PUBLIC)}
    found = []
    for root in DAEMON_ROOTS:
        files = list(root.glob("zyrd-*.log")) + list((root / "var/log/zyrd").glob("audit.log*"))
        for path in files:
            text = path.read_text(errors="replace")
            found += [(str(path), what) for value, what in secrets.items() if value in text]
    return found


def free_port():
    # A 127.0.0.1 port nothing listens on (it was free a moment ago).
    with socket.socket() as s:
        s.bind(("127.0.0.1", 0))
        return s.getsockname()[1]


def write_config(root, body):
    path = pathlib.Path(root) / "etc/tarsel/cpservices/zyrd/config.xml"
    path.parent.mkdir(parents=True, exist_ok=True)
    path.write_text("<config>%s</config>\n" % body)
    return path


class Daemon:
    # A zyrd process on a free port (unless env names one) with the metadata
    # installed under root; its standard error goes to a zyrd-*.log there. A
    # sanitizer's report in that log fails the test once the process ended.

    def __init__(self, root, env=None):
        metadata = pathlib.Path(root) / "usr/lib/tarsel/lumo/zyr_lumo_metadata.json"
        metadata.parent.mkdir(parents=True, exist_ok=True)
        metadata.write_bytes((SOURCE_DIR / "metadata/zyr_lumo_metadata.json").read_bytes())
        env = {**os.environ, "ZYRD_ROOT": str(root), "ZYRD_HTTP_PORT": "0", **(env or {})}
        DAEMON_ROOTS.append(pathlib.Path(root))
        fd, self.log = tempfile.mkstemp(prefix="zyrd-", suffix=".log", dir=root)
        self.log = pathlib.Path(self.log)
        self.proc = subprocess.Popen([str(BUILD_DIR / "zyrd")], stdin=subprocess.DEVNULL,
                                     stdout=subprocess.DEVNULL, stderr=fd, env=env)
        os.close(fd)
        self.checked = False

    def lines(self):
        return self.log.read_text(errors="replace").splitlines()

    def _until(self, done, what, timeout=10.0):
        # Polls done() until it holds; fails when the daemon ended or time ran out.
        deadline = time.monotonic() + timeout * TIME_SCALE
        while not done():
            if self.proc.poll() is not None or time.monotonic() > deadline:
                time.sleep(0.1)  # what the daemon wrote last
                if done():
                    return
                raise AssertionError("no %s; log:\n%s" % (what, "\n".join(self.lines())))
            time.sleep(0.02)

    def wait_for(self, fragment):
        # Returns the first line containing fragment, or fails.
        found = lambda: [line for line in self.lines() if fragment in line]  # noqa: E731
        self._until(found, "line with %r" % fragment)
        return found()[0]

    def http_port(self):
        return int(self.wait_for("HTTP endpoint listening on TCP port ").rsplit(" ", 1)[1])

    def handles_sigterm(self):
        # Whether the process has installed its SIGTERM handler (start-up done).
        try:
            with open("/proc/%d/status" % self.proc.pid) as f:
                caught = next(line for line in f if line.startswith("SigCgt:")).split()[1]
            return bool(int(caught, 16) & (1 << (signal.SIGTERM - 1)))
        except (OSError, StopIteration):
            return False

    def stop(self, sig=signal.SIGTERM, timeout=10.0):
        # Waits for the end of start-up, signals, and returns the exit status.
        self._until(self.handles_sigterm, "end of start-up")
        self.proc.send_signal(sig)
        status = self.proc.wait(timeout * TIME_SCALE)
        self._check_log()
        return status

    def kill(self):
        if self.proc.poll() is None:
            self.proc.kill()
        self.proc.wait()
        self._check_log()

    def _check_log(self):
        # Once per process, after it ended (sanitizers report as they detect).
        if not self.checked:
            self.checked = True
            log = self.log.read_text(errors="replace")
            assert "Sanitizer" not in log, "sanitizer report in %s:\n%s" % (self.log, log)


class KmipServer:
    # PyKMIP on a free 127.0.0.1 port; certificates are cert_path(name) and
    # key_path(name) (pykmip_tool.PKI_NAMES). Always stop() it.

    def __init__(self, workdir):
        self.pki = pathlib.Path(workdir) / "pki"
        self.run = pathlib.Path(workdir) / "run"
        pykmip_tool.make_pki(self.pki)
        self.port = None
        self.proc = None

    def cert_path(self, name):
        return self.pki / (name + ".pem")

    def key_path(self, name):
        return self.pki / (name + ".key")

    def pem(self, name):
        return self.cert_path(name).read_text()

    def start(self, timeout=30.0, server_cert="server", port=None):
        # Presents the PKI's certificate server_cert; on port when given (a
        # restart), else on a free one.
        self.port = port or free_port()
        conf = pykmip_tool.write_server_config(self.pki, self.port, self.run, server_cert)
        with open(self.run / "server.out", "ab") as out:
            self.proc = subprocess.Popen(
                ["/usr/bin/pykmip-server", "-f", str(conf), "-l", str(self.run / "server.log")],
                stdin=subprocess.DEVNULL, stdout=out, stderr=out)
        deadline = time.monotonic() + timeout
        while True:
            try:
                socket.create_connection(("127.0.0.1", self.port), timeout=0.5).close()
                return self
            except OSError:
                if self.proc.poll() is not None or time.monotonic() > deadline:
                    self.stop()
                    raise AssertionError("PyKMIP did not start:\n" + "".join(
                        p.read_text(errors="replace") for p in self.run.glob("server.*")))
                time.sleep(0.05)

    def stop(self):
        if self.proc is not None and self.proc.poll() is None:
            self.proc.send_signal(signal.SIGINT)  # SIGTERM waits for an accept time-out
            try:
                self.proc.wait(10)
            except subprocess.TimeoutExpired:
                self.proc.kill()
                self.proc.wait()

    def admin(self, *commands, client="client"):
        # Runs commands (pykmip_tool.Admin.run word lists) as the PKI's client
        # `client` in one session; returns their outputs.
        admin = pykmip_tool.Admin(self.pki, self.port, client)
        try:
            return [admin.run(list(c)) for c in commands]
        finally:
            admin.close()

    def create_key(self, bits, client="client"):
        # An active AES key of `bits` bits, owned (and so usable only) by the
        # PKI's client `client`; returns its id.
        uid = self.admin(("create", str(bits)), client=client)[0]
        self.admin(("activate", uid), client=client)
        return uid


class Client:
    # One kept-alive HTTP connection to a daemon.

    def __init__(self, port):
        self.conn = http.client.HTTPConnection("127.0.0.1", port, timeout=30 * TIME_SCALE)
        self.next_id = 1

    def call(self, method, params=None, token=None):
        # Returns (lumo-error header or None, the decoded JSON-RPC response).
        body = {"jsonrpc": "2.0", "id": self.next_id, "method": method}
        self.next_id += 1
        if params is not None:
            body["params"] = params
            remember_secrets(params, method)
        headers = {"Content-Type": "application/json"}
        if token:
            headers["Authorization"] = "Bearer " + secret(token, "token")
        self.conn.request("POST", "/api", json.dumps(body), headers)
        response = self.conn.getresponse()
        data = response.read()
        assert response.status == 200, (response.status, data)
        decoded = json.loads(data)
        remember_secrets(decoded, method)
        return response.getheader("lumo-error"), decoded


def seed(root, spec):
    # Stores providers (and the attestation certificate) in the root's store.
    subprocess.run([str(TOOLS / "zyrd-seed"), "--cfgvault", str(BUILD_DIR / "cfgvault"), "-"],
                   input=json.dumps(spec).encode(), check=True,
                   env={"ZYRD_ROOT": str(root), "PATH": "/usr/bin:/bin"})


def make_attestation_key(directory):
    # Returns the private key's path and the certificate's text.
    subprocess.run([str(TOOLS / "make-attestation-key"), str(directory)], check=True,
                   stdout=subprocess.DEVNULL)
    d = pathlib.Path(directory)
    return d / "attestation-key.pem", (d / "attestation-cert.pem").read_text()


def mint(key_path, *args):
    done = subprocess.run([str(TOOLS / "mint-attestation-token"), "--key", str(key_path), *args],
                          check=True, stdout=subprocess.PIPE)
    return secret(done.stdout.decode().strip(), "attestation token")


def start_seeded(root, spec, request, config="<log><level>trivia</level></log>"):
    # A daemon with the config.xml body config over a store seeded with spec
    # (see seed), killed at the end of the pytest request; with a client and
    # the admin token.
    seed(root, spec)
    write_config(root, config)
    daemon = Daemon(root)
    request.addfinalizer(daemon.kill)
    return types.SimpleNamespace(root=root, daemon=daemon, client=Client(daemon.http_port()),
                                 admin=admin_token(daemon, root))


def admin_token(daemon, root):
    # The host admin token, which the daemon creates at its first start.
    daemon.http_port()  # start-up has passed the token handler
    return secret((pathlib.Path(root) / "var/lib/zyrd/admin.token").read_text().strip(),
                  "admin token")


def audited_call(root, client, method, params, token):
    # client.call, checking that the call wrote exactly one audit record with
    # the right success flag and a fresh operation id.
    before = len(audit_records(root))
    name, response = client.call(method, params, token)
    records = audit_records(root, before + 1)
    assert len(records) == before + 1 and records[-1]["eventId"] == "api.call"
    assert records[-1]["success"] is (name is None), (records[-1], response)
    assert records[-1]["opId"] not in [r["opId"] for r in records[:-1]]
    return name, response


def admin_call(env, method, params, token=None):
    # An audited call with env's admin token unless another is given.
    return audited_call(env.root, env.client, method, params,
                        env.admin if token is None else token)


def admin_ok(env, method, params):
    # The output of an audited admin call that must succeed.
    name, response = admin_call(env, method, params)
    assert name is None, response
    return response["result"]["output"]


def first_message(response):
    return response["result"]["error"]["messages"][0]


def cfgvault(root, *args, stdin=None):
    # Runs cfgvault on the root's store; returns the completed process.
    return subprocess.run([str(BUILD_DIR / "cfgvault"), *args], input=stdin,
                          capture_output=True, timeout=30 * TIME_SCALE,
                          env={**os.environ, "ZYRD_ROOT": str(root)})


def add_trust_material(root, provider, kmip):
    # Stores, beside what the provider has, the KMIP server's CA as trusted
    # and the test client certificate and key (until the API can do it).
    text = json.loads(cfgvault(root, "export", "providers", "kms", "orna").stdout)
    record = next(o for o in text["objects"] if o["instance"] == provider)
    key_server = record["subObjects"][0]
    key_server["values"]["server_cert"] = [kmip.pem("ca")]
    kmip_server = next(s for s in key_server["subObjects"] if s["name"] == "kmip_server")
    kmip_server["subObjects"].append({
        "name": "client_certificate", "instance": "", "subObjects": [],
        "values": {"certificate": kmip.pem("client"),
                   "private_key": secret(kmip.key_path("client").read_text(),
                                         "client private key")}})
    done = cfgvault(root, "import", "-", stdin=json.dumps(text).encode())
    assert done.returncode == 0, done.stderr


def audit_records(root, at_least=0, timeout=5.0):
    # The audit records so far; waits until there are `at_least` of them
    # (a call's record is written as it completes, around its response).
    path = pathlib.Path(root) / "var/log/zyrd/audit.log"
    deadline = time.monotonic() + timeout * TIME_SCALE
    while True:
        lines = path.read_text().splitlines() if path.exists() else []
        if len(lines) >= at_least or time.monotonic() > deadline:
            return [json.loads(line) for line in lines if line]
        time.sleep(0.02)
