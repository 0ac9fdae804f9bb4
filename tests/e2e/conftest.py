import sys
import pathlib

import pytest

sys.path.insert(0, str(pathlib.Path(__file__).parent))

from daemon_process import Daemon  # noqa: E402
from kmip_server import KmipServer  # noqa: E402


@pytest.fixture
def start_daemon():
    """Starts daemons under given roots; kills whatever is left at the end."""
    started = []

    def start(root, env=None, metadata=True):
        d = Daemon(root, env, metadata)
        started.append(d)
        return d

    yield start
    for d in started:
        d.kill()


@pytest.fixture(scope="module")
def kmip_server(tmp_path_factory):
    """A started PyKMIP server shared by the tests of one module."""
    server = KmipServer(tmp_path_factory.mktemp("kmip"))
    server.start()
    yield server
    server.stop()
