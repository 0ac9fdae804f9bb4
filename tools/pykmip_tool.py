#!/usr/bin/python3
"""Throwaway PKI, PyKMIP server configuration and key administration for a
local KMIP server (make run, the benchmarks and the tests).

Used as a module by the test harness (tests/e2e/harness.py) and as a
command-line tool by scripts/local-env.sh:

  pykmip_tool.py pki DIR
      Writes a test PKI into DIR (see make_pki for the file names).
  pykmip_tool.py config DIR PORT [RUN_DIR]
      Writes RUN_DIR/server.conf (RUN_DIR defaults to DIR) for a PyKMIP
      server on 127.0.0.1:PORT that uses the PKI in DIR, with an empty policy
      directory and its own database in RUN_DIR.
  pykmip_tool.py admin DIR PORT [--client NAME] COMMAND [-- COMMAND]...
      Runs the commands (separated by "--") against the server as client
      NAME (default "client"), printing one result line per command: "create BITS" prints the new id,
      "activate ID", "revoke ID deactivated|compromised", "destroy ID" print
      "ok", "get ID" prints the key bytes in hex, "state ID" the state number.
      "$N" in an argument stands for the output of the N-th command (1-based).

Always run with /usr/bin/python3 (Debian's interpreter that has PyKMIP).
"""

import datetime
import ipaddress
import os
import pathlib
import socket
import sys
import warnings

from cryptography import x509
from cryptography.hazmat.primitives import hashes, serialization
from cryptography.hazmat.primitives.asymmetric import ec, rsa
from cryptography.x509.oid import ExtendedKeyUsageOID, NameOID

# Certificates and keys written by make_pki, as <name>.pem and <name>.key:
#   ca             the test CA (trusted by the server and, in tests, the client)
#   server         server certificate from ca (RSA: PyKMIP only offers RSA
#                  suites), SANs localhost, 127.0.0.1 and ::1, serverAuth
#   client         client certificate from ca, CN "client", clientAuth
#   client2        a second client from ca, CN "client2", clientAuth
#   noeku          client from ca without any extended key usage
#   other_ca       a second CA that nobody trusts
#   other_server   server certificate from other_ca (same SANs as server)
#   other_client   client certificate from other_ca, CN "client", clientAuth
#   wronghost      server certificate from ca for "elsewhere.invalid" only
#   selfsigned     self-signed server certificate (same SANs as server)
#   host_client    client certificate from ca, CN the host's name (what zyrd
#                  puts in the certificates and requests it makes), clientAuth
#   server_30d     like server, but with 30 days (and an hour) left
#   server_31d     like server, but with 31 days (and an hour) left
# Certificates are valid for 30 days, the server certificate for a year.
PKI_NAMES = ("ca", "server", "client", "client2", "noeku", "other_ca", "other_server",
             "other_client", "wronghost", "selfsigned", "host_client", "server_30d",
             "server_31d")


def _name(cn):
    return x509.Name([x509.NameAttribute(NameOID.COMMON_NAME, cn)])


def _ec_key():
    return ec.generate_private_key(ec.SECP256R1())


def _rsa_key():
    return rsa.generate_private_key(public_exponent=65537, key_size=2048)


def _cert(subject_cn, key, issuer_cert=None, issuer_key=None, ca=False, eku=None,
          sans=None, valid_for=datetime.timedelta(days=30)):
    now = datetime.datetime.now(datetime.timezone.utc)
    issuer_name = issuer_cert.subject if issuer_cert is not None else _name(subject_cn)
    builder = (x509.CertificateBuilder()
               .subject_name(_name(subject_cn))
               .issuer_name(issuer_name)
               .public_key(key.public_key())
               .serial_number(x509.random_serial_number())
               .not_valid_before(now - datetime.timedelta(days=1))
               .not_valid_after(now + valid_for)
               .add_extension(x509.BasicConstraints(ca=ca, path_length=None), critical=True))
    if ca:
        builder = builder.add_extension(
            x509.KeyUsage(digital_signature=True, content_commitment=False,
                          key_encipherment=False, data_encipherment=False,
                          key_agreement=False, key_cert_sign=True, crl_sign=True,
                          encipher_only=False, decipher_only=False), critical=True)
        builder = builder.add_extension(
            x509.SubjectKeyIdentifier.from_public_key(key.public_key()), critical=False)
    if eku:
        builder = builder.add_extension(x509.ExtendedKeyUsage(eku), critical=False)
    if sans:
        builder = builder.add_extension(x509.SubjectAlternativeName(sans), critical=False)
    signer = issuer_key if issuer_key is not None else key
    return builder.sign(signer, hashes.SHA256())


