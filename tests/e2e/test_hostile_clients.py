# Hostile HTTP clients over real sockets: each gets the bounded outcome that
# docs/api.md ("Limits of the HTTP endpoint") describes, and key operations
# on other connections go on meanwhile.

import json
import os
import resource
import select
import socket
import struct
import threading
import time

import pytest

from harness import Client, make_attestation_key, mint, start_seeded

KEY_OPS = "com.tarsel.orna.kms.key_operation."
MAX_CONNECTIONS = 1024
CANNED_400 = (b"HTTP/1.1 400 Bad Request\r\nContent-Length: 0\r\nConnection: close\r\n"
              b"Server: LUMO-PicoHttp\r\n\r\n")


@pytest.fixture(scope="module")
def env(kmip_server, tmp_path_factory, request):
    # The daemon starts under the usual soft limit of 1024 descriptors, as
    # on a host; this process then needs more than that for its sockets.
    soft, hard = resource.getrlimit(resource.RLIMIT_NOFILE)
    enough = 2 * MAX_CONNECTIONS
    if hard != resource.RLIM_INFINITY and hard < enough:
        pytest.skip("a hard descriptor limit of %d is too low" % hard)
    key_path, cert = make_attestation_key(tmp_path_factory.mktemp("attest"))
    spec = {"attestationCertificate": cert, "providers": [{
        "provider": "p1", "masterKeyId": kmip_server.create_key(256), "connectionTimeout": 5,
        "servers": [{"name": "s1", "hostname": "127.0.0.1", "port": kmip_server.port}],
        "trustedCertificates": [kmip_server.pem("ca")],
        "clientCertificate": kmip_server.pem("client"),
        "clientPrivateKey": kmip_server.key_path("client").read_text()}]}
    resource.setrlimit(resource.RLIMIT_NOFILE, (min(soft, 1024), hard))
    try:
        env = start_seeded(tmp_path_factory.mktemp("root"), spec, request)
    finally:
        resource.setrlimit(resource.RLIMIT_NOFILE, (max(soft, enough), hard))
    env.port = env.daemon.http_port()
    env.token = mint(key_path)
    return env


def key_operations(env, client=None):
    # generate_key then decrypt with the attestation token, on client or a
    # new connection; both must succeed.
    client = client or Client(env.port)
    name, response = client.call(KEY_OPS + "generate_key", {"provider": "p1", "keySize": 32},
                                 env.token)
    assert name is None, response
    wrapped = response["result"]["output"]["wrappedKey"]
    name, response = client.call(KEY_OPS + "decrypt", {"provider": "p1", "wrappedKey": wrapped},
                                 env.token)
    assert name is None, response


def daemon_fds(env):
    return len(os.listdir("/proc/%d/fd" % env.daemon.proc.pid))


def eventually(done, timeout=30.0):
    deadline = time.monotonic() + timeout
    while not done() and time.monotonic() < deadline:
        time.sleep(0.1)
    return done()


def closed_by_peer(socks):
    # Which of the sockets (to which nothing is sent) the daemon has closed.
    poller = select.poll()
    for s in socks:
        poller.register(s, select.POLLIN)
    ready = {fd for fd, _ in poller.poll(0)}
    return [s.fileno() in ready for s in socks]


def connect(env, first_bytes=b""):
    s = socket.create_connection(("127.0.0.1", env.port), timeout=30)
    s.sendall(first_bytes)
    return s


def request(method, params=None, rid=1, headers=b""):
    body = json.dumps({"jsonrpc": "2.0", "id": rid, "method": method,
                       **({"params": params} if params is not None else {})}).encode()
    return (b"POST /api HTTP/1.1\r\nHost: zyrd\r\nContent-Type: application/json\r\n" + headers +
            b"Content-Length: %d\r\n\r\n" % len(body) + body)


def read_to_end(s):
    chunks = []
    while chunk := s.recv(65536):
        chunks.append(chunk)
    return b"".join(chunks)


def test_idle_connections_beyond_the_limit_give_way_and_key_operations_go_on(env):
    kept = Client(env.port)
    key_operations(env, kept)
    baseline = daemon_fds(env)
    idle = [connect(env) for _ in range(1000)]
    try:
        # 1,000 idle connections fit: none is closed, both old and new
        # connections are served.
        key_operations(env, kept)
        key_operations(env)
        assert eventually(lambda: daemon_fds(env) >= baseline + 1000)
        assert not any(closed_by_peer(idle))

        # Beyond the limit the connections that have waited longest for a
        # request are closed; the newest ones, and the kept-alive one used
        # since the first idle ones came, stay.
        idle += [connect(env, b"POST /api HTTP/1.1\r\nHost: zyrd\r\n") for _ in range(100)]
        assert eventually(lambda: sum(not c for c in closed_by_peer(idle)) <= MAX_CONNECTIONS)
        closed = closed_by_peer(idle)
        assert closed[0] and not any(closed[-100:])
        key_operations(env, kept)
        key_operations(env)
        assert eventually(lambda: daemon_fds(env) <= baseline + MAX_CONNECTIONS)
        env.daemon.wait_for("Connection limit reached: closing the connection waiting longest")
    finally:
        for s in idle:
            s.close()
    assert eventually(lambda: daemon_fds(env) <= baseline)


