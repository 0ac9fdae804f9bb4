"""kmipcli, the operators' diagnostic tool, against a real KMIP server."""

import hashlib
import subprocess

from daemon_process import BUILD_DIR

KMIPCLI = str(BUILD_DIR / "kmipcli")


def kmipcli(server, *args, trust="ca", client="client", extra=()):
    argv = [KMIPCLI, "--host", "127.0.0.1", "--port", str(server.port), "--timeout", "10"]
    if trust:
        argv += ["--ca", str(server.cert_path(trust))]
    if client:
        argv += ["--cert", str(server.cert_path(client)), "--key", str(server.key_path(client))]
    return subprocess.run(argv + list(extra) + list(args), capture_output=True, text=True,
                          timeout=60)


def test_versions_state_and_key_info(kmip_server, tmp_path):
    done = kmipcli(kmip_server, "versions")
    assert done.returncode == 0, done.stderr
    assert done.stdout.split() == ["2.0", "1.4", "1.3", "1.2", "1.1", "1.0"]

    uid = kmip_server.create_key(256)
    key = kmip_server.get(uid)
    password = tmp_path / "password"
    password.write_text("s3cret\n")
    done = kmipcli(kmip_server, "key-info", uid,
                   extra=["--user", "operator", "--password-file", str(password)])
    assert done.returncode == 0, done.stderr
    assert done.stdout == "length: 32 bytes (256 bits)\nsha256: %s\n" % hashlib.sha256(key).hexdigest()
    assert key.hex() not in done.stdout + done.stderr

    done = kmipcli(kmip_server, "state", uid)
    assert (done.returncode, done.stdout) == (0, "2 (Active)\n")
    kmip_server.revoke(uid, "compromised")
    assert kmipcli(kmip_server, "state", uid).stdout == "4 (Compromised)\n"


def test_server_cert_needs_no_trust(kmip_server):
    done = kmipcli(kmip_server, "server-cert", trust=None, client=None)
    assert done.returncode == 0, done.stderr
    assert done.stdout == kmip_server.pem("server")


def test_failures_name_the_error_number(kmip_server):
    done = kmipcli(kmip_server, "versions", trust="other_ca")
    assert done.returncode == 1
    assert done.stderr.startswith("kmipcli: error 110: "), done.stderr

    done = kmipcli(kmip_server, "key-info", "no-such-key")
    assert done.returncode == 1
    assert "error 1007: " in done.stderr and "Item Not Found" in done.stderr, done.stderr

    done = subprocess.run([KMIPCLI, "--host", "127.0.0.1", "--port", "1", "versions"],
                          capture_output=True, text=True, timeout=60)
    assert done.returncode == 1
    assert done.stderr.startswith("kmipcli: error 75: "), done.stderr

    done = subprocess.run([KMIPCLI, "--host", "127.0.0.1", "versions"], capture_output=True,
                          text=True, timeout=60)
    assert done.returncode == 2
    assert "usage: kmipcli" in done.stderr
