# Managing key providers over the API as an operator does, with the admin
# token: create, read, change and delete them, key operations through a
# provider made this way, and the firewall ruleset that follows them.

import pytest

from harness import (add_trust_material, admin_call, admin_ok, audited_call, first_message,
                     free_port, make_attestation_key, mint, seed, start_seeded, write_config)

PROVIDERS = "com.tarsel.orna.kms.providers."
GENERATE = "com.tarsel.orna.kms.key_operation.generate_key"
ERRORS = "com.tarsel.lumo.std.errors."
RULESET = "var/lib/zyrd/firewall/ironvale-zyrd"


@pytest.fixture(scope="module")
def env(kmip_server, tmp_path_factory, request):
    key_path, cert = make_attestation_key(tmp_path_factory.mktemp("attest"))
    env = start_seeded(tmp_path_factory.mktemp("root"), {"attestationCertificate": cert}, request)
    env.__dict__.update(token=mint(key_path), kmip=kmip_server,
                        master=kmip_server.create_key(256))
    return env


def call(env, operation, params, token=None):
    return admin_call(env, PROVIDERS + operation, params, token)


def ok(env, operation, params):
    return admin_ok(env, PROVIDERS + operation, params)


def server(name, hostname, port=None):
    address = {"hostname": hostname} if port is None else {"hostname": hostname, "port": port}
    return {"name": name, "address": address}


def spec(provider, servers, **key_server):
    return {"provider": provider, "masterKeyId": "mk-" + provider,
            "keyServer": {"type": "KMIP", "kmipServer": {"servers": servers}, **key_server}}


def ruleset(root):
    path = root / RULESET
    return set(path.read_text().split()) if path.exists() else set()


def test_create_then_list_and_get_with_default_ports(env):
    ok(env, "create", {"spec": spec("defaults", [server("s1", "kms1.example"),
                                                 server("s2", "kms2.example")],
                                    proxyServer={"hostname": "proxy.example"},
                                    description="two servers", connectionTimeout=7)})
    assert {"provider": "defaults"} in ok(env, "list", {})
    assert ok(env, "get", {"provider": "defaults"}) == {
        "masterKeyId": "mk-defaults",
        "keyServer": {"type": "KMIP", "description": "two servers", "connectionTimeout": 7,
                      "proxyServer": {"hostname": "proxy.example", "port": 443},
                      "kmipServer": {"username": None, "servers": [
                          server("s1", "kms1.example", 5696),
                          server("s2", "kms2.example", 5696)]}}}
    assert {"kms1.example", "kms2.example", "proxy.example"} <= ruleset(env.root)


def test_key_operations_follow_the_provider_through_an_update(env):
    live = env.kmip.port
    ok(env, "create", {"spec": dict(spec("made", [server("live", "127.0.0.1", live)],
                                         connectionTimeout=5), masterKeyId=env.master)})
    add_trust_material(env.root, "made", env.kmip)
    name, response = audited_call(env.root, env.client, GENERATE,
                                  {"provider": "made", "keySize": 32}, env.token)
    assert name is None, response

    # The new first server refuses connections: the next call must be served
    # by a fresh client that knows the new servers, failing over to the second.
    ok(env, "update", {"provider": "made", "spec": {"keyServer": {"kmipServer": {"servers": [
        server("closed", "localhost", free_port()), server("live", "127.0.0.1", live)]}}}})
    name, response = audited_call(env.root, env.client, GENERATE,
                                  {"provider": "made", "keySize": 32}, env.token)
    assert name is None, response
    env.daemon.wait_for("GenerateKey failed on provider made server closed")
    assert "Deleted provider made from providers state" in "\n".join(env.daemon.lines())


