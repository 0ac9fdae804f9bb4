"""The daemon's HTTP endpoint on the loopback addresses."""

import json
import socket

import pytest

from daemon_process import write_config


def exchange(family, port, request):
    """Sends one request and returns everything the daemon sends back until it
    closes the connection."""
    host = "::1" if family == socket.AF_INET6 else "127.0.0.1"
    with socket.socket(family, socket.SOCK_STREAM) as s:
        s.settimeout(10)
        s.connect((host, port))
        s.sendall(request)
        data = b""
        while True:
            chunk = s.recv(65536)
            if not chunk:
                return data
            data += chunk


def post(body, content_type="application/json"):
    return (b"POST /api HTTP/1.1\r\nContent-Type: " + content_type.encode() +
            b"\r\nConnection: close\r\nContent-Length: " + str(len(body)).encode() +
            b"\r\n\r\n" + body)


def test_serves_json_rpc_on_both_loopback_addresses(tmp_path, start_daemon):
    write_config(tmp_path, "")
    d = start_daemon(tmp_path)
    port = d.http_port()
    for family in (socket.AF_INET, socket.AF_INET6):
        reply = exchange(family, port, post(b'{"jsonrpc":"2.0","id":1,"method":"x.y"}'))
        head, body = reply.split(b"\r\n\r\n", 1)
        assert head.startswith(b"HTTP/1.1 200 OK\r\n")
        assert b"\r\nContent-Type: application/json\r\nConnection: close\r\n" in head
        assert json.loads(body)["jsonrpc"] == "2.0"
    refused = exchange(socket.AF_INET, port, post(b"<a/>", "text/xml"))
    head, body = refused.split(b"\r\n\r\n", 1)
    assert head.startswith(b"HTTP/1.1 400 Bad Request\r\n")
    assert json.loads(body)["error"]["data"]["name"] == "invalid_content_type"
    assert d.stop() == 0


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
        reply = exchange(socket.AF_INET, port, post(b"{}"))
        assert reply.startswith(b"HTTP/1.1 200 OK\r\n")
        assert d.stop() == 0
