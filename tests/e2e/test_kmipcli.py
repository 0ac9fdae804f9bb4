# kmipcli, the operators' diagnostic tool, against a real KMIP server.

import hashlib
import subprocess

from harness import BUILD_DIR


def kmipcli(server, *args, trust="ca", client="client"):
    argv = [str(BUILD_DIR / "kmipcli"), "--host", "127.0.0.1", "--port", str(server.port),
            "--timeout", "10"]
    if trust:
        argv += ["--ca", str(server.cert_path(trust))]
    if client:
        argv += ["--cert", str(server.cert_path(client)), "--key", str(server.key_path(client))]
    return subprocess.run(argv + list(args), capture_output=True, text=True, timeout=60)


def test_versions_state_key_info_and_server_certificate(kmip_server, tmp_path):
    done = kmipcli(kmip_server, "versions")
    assert done.returncode == 0, done.stderr
    assert done.stdout.split() == ["2.0", "1.4", "1.3", "1.2", "1.1", "1.0"]

    uid = kmip_server.create_key(256)
    key = bytes.fromhex(kmip_server.admin(("get", uid))[0])
    (tmp_path / "password").write_text("s3cret\n")
    done = kmipcli(kmip_server, "--user", "operator", "--password-file",
                   str(tmp_path / "password"), "key-info", uid)
    assert done.returncode == 0, done.stderr
    assert done.stdout == "length: 32 bytes (256 bits)\nsha256: %s\n" % hashlib.sha256(key).hexdigest()
    assert key.hex() not in done.stdout + done.stderr

    assert kmipcli(kmip_server, "state", uid).stdout == "2 (Active)\n"

    done = kmipcli(kmip_server, "server-cert", trust=None, client=None)
    assert (done.returncode, done.stdout) == (0, kmip_server.pem("server"))


def test_failures_name_the_error_number(kmip_server):
    done = kmipcli(kmip_server, "versions", trust="other_ca")
    assert done.returncode == 1 and done.stderr.startswith("kmipcli: error 110: "), done.stderr
    done = subprocess.run([str(BUILD_DIR / "kmipcli"), "--host", "127.0.0.1", "versions"],
                          capture_output=True, text=True, timeout=60)
    assert done.returncode == 2 and "usage: kmipcli" in done.stderr