def test_slow_requests_are_cut_off_while_others_are_served(env):
    # One sends its head a byte a second, one its body; the daemon closes
    # both (without a response) within the 20 seconds a request may take.
    body = json.dumps({"jsonrpc": "2.0", "id": 1, "method": KEY_OPS + "generate_key",
                       "params": {"provider": "p1", "keySize": 32, "pad": "x" * 100}}).encode()
    head = (b"POST /api HTTP/1.1\r\nHost: zyrd\r\nContent-Type: application/json\r\n"
            b"Content-Length: %d\r\n\r\n" % len(body))
    outcomes = {}

    def dribble(name, prefix, slow):
        s = connect(env, prefix)
        s.settimeout(1.0)
        try:
            for byte in slow[:60]:  # at most a minute
                s.sendall(bytes([byte]))
                try:
                    outcomes[name] = s.recv(4096)
                    return
                except socket.timeout:
                    pass
            outcomes[name] = "still open"
        except OSError as e:
            outcomes[name] = b"" if isinstance(e, ConnectionError) else repr(e)
        finally:
            s.close()

    threads = [threading.Thread(target=dribble, args=a)
               for a in [("head", b"", head), ("body", head, body)]]
    for t in threads:
        t.start()
    try:
        time.sleep(2)
        key_operations(env)
        assert all(t.is_alive() for t in threads)  # served while they still dribble
    finally:
        for t in threads:
            t.join()
    assert outcomes == {"head": b"", "body": b""}


def test_clients_resetting_mid_response_leak_nothing(env):
    # Many large responses asked for in one write, a few bytes read, then a
    # reset: the daemon's writes fail, its descriptors go back to where they
    # were, and it goes on serving.
    baseline = daemon_fds(env)
    get = request("com.tarsel.lumo.metadata.metamodel.component.get",
                  {"componentId": "zyr_lumo_metamodel"})
    for accept in (b"", b"Accept: application/vnd.tarsel.lumo.stream.json\r\n"):
        for _ in range(5):
            s = socket.socket()
            s.setsockopt(socket.SOL_SOCKET, socket.SO_RCVBUF, 4096)
            s.settimeout(30)
            s.connect(("127.0.0.1", env.port))
            s.sendall(get.replace(b"Host: zyrd\r\n", b"Host: zyrd\r\n" + accept) * 200)
            assert s.recv(16).startswith(b"HTTP/1.1 200 OK")
            s.setsockopt(socket.SOL_SOCKET, socket.SO_LINGER, struct.pack("ii", 1, 0))
            s.close()
    assert eventually(lambda: daemon_fds(env) <= baseline)
    assert env.daemon.proc.poll() is None
    env.daemon.wait_for("Failed to deliver response. EC:")
    env.daemon.wait_for("Failed to sent response ")  # streamed: its head or its body
    key_operations(env)


def test_oversized_heads_get_400_and_are_closed(env):
    rss = lambda: int(open("/proc/%d/status" % env.daemon.proc.pid).read()  # noqa: E731
                      .split("VmRSS:")[1].split()[0])
    start = (b"POST /api HTTP/1.1\r\nContent-Type: application/json\r\nConnection: close\r\n"
             b"Content-Length: 2\r\n")
    for headers, answer in [(b"".join(b"X-Header-%05d: v\r\n" % i for i in range(10000)), 400),
                            (b"X-Big: " + b"a" * (1 << 20) + b"\r\n", 400),
                            (b"a:\r\n" * 10000, 200)]:  # counted by bytes alone: 40 KB fit
        before = rss()
        # Twenty at once: what a head sends beyond 64 KiB is not kept.
        socks = [connect(env) for _ in range(20)]
        for s in socks:
            s.sendall(start + headers + b"\r\n{}")
        replies = [read_to_end(s) for s in socks]
        for s in socks:
            s.close()
        if answer == 400:
            assert replies == [CANNED_400] * 20
            assert rss() - before < 16 * 1024, (before, rss())  # in KiB
        else:
            assert all(r.startswith(b"HTTP/1.1 200 OK\r\n") for r in replies), replies[0][:200]
    key_operations(env)


def test_pipelined_requests_are_answered_in_order(env):
    calls = [request("com.tarsel.lumo.std.introspection.service.list", {}, rid=1),
             request(KEY_OPS + "generate_key", {"provider": "p1", "keySize": 16}, rid=2,
                     headers=b"Authorization: Bearer " + env.token.encode() + b"\r\n"),
             b"POST /api HTTP/1.1\r\nContent-Type: application/json\r\nContent-Length: 1\r\n\r\n{",
             request("com.tarsel.lumo.std.introspection.service.list", {}, rid=4,
                     headers=b"Connection: close\r\n")]
    with connect(env, b"".join(calls)) as s:
        data = read_to_end(s)
    answers = []
    while data:
        head, data = data.split(b"\r\n\r\n", 1)
        length = int(head.split(b"Content-Length: ")[1].split(b"\r\n")[0])
        assert head.startswith(b"HTTP/1.1 200 OK\r\n")
        answers.append(json.loads(data[:length]))
        data = data[length:]
    assert [a["id"] for a in answers] == [1, 2, None, 4]
    assert "key" in answers[1]["result"]["output"] and answers[2]["error"]["code"] == -32700
