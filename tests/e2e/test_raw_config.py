# The providers configuration as one blob: export it from one daemon, import
# it into another, and refuse blobs that are not a providers export.

import base64
import gzip
import hashlib
import json
import types
import zlib

import pytest

from harness import (add_trust_material, admin_call, admin_ok, audited_call, first_message,
                     make_attestation_key, mint, start_seeded)

RAW = "com.tarsel.orna.kms.raw_config."
ERRORS = "com.tarsel.lumo.std.errors."


@pytest.fixture(scope="module")
def env(kmip_server, tmp_path_factory, request):
    # Daemon a holds a working provider made over the API; daemon b starts
    # with another provider of its own.
    key_path, cert = make_attestation_key(tmp_path_factory.mktemp("attest"))
    a = start_seeded(tmp_path_factory.mktemp("a"), {"attestationCertificate": cert}, request)
    b = start_seeded(tmp_path_factory.mktemp("b"), {"attestationCertificate": cert}, request)
    servers = [{"name": "live", "address": {"hostname": "127.0.0.1", "port": kmip_server.port}}]
    master = kmip_server.create_key(256)
    for d, provider in ((a, "exported"), (b, "local")):
        name, response = call(d, "com.tarsel.orna.kms.providers.create", {"spec": {
            "provider": provider, "masterKeyId": master,
            "keyServer": {"type": "KMIP", "kmipServer": {"servers": servers}}}})
        assert name is None, response
    add_trust_material(a.root, "exported", kmip_server)
    return types.SimpleNamespace(a=a, b=b, token=mint(key_path))


def call(daemon, method, params):
    return admin_call(daemon, method, params)


def get(daemon, info_type=None):
    return admin_ok(daemon, RAW + "get", {} if info_type is None else {"infoType": info_type})


def generate(env, daemon, provider):
    return audited_call(daemon.root, daemon.client,
                        "com.tarsel.orna.kms.key_operation.generate_key",
                        {"provider": provider, "keySize": 32}, env.token)


def test_get_returns_the_digest_and_on_request_the_blob(env):
    digest_only = get(env.a)
    assert digest_only["configuration"] is None and len(digest_only["hash"]) == 64
    assert get(env.a, "HASH_ONLY") == digest_only
    full = get(env.a, "CONFIG_AND_HASH")
    text = gzip.decompress(base64.b64decode(full["configuration"]))
    assert hashlib.sha256(text).hexdigest() == full["hash"] == digest_only["hash"]
    assert [o["instance"] for o in json.loads(text)["objects"]] == ["exported"]

    name, response = call(env.a, RAW + "get", {"infoType": "EVERYTHING"})
    assert name == ERRORS + "invalid_argument"
    assert first_message(response)["id"] == "com.tarsel.orna.kms.raw_config.unknown_infotype"


def test_a_blob_moves_the_providers_to_another_daemon(env):
    exported = get(env.a, "CONFIG_AND_HASH")
    name, response = call(env.b, RAW + "set", {"configuration": exported["configuration"]})
    assert name is None, response
    assert get(env.b)["hash"] == exported["hash"]
    name, response = generate(env, env.b, "exported")
    assert name is None, response
    name, response = generate(env, env.b, "local")  # replaced by the import
    assert name == ERRORS + "not_found", response


def blob(text):
    return base64.b64encode(gzip.compress(text.encode())).decode()


def gzip_bomb():
    # 1 GiB of zeros in about 1 MB.
    packer = zlib.compressobj(9, zlib.DEFLATED, 31)
    zeros = bytes(1 << 20)
    return base64.b64encode(b"".join(packer.compress(zeros) for _ in range(1024)) +
                            packer.flush()).decode()


def test_blobs_that_are_not_a_providers_export_change_nothing(env):
    exported = json.loads(gzip.decompress(base64.b64decode(
        get(env.a, "CONFIG_AND_HASH")["configuration"])))
    with_cert = dict(exported, scope=exported["scope"] + [
        {"key": "certificate", "group": "attestation", "component": "orna"}])
    with_cert["objects"] = exported["objects"] + [{
        "key": "certificate", "group": "attestation", "component": "orna", "instance": "",
        "values": {"certificate": "forged"}, "subObjects": []}]
    mistyped = json.loads(json.dumps(exported))
    mistyped["objects"][0]["values"]["master_key_id"] = 7

    before = get(env.b)["hash"]
    drops = sum("Deleted all providers" in line for line in env.b.daemon.lines())
    for configuration in ["", base64.b64encode(b"not gzip at all").decode(), gzip_bomb(),
                          blob(json.dumps(with_cert)), blob(json.dumps(mistyped))]:
        name, response = call(env.b, RAW + "set", {"configuration": configuration})
        assert name == ERRORS + "invalid_argument", response
        assert first_message(response)["args"] == {"parameter": "configuration"}
    name, response = call(env.b, RAW + "set", {"configuration": blob("{not an export")})
    assert first_message(response)["id"] == "com.tarsel.orna.kms.raw_config.config_store_error"

    assert get(env.b)["hash"] == before
    assert sum("Deleted all providers" in line for line in env.b.daemon.lines()) == drops
