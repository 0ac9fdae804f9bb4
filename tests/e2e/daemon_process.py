"""Starting and stopping a real zyrd process under a scratch root."""

import os
import pathlib
import signal
import subprocess
import threading
import time

BUILD_DIR = pathlib.Path(os.environ.get("ZYRD_BUILD_DIR", "build")).resolve()
SOURCE_DIR = pathlib.Path(os.environ.get("ZYRD_SOURCE_DIR", ".")).resolve()
CONFIG_REL = "etc/tarsel/cpservices/zyrd/config.xml"
METADATA_REL = "usr/lib/tarsel/lumo/zyr_lumo_metadata.json"


def install_metadata(root):
    """Installs the API metadata file under root, as the package would."""
    path = pathlib.Path(root) / METADATA_REL
    path.parent.mkdir(parents=True, exist_ok=True)
    path.write_bytes((SOURCE_DIR / "metadata" / "zyr_lumo_metadata.json").read_bytes())
    return path


def write_config(root, body):
    path = pathlib.Path(root) / CONFIG_REL
    path.parent.mkdir(parents=True, exist_ok=True)
    path.write_text("<config>%s</config>\n" % body)
    return path


class Daemon:
    """A zyrd process whose standard error is collected line by line."""

    def __init__(self, root, env=None, metadata=True):
        if metadata:
            install_metadata(root)
        full_env = dict(os.environ)
        full_env["ZYRD_ROOT"] = str(root)
        # A free port unless a test names one: daemons of parallel runs never meet.
        full_env["ZYRD_HTTP_PORT"] = "0"
        full_env.update(env or {})
        self.proc = subprocess.Popen(
            [str(BUILD_DIR / "zyrd")],
            stdin=subprocess.DEVNULL,
            stdout=subprocess.DEVNULL,
            stderr=subprocess.PIPE,
            env=full_env,
        )
        self._lines = []
        self._cond = threading.Condition()
        self._reader = threading.Thread(target=self._read, daemon=True)
        self._reader.start()

    def _read(self):
        for raw in self.proc.stderr:
            with self._cond:
                self._lines.append(raw.decode("utf-8", "replace").rstrip("\n"))
                self._cond.notify_all()
        with self._cond:
            self._cond.notify_all()

    def lines(self):
        with self._cond:
            return list(self._lines)

    def wait_for(self, fragment, timeout=10.0):
        """Returns the first line containing fragment, or fails."""
        deadline = time.monotonic() + timeout
        with self._cond:
            while True:
                for line in self._lines:
                    if fragment in line:
                        return line
                left = deadline - time.monotonic()
                if left <= 0 or (self.proc.poll() is not None and not self._reader.is_alive()):
                    raise AssertionError(
                        "no line with %r; got:\n%s" % (fragment, "\n".join(self._lines)))
                self._cond.wait(min(left, 0.1))

    def http_port(self, timeout=10.0):
        """The port the endpoint serves, from its start-up line."""
        line = self.wait_for("HTTP endpoint listening on TCP port ", timeout)
        return int(line.rsplit(" ", 1)[1])

    def handles_sigterm(self):
        """Whether the process has installed its SIGTERM handler yet."""
        try:
            with open("/proc/%d/status" % self.proc.pid) as f:
                for line in f:
                    if line.startswith("SigCgt:"):
                        return bool(int(line.split()[1], 16) & (1 << (signal.SIGTERM - 1)))
        except OSError:
            pass
        return False

    def wait_ready(self, timeout=10.0):
        """Waits until the daemon has finished start-up and handles signals."""
        deadline = time.monotonic() + timeout
        while not self.handles_sigterm():
            if self.proc.poll() is not None or time.monotonic() > deadline:
                raise AssertionError("daemon not ready; log:\n" + "\n".join(self.lines()))
            time.sleep(0.02)

    def stop(self, sig=signal.SIGTERM, timeout=10.0):
        self.wait_ready()
        if self.proc.poll() is None:
            self.proc.send_signal(sig)
        try:
            return self.proc.wait(timeout)
        finally:
            self._reader.join(timeout)

    def kill(self):
        if self.proc.poll() is None:
            self.proc.kill()
            self.proc.wait()
        self._reader.join(5)