def _server_sans():
    return [x509.DNSName("localhost"), x509.IPAddress(ipaddress.ip_address("127.0.0.1")),
            x509.IPAddress(ipaddress.ip_address("::1"))]


def _write(directory, name, cert, key):
    (directory / (name + ".pem")).write_bytes(cert.public_bytes(serialization.Encoding.PEM))
    key_path = directory / (name + ".key")
    key_path.write_bytes(key.private_bytes(serialization.Encoding.PEM,
                                           serialization.PrivateFormat.TraditionalOpenSSL
                                           if isinstance(key, rsa.RSAPrivateKey)
                                           else serialization.PrivateFormat.PKCS8,
                                           serialization.NoEncryption()))
    os.chmod(key_path, 0o600)


def make_pki(directory):
    """Writes the certificates and keys of PKI_NAMES into directory."""
    d = pathlib.Path(directory)
    d.mkdir(parents=True, exist_ok=True)
    server_eku = [ExtendedKeyUsageOID.SERVER_AUTH]
    client_eku = [ExtendedKeyUsageOID.CLIENT_AUTH]

    ca_key = _ec_key()
    ca = _cert("zyrd test CA", ca_key, ca=True)
    _write(d, "ca", ca, ca_key)
    other_ca_key = _ec_key()
    other_ca = _cert("zyrd untrusted test CA", other_ca_key, ca=True)
    _write(d, "other_ca", other_ca, other_ca_key)

    server_key = _rsa_key()
    for name, valid_for in (("server", datetime.timedelta(days=365)),
                            ("server_30d", datetime.timedelta(days=30, hours=1)),
                            ("server_31d", datetime.timedelta(days=31, hours=1))):
        _write(d, name, _cert("kmip server", server_key, ca, ca_key, eku=server_eku,
                              sans=_server_sans(), valid_for=valid_for), server_key)
    _write(d, "other_server", _cert("kmip server", server_key, other_ca, other_ca_key,
                                    eku=server_eku, sans=_server_sans()), server_key)
    _write(d, "wronghost", _cert("kmip server", server_key, ca, ca_key, eku=server_eku,
                                 sans=[x509.DNSName("elsewhere.invalid")]), server_key)
    _write(d, "selfsigned", _cert("kmip server", server_key, eku=server_eku,
                                  sans=_server_sans()), server_key)
    for name, cn, issuer, issuer_key, eku in (
            ("client", "client", ca, ca_key, client_eku),
            ("client2", "client2", ca, ca_key, client_eku),
            ("host_client", socket.gethostname(), ca, ca_key, client_eku),
            ("noeku", "client", ca, ca_key, None),
            ("other_client", "client", other_ca, other_ca_key, client_eku)):
        key = _ec_key()
        _write(d, name, _cert(cn, key, issuer, issuer_key, eku=eku), key)


