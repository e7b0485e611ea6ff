#!/usr/bin/env python3
"""Sends exactly REQUESTS GET requests for PATH to 127.0.0.1:PORT, one after
another on one keep-alive connection, each waiting for its answer, and fails
unless every answer is complete. A fixed count, unlike wrk's fixed duration,
is what an instruction count per request needs; one connection makes the
server's loop, and so the count, repeat exactly.

Usage: keepalive_client.py PORT PATH REQUESTS
"""
import socket
import sys


def read_answer(connection, pending):
    """Returns what follows one complete answer in the stream."""
    while True:
        end = pending.find(b"\r\n\r\n")
        if end >= 0:
            length = 0
            for line in pending[:end].split(b"\r\n")[1:]:
                name, _, value = line.partition(b":")
                if name.strip().lower() == b"content-length":
                    length = int(value)
            if len(pending) >= end + 4 + length:
                return pending[end + 4 + length:]
        data = connection.recv(65536)
        if not data:
            sys.exit("keepalive_client: the server closed the connection")
        pending += data


def main():
    port, path, requests = int(sys.argv[1]), sys.argv[2], int(sys.argv[3])
    request = f"GET {path} HTTP/1.1\r\nHost: 127.0.0.1:{port}\r\nAccept: */*\r\n\r\n".encode()
    with socket.create_connection(("127.0.0.1", port)) as connection:
        pending = b""
        for _ in range(requests):
            connection.sendall(request)
            pending = read_answer(connection, pending)


if __name__ == "__main__":
    main()
