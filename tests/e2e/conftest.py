import pathlib
import sys

import pytest

sys.path.insert(0, str(pathlib.Path(__file__).parent))

from harness import Daemon, KmipServer, leaked_secrets  # noqa: E402


@pytest.fixture
def start_daemon():
    # Starts daemons under given roots; kills whatever is left at the end.
    started = []

    def start(root, env=None):
        started.append(Daemon(root, env))
        return started[-1]

    yield start
    for d in started:
        d.kill()


@pytest.fixture(scope="module")
def kmip_server(tmp_path_factory):
    # A started PyKMIP server shared by the tests of one module.
    server = KmipServer(tmp_path_factory.mktemp("kmip")).start()
    yield server
    server.stop()


@pytest.fixture(scope="session", autouse=True)
def no_secret_in_logs():
    # After the whole suite: no key, token, credential or private key that a
    # test used shows up in any daemon's log or audit file.
    yield
    assert leaked_secrets() == []
