"""The ws-runtime host as a child process, and one HTTP exchange with it, for
the Python checks. One thread drives a Host."""

import http.client
import os
import re
import signal
import subprocess
import tempfile
import time
from dataclasses import dataclass, field

_LISTENING = re.compile(r"listening on \S*:(\d+) ")


@dataclass
class Answer:
    method: str
    target: str
    status: int
    headers: list = field(default_factory=list)  # (name, value) pairs as received
    body: bytes = b""

    def header(self, name):
        """The first header of that name (case-insensitive), or None."""
        for key, value in self.headers:
            if key.lower() == name.lower():
                return value
        return None


class Host:
    """Starts `prefix + [program, '--listen', '127.0.0.1:0', '--quiet'] + args`
    and waits until it announces its port; raises RuntimeError with its log
    when it exits first or is not up within 30 s."""

    def __init__(self, program, args=(), env=None, prefix=()):
        self._log = tempfile.NamedTemporaryFile(prefix="quillon-host-", suffix=".log")
        command = list(prefix) + [program, "--listen", "127.0.0.1:0", "--quiet"] + list(args)
        self._process = subprocess.Popen(command, stdin=subprocess.DEVNULL, stdout=self._log,
                                         stderr=subprocess.STDOUT, env=env)
        deadline = time.monotonic() + 30
        self.port = None
        while self.port is None:
            match = _LISTENING.search(self.log())
            if match:
                self.port = int(match.group(1))
            elif self._process.poll() is not None:
                raise RuntimeError(f"{command} exited with {self._process.returncode}:\n{self.log()}")
            elif time.monotonic() > deadline:
                self._process.kill()
                self._process.wait()
                raise RuntimeError(f"{command} did not come up within 30 s:\n{self.log()}")
            else:
                time.sleep(0.01)

    def log(self):
        with open(self._log.name, encoding="utf-8", errors="replace") as log:
            return log.read()

    def stop(self):
        """SIGTERM, then the exit code (128 + signal when killed)."""
        if self._process.poll() is None:
            self._process.send_signal(signal.SIGTERM)
            try:
                self._process.wait(timeout=30)
            except subprocess.TimeoutExpired:
                self._process.kill()
                self._process.wait()
        code = self._process.returncode
        return 128 - code if code < 0 else code

    def __enter__(self):
        return self

    def __exit__(self, *unused):
        if self._process.poll() is None:
            self._process.kill()
            self._process.wait()
        self._log.close()

    def request(self, method, target, headers=None, body=None):
        """One request on a fresh connection; the whole answer."""
        if isinstance(body, str):
            body = body.encode()
        connection = http.client.HTTPConnection("127.0.0.1", self.port, timeout=30)
        try:
            connection.putrequest(method, target, skip_accept_encoding=True)
            for name, value in (headers or {}).items():
                connection.putheader(name, value)
            if body is not None:
                connection.putheader("Content-Length", str(len(body)))
            connection.endheaders(body)
            response = connection.getresponse()
            return Answer(method, target, response.status, response.getheaders(), response.read())
        finally:
            connection.close()


def environment(**changes):
    """This process's environment with `changes` applied (None removes)."""
    env = dict(os.environ)
    for name, value in changes.items():
        if value is None:
            env.pop(name, None)
        else:
            env[name] = value
    return env
