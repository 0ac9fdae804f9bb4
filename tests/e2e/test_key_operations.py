"""Key operations end to end: a real daemon over HTTP with a real KMIP server."""

import base64
import hashlib
import hmac
import json
import socket
import time

import jwt
import pytest

from daemon_process import write_config
from zyrd_api import (Client, admin_token, audit_records, error, make_attestation_key, mint,
                      output, seed)

KEY_OPS = "com.tarsel.orna.kms.key_operation."


def closed_port():
    with socket.socket() as s:
        s.bind(("127.0.0.1", 0))
        return s.getsockname()[1]


@pytest.fixture(scope="module")
def env(kmip_server, tmp_path_factory, request):
    """A daemon with providers on the shared KMIP server, and a token key."""
    root = tmp_path_factory.mktemp("root")
    key_path, cert = make_attestation_key(tmp_path_factory.mktemp("attest"))
    active = kmip_server.create_key(256)
    deact = kmip_server.create_key(256)

    def provider(name, master, servers):
        return {"provider": name, "masterKeyId": master, "connectionTimeout": 5,
                "servers": servers, "trustedCertificates": [kmip_server.pem("ca")],
                "clientCertificate": kmip_server.pem("client"),
                "clientPrivateKey": kmip_server.key_path("client").read_text()}

    live = {"name": "live", "hostname": "127.0.0.1", "port": kmip_server.port}
    dead = {"name": "dead", "hostname": "127.0.0.1", "port": closed_port()}
    seed(root, {"providers": [provider("p1", active, [live]),
                              provider("failover", active, [dead, live]),
                              provider("deact", deact, [live])],
                "attestationCertificate": cert})
    write_config(root, "<log><level>verbose</level></log>")

    from daemon_process import Daemon
    daemon = Daemon(root)
    request.addfinalizer(daemon.kill)
    client = Client(daemon.http_port())
    request.addfinalizer(client.close)
    return {"root": root, "daemon": daemon, "client": client, "key": key_path,
            "token": mint(key_path), "kmip": kmip_server, "deact": deact}


def generate(env, provider, size=32, token=None):
    return env["client"].call(KEY_OPS + "generate_key", {"provider": provider, "keySize": size},
                              token or env["token"])


def test_generate_then_decrypt_gives_the_same_key(env):
    before = len(audit_records(env["root"]))
    name, response = generate(env, "p1")
    assert name is None, response
    generated = output(response)
    assert len(base64.b64decode(generated["key"])) == 32
    name, response = env["client"].call(KEY_OPS + "decrypt",
                                        {"provider": "p1", "wrappedKey": generated["wrappedKey"]},
                                        env["token"])
    assert name is None, response
    assert output(response)["key"] == generated["key"]

    records = audit_records(env["root"], before + 2)[before:]
    assert [(r["object"], r["success"]) for r in records] == [
        (KEY_OPS.rstrip(".") + ":generate_key", True),
        (KEY_OPS.rstrip(".") + ":decrypt", True)]
    assert all(r["eventId"] == "api.call" for r in records)


def test_failover_to_the_second_server_logs_the_first_once(env):
    name, response = generate(env, "failover")
    assert name is None, response
    warnings = [l for l in env["daemon"].lines()
                if "GenerateKey failed on provider failover server dead" in l]
    assert len(warnings) == 1, warnings


def test_deactivated_master_key_decrypts_but_does_not_encrypt(env):
    # Wrap a key while the master key is active, then deactivate it.
    name, response = generate(env, "deact")
    assert name is None, response
    wrapped = output(response)["wrappedKey"]
    env["kmip"].revoke(env["deact"], "deactivated")

    name, response = generate(env, "deact")
    assert name == "com.tarsel.lumo.std.errors.error"
    message = error(response)["messages"][0]
    assert message["id"] == "com.tarsel.orna.kms.master_key_unusable_for_encryption"
    assert message["args"]["server"] == "live"

    before = len(audit_records(env["root"]))
    name, response = env["client"].call(KEY_OPS + "decrypt",
                                        {"provider": "deact", "wrappedKey": wrapped},
                                        env["token"])
    assert name is None, response
    assert audit_records(env["root"], before + 1)[-1]["success"] is True


