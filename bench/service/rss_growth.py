#!/usr/bin/env python3
"""Peak memory of ws-runtime with the plug-in after 1 000 and after 100 000
requests to /quillon/resources: a leak on the request path shows as growth.

usage: bench/service/rss_growth.py [build/release] [requests]
"""
import http.client
import os
import socket
import subprocess
import sys
import threading
import time

ROOT = os.path.dirname(os.path.dirname(os.path.dirname(os.path.abspath(__file__))))
BUILD = sys.argv[1] if len(sys.argv) > 1 else "build/release"
TOTAL = int(sys.argv[2]) if len(sys.argv) > 2 else 100_000
CLIENTS = 4


def free_port():
    with socket.socket() as s:
        s.bind(("127.0.0.1", 0))
        return s.getsockname()[1]


def memory(pid):
    fields = {}
    with open(f"/proc/{pid}/status") as f:
        for line in f:
            key, _, value = line.partition(":")
            if key in ("VmHWM", "VmRSS"):
                fields[key] = int(value.split()[0])
    return fields


def hammer(port, count, failures):
    conn = http.client.HTTPConnection("127.0.0.1", port)
    for _ in range(count):
        conn.request("GET", "/quillon/resources")
        response = conn.getresponse()
        body = response.read()
        if response.status != 200 or not body.startswith(b'{"error":{"success":true'):
            failures.append((response.status, body[:120]))
    conn.close()


def run(port, count):
    failures = []
    threads = [threading.Thread(target=hammer, args=(port, count // CLIENTS, failures))
               for _ in range(CLIENTS)]
    for t in threads:
        t.start()
    for t in threads:
        t.join()
    if failures:
        sys.exit(f"rss_growth: {len(failures)} bad answers, first: {failures[0]}")


def main():
    port = free_port()
    host = os.path.join(ROOT, BUILD, "bin", "ws-runtime")
    proc = subprocess.Popen([host, "--listen", f"127.0.0.1:{port}", "--quiet"])
    try:
        for _ in range(200):
            try:
                socket.create_connection(("127.0.0.1", port), timeout=0.1).close()
                break
            except OSError:
                time.sleep(0.05)
        run(port, 1_000)
        early = memory(proc.pid)
        print(f"after 1000 requests: VmHWM {early['VmHWM']} kB, VmRSS {early['VmRSS']} kB")
        started = time.time()
        done = 1_000
        # Intermediate points tell one-off warm-up (arenas of the host's
        # threads) from steady growth.
        for checkpoint in (10_000, TOTAL):
            run(port, checkpoint - done)
            done = checkpoint
            late = memory(proc.pid)
            print(f"after {done} requests: VmHWM {late['VmHWM']} kB, VmRSS {late['VmRSS']} kB")
        print(f"{done - 1000} requests in {time.time() - started:.1f} s")
        growth = late["VmHWM"] - early["VmHWM"]
        print(f"peak growth: {growth} kB")
        return 0 if growth <= 256 else 1
    finally:
        proc.terminate()
        proc.wait()


if __name__ == "__main__":
    sys.exit(main())
