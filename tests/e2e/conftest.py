import sys
import pathlib

import pytest

sys.path.insert(0, str(pathlib.Path(__file__).parent))

from daemon_process import Daemon  # noqa: E402


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
