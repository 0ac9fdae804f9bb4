# The store's command-line tool, and the daemon's restore of a seeded store.

import json
import os
import subprocess

from harness import BUILD_DIR, seed, write_config


def server(name, host):
    return {"name": "servers", "instance": name, "values": {"hostname": host, "port": 5696}}


PROVIDER = {
    "key": "providers", "group": "kms", "component": "orna", "instance": "p1",
    "values": {"master_key_id": "k1", "provider": "p1"},
    "subObjects": [{
        "name": "key_server", "instance": "",
        "values": {"type": "KMIP", "connection_timeout": 30, "server_cert": ["c1", "c2"]},
        "subObjects": [{"name": "kmip_server", "instance": "", "values": {"username": "u"},
                        "subObjects": [server("s2", "b"), server("s1", "a")]}],
    }],
}


def export_text(*objects):
    return json.dumps({"format": "orna-configstore-export", "version": 1,
                       "objects": list(objects)}).encode()


def cfgvault(db, *args, stdin=None, env=None):
    return subprocess.run([str(BUILD_DIR / "cfgvault"), *(["--db", str(db)] if db else []), *args],
                          input=stdin, capture_output=True, timeout=30, env=env)


def export(db):
    return cfgvault(db, "export", "providers", "kms", "orna")


def test_export_after_import_gives_the_text_back_byte_for_byte(tmp_path):
    db = tmp_path / "store" / "configstore.db"
    assert cfgvault(db, "import", "-", stdin=export_text(PROVIDER)).returncode == 0
    first = export(db)
    assert first.returncode == 0, first.stderr
    (tmp_path / "export.json").write_bytes(first.stdout)
    assert cfgvault(tmp_path / "other.db", "import", str(tmp_path / "export.json")).returncode == 0
    assert export(tmp_path / "other.db").stdout == first.stdout
    servers = json.loads(first.stdout)["objects"][0]["subObjects"][0]["subObjects"][0]
    assert [s["instance"] for s in servers["subObjects"]] == ["s2", "s1"]  # order kept


def test_malformed_import_exits_non_zero_and_changes_nothing(tmp_path):
    db = tmp_path / "configstore.db"
    cfgvault(db, "import", "-", stdin=export_text(PROVIDER))
    before = export(db).stdout
    for text in [b"", b"{", b'{"format":"orna-configstore-export","version":9,"objects":[]}',
                 export_text(dict(PROVIDER, values={"port": 1.5})),
                 export_text(dict(PROVIDER, values={"provider": "p1", "master_key_id": 7}))]:
        result = cfgvault(db, "import", "-", stdin=text)
        assert result.returncode == 1
        assert result.stderr.decode().startswith("cfgvault: import refused: ")
        assert result.stderr.count(b"\n") == 1
    missing = cfgvault(db, "import", str(tmp_path / "absent.json"))
    assert missing.returncode == 1 and b"cannot read" in missing.stderr
    assert export(db).stdout == before


def test_list_get_delete_and_usage(tmp_path):
    db = tmp_path / "configstore.db"
    other = dict(PROVIDER, instance="p0", values={"master_key_id": "k0"})
    cfgvault(db, "import", "-", stdin=export_text(PROVIDER, other))
    assert cfgvault(db, "list", "providers", "kms", "orna").stdout == b"p0\np1\n"
    got = cfgvault(db, "get", "providers", "kms", "orna", "p1")
    assert json.loads(got.stdout)["values"]["master_key_id"] == "k1"
    assert cfgvault(db, "delete", "providers", "kms", "orna", "p1").returncode == 0
    result = cfgvault(db, "get", "providers", "kms", "orna", "p1")
    assert (result.returncode, result.stderr) == (1, b"cfgvault: no object providers/kms/orna/p1\n")
    for args in ([], ["export", "providers"], ["frobnicate"]):
        result = cfgvault(db, *args)
        assert result.returncode == 2 and result.stderr.startswith(b"cfgvault: usage: ")
    # Reading a store that is not there creates nothing.
    absent = tmp_path / "absent" / "configstore.db"
    for args in (["export", "providers", "kms", "orna"], ["list", "providers", "kms", "orna"],
                 ["get", "providers", "kms", "orna", "p1"]):
        result = cfgvault(absent, *args)
        assert result.returncode == 1 and result.stderr.startswith(
            b"cfgvault: no store at " + str(absent).encode()), result.stderr
    assert not absent.parent.exists()


def test_default_database_is_the_daemons_and_start_up_restores_it(tmp_path, start_daemon):
    result = cfgvault(None, "import", "-", stdin=export_text(PROVIDER),
                      env=dict(os.environ, ZYRD_ROOT=str(tmp_path)))
    assert result.returncode == 0, result.stderr
    assert (tmp_path / "var/lib/zyrd/configstore.db").exists()
    write_config(tmp_path, "")
    d = start_daemon(tmp_path)
    d.wait_for("Restoring configuration key providers instance p1")
    d.wait_for("Stats logging interval")
    assert d.stop() == 0
    lines = d.lines()
    restore = next(i for i, l in enumerate(lines) if "Restoring configuration key zyrd_config" in l)
    assert restore < next(i for i, l in enumerate(lines) if "Stats logging interval" in l)


def test_seeding_one_kind_of_record_leaves_the_others(tmp_path):
    seed(tmp_path, {"providers": [{"provider": "p1", "masterKeyId": "k", "servers": []}]})
    seed(tmp_path, {"attestationCertificate": "PEM"})
    env = dict(os.environ, ZYRD_ROOT=str(tmp_path))
    assert cfgvault(None, "list", "providers", "kms", "orna", env=env).stdout == b"p1\n"
    assert cfgvault(None, "list", "certificate", "attestation", "orna", env=env).stdout == b"\n"
