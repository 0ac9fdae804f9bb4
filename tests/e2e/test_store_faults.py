# The configuration store turning read-only under a running daemon: writing
# admin calls answer the store error and change nothing, key operations of
# providers already in memory go on, and once the store is writable again it
# is whole and the daemon restarts on it.
#
# The daemon opens its store at start-up and keeps it open, and permission
# bits are checked only when a file is opened (root ignores them anyway), so
# a chmod would change nothing for it. The immutable attribute is checked on
# every write, also through descriptors opened before: the database, its
# write-ahead log and their directory get it. The shared-memory index stays
# writable: it is mapped into memory, where a refused write is a SIGBUS that
# no program handles.

import sqlite3
import subprocess

import pytest

from harness import (Client, Daemon, admin_call, admin_ok, admin_token, audited_call,
                     first_message, make_attestation_key, mint, start_seeded)

PROVIDERS = "com.tarsel.orna.kms.providers."
KEY_OPS = "com.tarsel.orna.kms.key_operation."
ERROR = "com.tarsel.lumo.std.errors.error"
RULESET = "var/lib/zyrd/firewall/ironvale-zyrd"


def chattr(flag, paths):
    return subprocess.run(["chattr", flag, *map(str, paths)], capture_output=True)


def test_a_read_only_store_refuses_writes_and_stays_whole(kmip_server, tmp_path, request):
    key_path, cert = make_attestation_key(tmp_path)
    root = tmp_path / "root"
    env = start_seeded(root, {"providers": [{
        "provider": "p1", "masterKeyId": kmip_server.create_key(256), "connectionTimeout": 5,
        "servers": [{"name": "live", "hostname": "127.0.0.1", "port": kmip_server.port}],
        "trustedCertificates": [kmip_server.pem("ca")],
        "clientCertificate": kmip_server.pem("client"),
        "clientPrivateKey": kmip_server.key_path("client").read_text()}],
        "attestationCertificate": cert}, request)
    token = mint(key_path)

    def round_trip():
        # generate_key then decrypt on p1, which the first call puts in memory.
        made = []
        for method, params in [("generate_key", {"keySize": 32}), ("decrypt", {})]:
            if made:
                params = {"wrappedKey": made[0]["wrappedKey"]}
            name, response = audited_call(root, env.client, KEY_OPS + method,
                                          dict(params, provider="p1"), token)
            assert name is None, response
            made.append(response["result"]["output"])
        assert made[1]["key"] == made[0]["key"]

    round_trip()
    p1 = admin_ok(env, PROVIDERS + "get", {"provider": "p1"})
    blob = admin_ok(env, "com.tarsel.orna.kms.raw_config.get",
                    {"infoType": "CONFIG_AND_HASH"})["configuration"]

    ruleset = (root / RULESET).read_text()
    db = root / "var/lib/zyrd/configstore.db"
    locked = [db, db.with_name(db.name + "-wal"), db.parent]
    assert all(p.exists() for p in locked)
    request.addfinalizer(lambda: chattr("-i", locked))  # tmp_path must stay removable
    done = chattr("+i", locked)
    if done.returncode != 0:
        pytest.skip("cannot make the store immutable on this file system: " +
                    done.stderr.decode(errors="replace").strip())
    try:
        open(db, "r+b").close()
        pytest.skip("an immutable file still opens for writing here")
    except PermissionError:
        pass

    created = {"provider": "p2", "masterKeyId": "mk", "keyServer": {
        "type": "KMIP", "kmipServer": {"servers": [
            {"name": "s", "address": {"hostname": "new.example"}}]}}}
    store_error = PROVIDERS + "config_store_error"
    for method, params, error in [
            (PROVIDERS + "create", {"spec": created}, store_error),
            (PROVIDERS + "update", {"provider": "p1", "spec": {"keyServer": {
                "description": "changed", "kmipServer": {"servers": [
                    {"name": "s", "address": {"hostname": "other.example"}}]}}}}, store_error),
            (PROVIDERS + "delete", {"provider": "p1"}, store_error),
            (PROVIDERS + "credential.set", {"provider": "p1", "credential": "c"}, store_error),
            (PROVIDERS + "server_certificates.set",
             {"provider": "p1", "certificates": [kmip_server.pem("ca")]}, store_error),
            ("com.tarsel.orna.kms.raw_config.set", {"configuration": blob},
             "com.tarsel.orna.kms.raw_config.config_store_error")]:
        name, response = admin_call(env, method, params)
        assert (name, first_message(response)["id"]) == (ERROR, error), (method, response)
    # Nothing of the refused calls shows: not in the store, the firewall
    # ruleset or the providers in memory.
    assert admin_ok(env, PROVIDERS + "list", {}) == [{"provider": "p1"}]
    assert admin_ok(env, PROVIDERS + "get", {"provider": "p1"}) == p1
    assert (root / RULESET).read_text() == ruleset
    round_trip()
    assert env.daemon.proc.poll() is None

    chattr("-i", locked)
    # The store takes writes again, and the daemon stops cleanly on it.
    admin_ok(env, PROVIDERS + "update", {"provider": "p1",
                                         "spec": {"keyServer": {"description": "after"}}})
    round_trip()
    assert env.daemon.stop() == 0
    check = sqlite3.connect(db)
    assert check.execute("PRAGMA integrity_check").fetchall() == [("ok",)]
    check.close()

    restarted = Daemon(root)
    request.addfinalizer(restarted.kill)
    # Not audited_call: operation ids start again in the new process.
    client, admin = Client(restarted.http_port()), admin_token(restarted, root)
    p1["keyServer"]["description"] = "after"
    for method, params, output in [("list", {}, [{"provider": "p1"}]),
                                   ("get", {"provider": "p1"}, p1)]:
        name, response = client.call(PROVIDERS + method, params, admin)
        assert (name, response["result"]["output"]) == (None, output), response
