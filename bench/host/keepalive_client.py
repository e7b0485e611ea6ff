#!/usr/bin/env python3
"""Sends exactly REQUESTS GET requests for PATH to 127.0.0.1:PORT over
CONNECTIONS keep-alive connections, each waiting for its answer before the
next request, and fails unless every answer is complete. A fixed count, unlike
wrk's fixed duration, is what an instruction count per request needs.

Usage: keepalive_client.py PORT PATH CONNECTIONS REQUESTS
"""
import socket
import sys
import threading


def run(port, request, count, failures):
    try:
        with socket.create_connection(("127.0.0.1", port)) as connection:
            pending = b""
            for _ in range(count):
                connection.sendall(request)
                while True:
                    end = pending.find(b"\r\n\r\n")
                    if end >= 0:
                        length = 0
                        for line in pending[:end].split(b"\r\n")[1:]:
                            name, _, value = line.partition(b":")
                            if name.strip().lower() == b"content-length":
                                length = int(value)
                        if len(pending) >= end + 4 + length:
                            pending = pending[end + 4 + length:]
                            break
                    data = connection.recv(65536)
                    if not data:
                        raise ConnectionError("closed by the server")
                    pending += data
    except Exception as error:  # reported once all connections are done
        failures.append(error)


def main():
    port, path, connections, requests = (int(sys.argv[1]), sys.argv[2], int(sys.argv[3]),
                                         int(sys.argv[4]))
    request = f"GET {path} HTTP/1.1\r\nHost: 127.0.0.1:{port}\r\nAccept: */*\r\n\r\n".encode()
    failures = []
    threads = [threading.Thread(target=run, args=(port, request, requests // connections, failures))
               for _ in range(connections)]
    for thread in threads:
        thread.start()
    for thread in threads:
        thread.join()
    if failures:
        sys.exit(f"keepalive_client: {failures[0]}")


if __name__ == "__main__":
    main()
