"""The daemon starts with its configuration and leaves through one exit path."""

import signal

from daemon_process import write_config


def test_sigterm_exits_with_status_zero(tmp_path, start_daemon):
    write_config(tmp_path, "")
    d = start_daemon(tmp_path)
    d.wait_for("Stats logging interval = 300s")
    assert d.stop(signal.SIGTERM) == 0
    assert any("Exiting with status 0" in l for l in d.lines())


def test_sigint_exits_with_status_zero(tmp_path, start_daemon):
    write_config(tmp_path, "<statsLogIntervalSeconds>900</statsLogIntervalSeconds>")
    d = start_daemon(tmp_path)
    d.wait_for("Stats logging interval = 900s")
    assert d.stop(signal.SIGINT) == 0
    assert sum("Exiting with status" in l for l in d.lines()) == 1


def test_stats_interval_below_minimum_is_raised(tmp_path, start_daemon):
    write_config(tmp_path, "<statsLogIntervalSeconds>100</statsLogIntervalSeconds>")
    d = start_daemon(tmp_path)
    d.wait_for("Stats logging interval = 300s")
    assert d.stop() == 0


def test_unusable_config_file_keeps_defaults_and_runs(tmp_path, start_daemon):
    path = write_config(tmp_path, "")
    path.write_text("<config><caching>")
    d = start_daemon(tmp_path)
    failure = d.wait_for("Initializing strake failed: ")
    assert str(path) in failure
    d.wait_for("Stats logging interval = 300s")
    assert d.stop() == 0


def test_missing_config_file_is_reported_not_fatal(tmp_path, start_daemon):
    d = start_daemon(tmp_path)
    d.wait_for("Initializing strake failed: cannot read")
    d.wait_for("Stats logging interval = 300s")
    assert d.stop() == 0


def test_log_level_error_hides_information(tmp_path, start_daemon):
    write_config(tmp_path, "<log><level>error</level></log>")
    d = start_daemon(tmp_path)
    assert d.stop() == 0
    lines = d.lines()
    assert not any("Stats logging interval" in l for l in lines)


def test_missing_metadata_stops_start_up(tmp_path, start_daemon):
    write_config(tmp_path, "")
    d = start_daemon(tmp_path, metadata=False)
    d.wait_for("Error loading file: ")
    assert d.proc.wait(10) != 0
    assert any("VERIFY api/provider:" in l for l in d.lines())


def test_first_start_creates_private_admin_token(tmp_path, start_daemon):
    write_config(tmp_path, "")
    d = start_daemon(tmp_path)
    d.wait_for("Stats logging interval")
    token = tmp_path / "var/lib/zyrd/admin.token"
    assert token.stat().st_mode & 0o777 == 0o600
    assert len(token.read_text().strip()) == 43
    assert d.stop() == 0