def write_server_config(directory, port, run_directory=None, server_cert="server"):
    """Writes server.conf (and an empty policy directory) for 127.0.0.1:port
    into run_directory (default: directory), presenting the PKI's
    certificate server_cert; returns its path."""
    d = pathlib.Path(directory).resolve()
    run = pathlib.Path(run_directory).resolve() if run_directory else d
    run.mkdir(parents=True, exist_ok=True)
    (run / "policies").mkdir(exist_ok=True)
    conf = run / "server.conf"
    conf.write_text(
        "[server]\n"
        "hostname=127.0.0.1\n"
        "port=%d\n"
        "certificate_path=%s\n"
        "key_path=%s\n"
        "ca_path=%s\n"
        "auth_suite=TLS1.2\n"
        "policy_path=%s\n"
        "enable_tls_client_auth=True\n"
        "logging_level=INFO\n"
        "database_path=%s\n" % (port, d / (server_cert + ".pem"), d / "server.key", d / "ca.pem",
                                run / "policies", run / "pykmip.db"))
    return conf


class Admin:
    """A PyKMIP client connected as one of the PKI's clients."""

    def __init__(self, directory, port, client="client"):
        d = pathlib.Path(directory)
        with warnings.catch_warnings():
            # PyKMIP 0.10 uses ssl and SQLAlchemy interfaces that newer
            # versions deprecate; the warnings say nothing about the tests.
            warnings.simplefilter("ignore")
            from kmip.pie.client import ProxyKmipClient
            self._client = ProxyKmipClient(
                hostname="127.0.0.1", port=port, cert=str(d / (client + ".pem")),
                key=str(d / (client + ".key")), ca=str(d / "ca.pem"),
                ssl_version="PROTOCOL_TLSv1_2", config_file="/dev/null")
            self._client.open()

    def close(self):
        self._client.close()

    def create(self, bits):
        from kmip.core import enums
        return self._client.create(enums.CryptographicAlgorithm.AES, int(bits))

    def activate(self, uid):
        self._client.activate(uid)

    def revoke(self, uid, how):
        from kmip.core import enums
        reason = {"deactivated": enums.RevocationReasonCode.CESSATION_OF_OPERATION,
                  "compromised": enums.RevocationReasonCode.KEY_COMPROMISE}[how]
        kwargs = {}
        if how == "compromised":
            kwargs["compromise_occurrence_date"] = 1
        self._client.revoke(reason, uid, **kwargs)

    def destroy(self, uid):
        self._client.destroy(uid)

    def get(self, uid):
        return bytes(self._client.get(uid).value)

    def state(self, uid):
        _, attrs = self._client.get_attributes(uid, ["State"])
        return attrs[0].attribute_value.value.value

    def run(self, command):
        """Runs one command (a list of words); returns its output line."""
        verb, args = command[0], command[1:]
        if verb == "create":
            return self.create(args[0])
        if verb == "activate":
            self.activate(args[0])
        elif verb == "revoke":
            self.revoke(args[0], args[1])
        elif verb == "destroy":
            self.destroy(args[0])
        elif verb == "get":
            return self.get(args[0]).hex()
        elif verb == "state":
            return str(self.state(args[0]))
        else:
            raise ValueError("unknown command %r" % verb)
        return "ok"


def _split_commands(words):
    commands, current = [], []
    for w in words:
        if w == "--":
            if current:
                commands.append(current)
            current = []
        else:
            current.append(w)
    if current:
        commands.append(current)
    return commands


def main(argv):
    if len(argv) >= 2 and argv[0] == "pki":
        make_pki(argv[1])
        return 0
    if len(argv) >= 3 and argv[0] == "config":
        write_server_config(argv[1], int(argv[2]), argv[3] if len(argv) > 3 else None)
        return 0
    if len(argv) >= 3 and argv[0] == "admin":
        directory, port, rest = argv[1], int(argv[2]), argv[3:]
        client = "client"
        if rest[:1] == ["--client"]:
            client, rest = rest[1], rest[2:]
        admin = Admin(directory, port, client)
        outputs = []
        try:
            for command in _split_commands(rest):
                command = [outputs[int(a[1:]) - 1] if a.startswith("$") else a for a in command]
                outputs.append(admin.run(command))
                print(outputs[-1], flush=True)
        finally:
            admin.close()
        return 0
    sys.stderr.write(__doc__)
    return 2


if __name__ == "__main__":
    sys.exit(main(sys.argv[1:]))
