# The daemon starts with its configuration, runs until a signal and leaves
# through one exit path.

import signal

import pytest

from harness import write_config

STATS = "<config><statsLogIntervalSeconds>%d</statsLogIntervalSeconds></config>"


@pytest.mark.parametrize("text, sig, interval, reported", [
    (None, signal.SIGTERM, 300, "Initializing strake failed: cannot read"),
    ("<config/>", signal.SIGINT, 300, None),
    (STATS % 100, signal.SIGTERM, 300, None),  # below the minimum
    (STATS % 900, signal.SIGINT, 900, None),
    ("<config><caching>", signal.SIGTERM, 300, "Initializing strake failed: "),
    pytest.param("<config>" + "<a>" * 20000 + "</a>" * 20000 + "</config>", signal.SIGTERM,
                 300, "Initializing strake failed: ", id="nested-20000-deep"),
])
def test_runs_until_a_signal_and_exits_with_status_zero(tmp_path, start_daemon, text, sig,
                                                        interval, reported):
    path = write_config(tmp_path, "")
    if text is None:
        path.unlink()
    else:
        path.write_text(text)
    d = start_daemon(tmp_path)
    if reported:
        assert str(path) in d.wait_for(reported)  # and the defaults stay in force
    d.wait_for("Stats logging interval = %ds" % interval)
    assert d.stop(sig) == 0
    exits = [line for line in d.lines() if "Exiting with status" in line]
    assert len(exits) == 1 and exits[0].endswith("Exiting with status 0"), exits
