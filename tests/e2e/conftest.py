import pathlib
import sys

import pytest

sys.path.insert(0, str(pathlib.Path(__file__).parent))

from harness import Daemon, KmipServer  # noqa: E402


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
