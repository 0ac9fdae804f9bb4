# Key operations end to end: a real daemon over HTTP with a real KMIP server.
# Every call is checked to write one audit record with the right success flag.

import base64
import hashlib
import hmac
import json
import time

import jwt
import pytest
from cryptography.hazmat.primitives.ciphers.aead import AESGCM

from harness import (audit_records, audited_call, first_message, free_port, make_attestation_key,
                     mint, secret, start_seeded)

KEY_OPS = "com.tarsel.orna.kms.key_operation."
ERRORS = "com.tarsel.lumo.std.errors."


@pytest.fixture(scope="module")
def env(kmip_server, tmp_path_factory, request):
    # A daemon with providers on the shared KMIP server, and a token key.
    root = tmp_path_factory.mktemp("root")
    key_path, cert = make_attestation_key(tmp_path_factory.mktemp("attest"))
    active, deact = kmip_server.create_key(256), kmip_server.create_key(256)

    def provider(name, master, servers):
        return {"provider": name, "masterKeyId": master, "connectionTimeout": 5,
                "servers": [{"name": n, "hostname": "127.0.0.1", "port": p} for n, p in servers],
                "trustedCertificates": [kmip_server.pem("ca")],
                "clientCertificate": kmip_server.pem("client"),
                "clientPrivateKey": kmip_server.key_path("client").read_text()}

    live = ("live", kmip_server.port)
    env = start_seeded(root, {"providers": [provider("p1", active, [live]),
                                            provider("failover", active,
                                                     [("dead", free_port()), live]),
                                            provider("deact", deact, [live]),
                                            provider("deact-cold", deact, [live])],
                              "attestationCertificate": cert}, request)
    env.__dict__.update(key=key_path, token=mint(key_path), kmip=kmip_server, deact=deact,
                        active=active)
    return env


def call(env, method, params, token=None):
    # (lumo-error header or None, response) of a call with the attestation
    # token unless another (or "" for none) is given.
    return audited_call(env.root, env.client, method, params,
                        env.token if token is None else token)


def generate(env, provider, size=32, token=None):
    return call(env, KEY_OPS + "generate_key", {"provider": provider, "keySize": size}, token)


def test_generate_then_decrypt_gives_the_same_key(env):
    name, response = generate(env, "p1")
    assert name is None, response
    generated = response["result"]["output"]
    assert len(base64.b64decode(generated["key"])) == 32
    name, response = call(env, KEY_OPS + "decrypt",
                          {"provider": "p1", "wrappedKey": generated["wrappedKey"]})
    assert name is None and response["result"]["output"]["key"] == generated["key"], response
    assert audit_records(env.root)[-1]["object"] == KEY_OPS.rstrip(".") + ":decrypt"


def test_the_wrapped_key_opens_with_the_key_servers_master_key(env):
    # An oracle independent of the daemon: the master key's bytes from the
    # key server's own client, and another AES-GCM implementation.
    name, response = generate(env, "p1")
    assert name is None, response
    prefix, version, key_id, iv, tag, ciphertext = response["result"]["output"]["wrappedKey"].split(
        ".")

    def unb64(text):
        return base64.urlsafe_b64decode(text + "=" * (-len(text) % 4))

    assert (prefix, version, unb64(key_id).decode()) == ("zyrwk", "v1", env.active)
    master = bytes.fromhex(secret(env.kmip.admin(("get", env.active))[0], "master key"))
    plain = AESGCM(master).decrypt(unb64(iv), unb64(ciphertext) + unb64(tag), None)
    assert base64.b64encode(plain).decode() == response["result"]["output"]["key"]


def test_failover_to_the_second_server_logs_the_first_once(env):
    name, response = generate(env, "failover")
    assert name is None, response
    warnings = [line for line in env.daemon.lines()
                if "GenerateKey failed on provider failover server dead" in line]
    assert len(warnings) == 1, warnings


