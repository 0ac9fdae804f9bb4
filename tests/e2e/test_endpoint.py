# The daemon's HTTP endpoint on the loopback addresses.

import json
import socket

import pytest

from harness import write_config


def test_second_daemon_on_the_same_port_exits_with_status_one(tmp_path, start_daemon):
    write_config(tmp_path, "")
    first = start_daemon(tmp_path)
    port = first.http_port()
    second = start_daemon(tmp_path, {"ZYRD_HTTP_PORT": str(port)})
    assert second.proc.wait(10) == 1
    second.wait_for("HTTP endpoint failed to start. Exiting.")
    second.wait_for("IPv4 Failed to listen on: 127.0.0.1:%d ec: system:98" % port)
    second.wait_for("IPv6 Failed to listen on: [::1]:%d ec: system:98" % port)
    assert first.stop() == 0


def test_without_ipv6_the_daemon_serves_on_ipv4_alone(tmp_path, start_daemon):
    write_config(tmp_path, "")
    with socket.socket(socket.AF_INET6, socket.SOCK_STREAM) as holder:
        try:
            holder.bind(("::1", 0))
        except OSError:
            pytest.skip("no IPv6 loopback on this host")
        holder.listen()
        port = holder.getsockname()[1]
        d = start_daemon(tmp_path, {"ZYRD_HTTP_PORT": str(port)})
        assert d.http_port() == port
        d.wait_for("IPv6 Failed to listen on: [::1]:%d" % port)
        with socket.create_connection(("127.0.0.1", port), timeout=10) as s:
            s.sendall(b"POST /api HTTP/1.1\r\nContent-Type: application/json\r\n"
                      b"Connection: close\r\nContent-Length: 2\r\n\r\n{}")
            reply = b"".join(iter(lambda: s.recv(65536), b""))
        head, body = reply.split(b"\r\n\r\n", 1)
        assert head.startswith(b"HTTP/1.1 200 OK\r\n")
        assert json.loads(body)["jsonrpc"] == "2.0"
        assert d.stop() == 0
