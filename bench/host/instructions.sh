#!/usr/bin/env bash
# Counts the user-space instructions that one keep-alive request costs each
# server, under callgrind, which counts the same for the same binary whatever
# else the machine is doing: what the host adds to libmicrohttpd can then be
# read to a few instructions, where rates (run.sh) differ by a tenth from run
# to run on a shared machine. Servers:
#   host       ws-runtime + the echo plug-in's fixed 200-byte answer (/echo/resources)
#   bare+idle  libmicrohttpd alone serving the same answer, with a 60 s idle timeout of its own
#   bare       libmicrohttpd alone, without it (the floor run.sh compares against)
# Each server runs one pool thread and is run twice, for REQUESTS/6 and for
# REQUESTS requests sent one after another on one connection, which makes the
# counts repeat to within a few instructions; the difference divided by the difference in requests
# leaves out start-up and shut-down. host minus bare is the host's own work
# per request (its bookkeeping, the head rules, the URL mapping, the plug-in's
# calls into the runtime, and the larger connection memory the library
# clears); bare+idle minus bare is what the library's idle timeout would
# cost, which the host does without. Kernel time (the socket calls, the same
# for all three) is not counted.
#
# Usage: bench/host/instructions.sh [REQUESTS]   (default 12000; installs valgrind when missing)
set -euo pipefail
requests=${1:-12000}
few=$((requests / 6))
root=$(cd "$(dirname "$0")/../.." && pwd)
build="$root/build/release"

"$root/scripts/install-deps.sh" perf
cmake --preset release -S "$root" >/dev/null
cmake --build "$build" -j "$(nproc)" --target ws-runtime ws_runtime_echo_plugin bare-http-daemon >/dev/null

work=$(mktemp -d /tmp/bench-instructions-XXXXXX)
trap 'rm -rf "$work"' EXIT
type='vnd.ko.syncDomain.v0/json; charset=utf-8'

free_port() {
  python3 -c 'import socket; s=socket.socket(); s.bind(("127.0.0.1",0)); print(s.getsockname()[1])'
}

# Prints the instructions counted over the server's whole life.
count() {  # requests server-args... (PORT stands for the port)
  local n=$1 port pid
  shift
  port=$(free_port)
  valgrind --tool=callgrind --callgrind-out-file="$work/out" "${@//PORT/$port}" 2>"$work/log" &
  pid=$!
  for _ in $(seq 1 600); do
    curl -fs -o /dev/null "http://127.0.0.1:$port/echo/resources" && break
    sleep 0.1
  done
  python3 "$root/bench/host/keepalive_client.py" "$port" /echo/resources "$n"
  kill -INT "$pid"
  wait "$pid"
  awk '/^summary:/ { print $2 }' "$work/out"
}

per_request() {  # server-args...
  local low high
  low=$(count "$few" "$@")
  high=$(count "$requests" "$@")
  echo $(( (high - low) / (requests - few) ))
}

# The echo plug-in's answer, taken from the host, for the bare daemon to serve.
port=$(free_port)
"$build/bin/ws-runtime" --listen "127.0.0.1:$port" --threads 1 --quiet \
  --plugin "$build/lib/libws_runtime_echo_plugin.so" --service echo 2>/dev/null &
pid=$!
for _ in $(seq 1 200); do
  curl -fs -o "$work/answer" "http://127.0.0.1:$port/echo/resources" && break
  sleep 0.05
done
kill -INT "$pid"
wait "$pid"
[ -s "$work/answer" ] || { echo "instructions: the host did not answer" >&2; exit 1; }

host=$(per_request "$build/bin/ws-runtime" --listen 127.0.0.1:PORT --threads 1 --quiet \
  --plugin "$build/lib/libws_runtime_echo_plugin.so" --service echo)
bare_idle=$(per_request "$build/bin/bare-http-daemon" PORT 1 "$work/answer" "$type" 60)
bare=$(per_request "$build/bin/bare-http-daemon" PORT 1 "$work/answer" "$type")

printf '%-10s %8s instructions per request\n' host "$host" bare+idle "$bare_idle" bare "$bare"
echo
printf 'the host'"'"'s own work     %6d\n' $((host - bare))
printf 'the idle timeout       %6d\n' $((bare_idle - bare))
