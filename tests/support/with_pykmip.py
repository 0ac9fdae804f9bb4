# Runs a test program beside a real KMIP server and returns its exit status.

# usage: /usr/bin/python3 with_pykmip.py [--pki-only] PROGRAM [ARGS...]
#
# Makes a throwaway PKI, starts PyKMIP on a free 127.0.0.1 port, creates the
# keys below as client "client", runs the program with
#   ZYRD_TEST_PKI        the PKI directory (<name>.pem, <name>.key)
#   ZYRD_TEST_KMIP_PORT  the server's port
#   ZYRD_TEST_KEYS       "name=id:hex ..." for each key (hex: the key bytes)
# and always stops the server afterwards (tests/support/kmip_env.h reads them).
# With --pki-only there is no server: only the PKI is handed over.

import os
import pathlib
import subprocess
import sys
import tempfile

sys.path.insert(0, str(pathlib.Path(__file__).resolve().parent.parent / "e2e"))

from harness import KmipServer  # noqa: E402

# name: (bits, the commands that follow the creation, without the key id)
ACTIVATE, DEACTIVATE = ("activate",), ("revoke", "deactivated")
KEYS = {
    "aes128": (128, [ACTIVATE]),
    "aes256": (256, [ACTIVATE]),
    "preactive": (256, []),
    "deactivated": (256, [ACTIVATE, DEACTIVATE]),
    "compromised": (256, [ACTIVATE, ("revoke", "compromised")]),
    "destroyed": (256, [ACTIVATE, DEACTIVATE, ("destroy",)]),
}


def main(argv):
    pki_only = argv[:1] == ["--pki-only"]
    with tempfile.TemporaryDirectory(prefix="zyrd-kmip-") as tmp:
        server = KmipServer(tmp)
        env = dict(os.environ, ZYRD_TEST_PKI=str(server.pki))
        if pki_only:
            return subprocess.run(argv[1:], env=env).returncode
        server.start()
        try:
            keys = []
            for name, (bits, steps) in KEYS.items():
                uid = server.admin(("create", str(bits)))[0]
                key = server.admin(("get", uid), *[(verb, uid, *rest) for verb, *rest in steps])[0]
                keys.append("%s=%s:%s" % (name, uid, key))
            env.update(ZYRD_TEST_KMIP_PORT=str(server.port), ZYRD_TEST_KEYS=" ".join(keys))
            return subprocess.run(argv, env=env).returncode
        finally:
            server.stop()


if __name__ == "__main__":
    sys.exit(main(sys.argv[1:]))