def test_deactivated_master_key_decrypts_but_does_not_encrypt(env):
    name, response = generate(env, "deact")
    assert name is None, response
    wrapped = response["result"]["output"]["wrappedKey"]
    env.kmip.admin(("revoke", env.deact, "deactivated"))
    # The key read before stays cached until the next status refresh; a
    # provider that has not read it yet sees the new state at once.
    assert generate(env, "deact")[0] is None
    name, response = generate(env, "deact-cold")
    assert name == ERRORS + "error"
    assert first_message(response)["id"] == "com.tarsel.orna.kms.master_key_unusable_for_encryption"
    assert first_message(response)["args"]["server"] == "live"
    name, response = call(env, KEY_OPS + "decrypt",
                          {"provider": "deact-cold", "wrappedKey": wrapped})
    assert name is None, response


def test_argument_and_lookup_errors(env):
    for provider, size, error, args in [
            ("", 32, "invalid_argument", {"parameter": "provider"}),
            ("nope", 32, "not_found", {"provider": "nope"}),
            ("p1", 0, "invalid_argument", {"parameter": "keySize"}),
            ("p1", 65536, "invalid_argument", {"parameter": "keySize"})]:
        name, response = generate(env, provider, size)
        assert (name, first_message(response)["args"]) == (ERRORS + error, args), response
    name, response = call(env, KEY_OPS + "encrypt", {"provider": "p1", "plaintext": "AA=="})
    assert name == ERRORS + "error" and response["result"]["error"]["messages"] == []


def hs256(secret, claims):
    # An HS256 JWT made by hand: the JWT library refuses PEM texts as secrets.
    def b64url(data):
        return base64.urlsafe_b64encode(data).rstrip(b"=")
    signing_input = (b64url(json.dumps({"alg": "HS256", "typ": "JWT"}).encode()) + b"." +
                     b64url(json.dumps(claims).encode()))
    return (signing_input + b"." +
            b64url(hmac.new(secret, signing_input, hashlib.sha256).digest())).decode()


def test_attestation_token_checks(env, tmp_path):
    soon = int(time.time()) + 60
    private = env.key.read_bytes()
    public = (env.key.parent / "attestation-pubkey.pem").read_bytes()
    other_key, _ = make_attestation_key(tmp_path)
    invalid_token = "com.tarsel.orna.kms.authentication.invalid_token"
    for token, refused_as_invalid in [
            ("", False),  # none at all
            (mint(env.key, "--exp", str(int(time.time()) - 1)), True),
            (mint(env.key, "--iss", "https://localhost/elsewhere"), True),
            (jwt.encode({"iss": "x/attestation", "aud": ["zyrd"], "exp": soon}, private,
                        algorithm="RS256"), True),
            # Keyed with vouchd's public key the HMAC verifies; the algorithm is refused.
            (hs256(public, {"iss": "x/attestation", "aud": "zyrd", "exp": soon}), True),
            (mint(other_key), False)]:  # not a vouchd token at all
        name, response = generate(env, "p1", token=token)
        assert name == ERRORS + "unauthenticated", response
        ids = [m["id"] for m in response["result"]["error"]["messages"]]
        assert (ids == [invalid_token]) if refused_as_invalid else (invalid_token not in ids)

    # A token that expires in the current second is still good. It expires in
    # the next second and is sent once that second has begun; a call that did
    # not also end within it shows nothing (a slow machine) and is tried again.
    for _ in range(10):
        second = int(time.time()) + 1
        token = mint(env.key, "--exp", str(second))
        while time.time() < second:
            time.sleep(0.01)
        name, response = generate(env, "p1", token=token)
        if time.time() < second + 1:
            assert name is None, response
            break
    else:
        pytest.fail("no call ended within the second it began in")


def test_admin_token_and_entitlements(env):
    admin = (env.root / "var/lib/zyrd/admin.token").read_text().strip()
    name, response = generate(env, "p1", token=admin)
    assert name is None, response
    # An attestation token may not call an operation reserved for the admin.
    name, response = call(env, "com.tarsel.orna.kms.providers.list", {})
    assert name == ERRORS + "unauthorized", response
    name, response = call(env, "com.tarsel.orna.kms.status.get", None)
    assert name is None and response["result"]["output"]["health"] == "HEALTHY", response