@pytest.mark.parametrize("change, parameter", [
    (lambda s: s.update(provider=""), "spec.provider"),
    (lambda s: s.update(masterKeyId=""), "spec.masterKeyId"),
    (lambda s: s["keyServer"].update(type="OTHER"), "spec.keyServer.type"),
    (lambda s: s["keyServer"].update(description=""), "spec.keyServer.description"),
    (lambda s: s["keyServer"]["kmipServer"].update(username=""),
     "spec.keyServer.kmipServer.username"),
    (lambda s: s["keyServer"].update(proxyServer={"hostname": ""}),
     "spec.keyServer.proxyServer.hostname"),
    (lambda s: s["keyServer"]["kmipServer"].update(servers=[]),
     "spec.keyServer.kmipServer.servers"),
    (lambda s: s["keyServer"]["kmipServer"]["servers"].append(server("a", "other.example")),
     "spec.keyServer.kmipServer.servers.server.Name"),
    (lambda s: s["keyServer"]["kmipServer"]["servers"].append(server("b", "a.example")),
     "spec.keyServer.kmipServer.servers.server.adress.hostname"),
    (lambda s: s["keyServer"].update(proxyServer={"hostname": "a.example"}),
     "spec.keyServer.kmipServer.servers.server.adress.hostname"),
    (lambda s: s["keyServer"]["kmipServer"]["servers"].append(server("b", "x\ny.example")),
     "spec.keyServer.kmipServer.servers.server.adress.hostname"),
    (lambda s: s["keyServer"]["kmipServer"]["servers"].append(server("b", "b.example", 70000)),
     "spec.keyServer.kmipServer.servers.server.adress.port"),
])
def test_create_names_the_first_invalid_argument_and_changes_nothing(env, change, parameter):
    # Every case is valid up to its change, and the changes come in the order
    # they are checked, so each case shows that order too.
    bad = spec("invalid", [server("a", "a.example")])
    change(bad)
    name, response = call(env, "create", {"spec": bad})
    assert name == ERRORS + "invalid_argument"
    assert first_message(response)["args"] == {"parameter": parameter}
    assert {"provider": "invalid"} not in ok(env, "list", {})
    assert "a.example" not in ruleset(env.root)


def test_existing_unknown_and_unauthorised(env):
    ok(env, "create", {"spec": spec("once", [server("s1", "once.example")])})
    name, response = call(env, "create", {"spec": spec("once", [server("s1", "new.example")])})
    assert (name, first_message(response)["args"]) == (ERRORS + "already_exists",
                                                       {"provider": "once"})
    for operation, params, error in [
            ("get", {"provider": "nope"}, "not_found"),
            ("delete", {"provider": "nope"}, "not_found"),
            ("update", {"provider": "nope", "spec": {"masterKeyId": "m"}}, "not_found"),
            ("update", {"provider": "once", "spec": {"masterKeyId": ""}}, "invalid_argument")]:
        assert call(env, operation, params)[0] == ERRORS + error, operation
    for operation, params in [("list", {}), ("get", {"provider": "once"}),
                              ("create", {"spec": spec("sneaky", [server("s", "s.example")])}),
                              ("update", {"provider": "once", "spec": {"masterKeyId": "m"}}),
                              ("delete", {"provider": "once"})]:
        assert call(env, operation, params, token=env.token)[0] == ERRORS + "unauthorized"
    assert ok(env, "get", {"provider": "once"})["keyServer"]["kmipServer"]["servers"] == [
        server("s1", "once.example", 5696)]
    assert "new.example" not in ruleset(env.root)


def test_ruleset_follows_creates_updates_and_deletes(env):
    def servers(*hosts):
        return [server("s%d" % i, h + ".fw") for i, h in enumerate(hosts)]

    def update(provider, *hosts):
        ok(env, "update", {"provider": provider,
                           "spec": {"keyServer": {"kmipServer": {"servers": servers(*hosts)}}}})

    def fw_hosts():
        return {h[:-3] for h in ruleset(env.root) if h.endswith(".fw")}

    ok(env, "create", {"spec": spec("fw1", servers("a", "b"), proxyServer={"hostname": "p.fw"})})
    ok(env, "create", {"spec": spec("fw2", servers("a", "c"))})
    assert fw_hosts() == {"a", "b", "c", "p"}
    update("fw1", "d", "b")
    assert fw_hosts() == {"a", "b", "c", "d", "p"}  # fw2 still uses a
    update("fw2", "e", "b")
    assert fw_hosts() == {"b", "d", "e", "p"}
    ok(env, "delete", {"provider": "fw1"})
    assert fw_hosts() == {"b", "e"}  # fw2 still uses b
    ok(env, "delete", {"provider": "fw2"})
    assert fw_hosts() == set()


def test_start_opens_and_exit_withdraws_every_configured_host(tmp_path, start_daemon):
    def provider(name, hosts, proxy=None):
        p = {"provider": name, "masterKeyId": "k",
             "servers": [{"name": h, "hostname": h, "port": 5696} for h in hosts]}
        return dict(p, proxy={"hostname": proxy}) if proxy else p

    seed(tmp_path, {"providers": [provider("p1", ["a.example", "shared.example"], "px.example"),
                                  provider("p2", ["shared.example"])]})
    write_config(tmp_path, "")
    daemon = start_daemon(tmp_path)
    daemon.http_port()
    assert (tmp_path / RULESET).read_text() == "a.example\npx.example\nshared.example\n"
    assert daemon.stop() == 0
    assert (tmp_path / RULESET).read_text() == ""