def test_argument_and_lookup_errors(env):
    name, response = generate(env, "")
    assert name == "com.tarsel.lumo.std.errors.invalid_argument"
    assert error(response)["messages"][0]["args"] == {"parameter": "provider"}

    name, response = generate(env, "nope")
    assert name == "com.tarsel.lumo.std.errors.not_found"
    assert error(response)["messages"][0]["defaultMessage"] == "The provider 'nope' does not exist."

    for size in (0, 65536):
        name, response = generate(env, "p1", size)
        assert name == "com.tarsel.lumo.std.errors.invalid_argument"
        assert error(response)["messages"][0]["args"] == {"parameter": "keySize"}

    before = len(audit_records(env["root"]))
    name, response = env["client"].call(KEY_OPS + "encrypt", {"provider": "p1", "plaintext": "AA=="},
                                        env["token"])
    assert name == "com.tarsel.lumo.std.errors.error"
    assert error(response)["messages"] == []
    assert audit_records(env["root"], before + 1)[-1]["success"] is False


def b64url(data):
    return base64.urlsafe_b64encode(data).rstrip(b"=")


def hs256(secret, claims):
    """An HS256 JWT made by hand: the JWT library refuses PEM texts as secrets."""
    signing_input = (b64url(json.dumps({"alg": "HS256", "typ": "JWT"}).encode()) + b"." +
                     b64url(json.dumps(claims).encode()))
    signature = hmac.new(secret, signing_input, hashlib.sha256).digest()
    return (signing_input + b"." + b64url(signature)).decode()


def expect_unauthenticated(env, token, invalid_token_message):
    name, response = generate(env, "p1", token=token or "")
    assert name == "com.tarsel.lumo.std.errors.unauthenticated", response
    ids = [m["id"] for m in error(response)["messages"]]
    if invalid_token_message:
        assert ids == ["com.tarsel.orna.kms.authentication.invalid_token"]
    else:
        assert "com.tarsel.orna.kms.authentication.invalid_token" not in ids


def test_attestation_token_checks(env, tmp_path):
    client, key = env["client"], env["key"]
    name, response = client.call(KEY_OPS + "generate_key", {"provider": "p1", "keySize": 16})
    assert name == "com.tarsel.lumo.std.errors.unauthenticated"

    expect_unauthenticated(env, mint(key, "--exp", str(int(time.time()) - 1)), True)
    expect_unauthenticated(env, mint(key, "--iss", "https://localhost/elsewhere"), True)
    with open(key, "rb") as f:
        private = f.read()
    array_aud = jwt.encode({"iss": "x/attestation", "aud": ["zyrd"],
                            "exp": int(time.time()) + 60}, private, algorithm="RS256")
    expect_unauthenticated(env, array_aud, True)
    # HS256 keyed with vouchd's public key verifies as a signature, and is
    # refused for its algorithm.
    public = (key.parent / "attestation-pubkey.pem").read_bytes()
    expect_unauthenticated(env, hs256(public, {"iss": "x/attestation", "aud": "zyrd",
                                               "exp": int(time.time()) + 60}), True)
    # Signed by another key: not a vouchd token at all.
    other_key, _ = make_attestation_key(tmp_path)
    expect_unauthenticated(env, mint(other_key), False)

    # A token that expires in the current second is still good: start just
    # after a second begins so the call lands within it.
    while time.time() % 1 > 0.2:
        time.sleep(0.05)
    now_token = mint(key, "--exp", str(int(time.time())))
    name, response = generate(env, "p1", token=now_token)
    assert name is None or time.time() % 1 < 0.01, response


def test_admin_token_and_entitlements(env):
    admin = admin_token(env["root"])
    name, response = generate(env, "p1", token=admin)
    assert name is None, response

    # An attestation token may not call an operation reserved for the admin.
    name, response = env["client"].call("com.tarsel.orna.kms.providers.list", {}, env["token"])
    assert name == "com.tarsel.lumo.std.errors.unauthorized", response
    name, response = env["client"].call("com.tarsel.orna.kms.status.get", None, env["token"])
    assert name is None and output(response)["health"] == "HEALTHY", response
