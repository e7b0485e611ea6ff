#!/usr/bin/env bash
# Compares the ws-runtime host with nginx serving the same answer as a static
# file: wrk -t1 for 5 s at 16 and 64 connections, host and nginx taking turns,
# ROUNDS times (default 3). Targets:
#   immediate  ws-runtime + the echo plug-in's fixed 200-byte answer (/echo/resources)
#   quillon    ws-runtime + libquillon.so.1 over the platform stand-ins (/quillon/resources)
#   nginx-*    nginx (2 workers, keep-alive) serving each answer's bytes and Content-Type
#   bare       libmicrohttpd alone (bare-http-daemon, 2 pool threads) serving the
#              immediate answer: the floor under the host on this machine
# Prints requests per second, p99 latency and the busiest thread's share of
# the server's CPU per run, then the mean ratios. On 2 cores wrk takes one;
# the daemon's pool threads (and nginx's workers) accept for themselves, so a
# run's connections land on one thread (busiest near 1.00) or are split
# (near 0.50), and single runs differ by up to a third: compare means over
# several rounds, and runs of the same kind with each other.
#
# Usage: bench/host/run.sh [ROUNDS]      (installs wrk and nginx when missing)
set -euo pipefail
rounds=${1:-3}
duration=${DURATION:-5s}
root=$(cd "$(dirname "$0")/../.." && pwd)
build="$root/build/release"

"$root/scripts/install-deps.sh" perf || apt-get install -y -qq --no-install-recommends wrk nginx-light
cmake --preset release -S "$root" >/dev/null
cmake --build "$build" -j "$(nproc)" --target ws-runtime quillon ws_runtime_echo_plugin bare-http-daemon >/dev/null

# shellcheck source=bench/host/common.sh
source "$root/bench/host/common.sh"

work=$(mktemp -d /tmp/bench-host-XXXXXX)
chmod 755 "$work"
pids=()
cleanup() {
  for pid in "${pids[@]}"; do kill "$pid" 2>/dev/null || true; done
  wait 2>/dev/null || true
  rm -rf "$work"
}
trap cleanup EXIT

declare -A server  # target -> the pid whose threads, or worker processes, serve it
start_host() {  # port plugin service target
  "$build/bin/ws-runtime" --listen "127.0.0.1:$1" --plugin "$2" --service "$3" --threads 2 --quiet \
    2>>"$work/host.log" &
  pids+=($!)
  server[$4]=$!
  wait_for "http://127.0.0.1:$1/$3/resources"
}

host_port=$(free_port)
quillon_port=$(free_port)
nginx_port=$(free_port)
start_host "$host_port" "$build/lib/libws_runtime_echo_plugin.so" echo immediate
start_host "$quillon_port" "$build/lib/libquillon.so.1" quillon quillon

# nginx gets each answer's exact bytes and Content-Type.
mkdir -p "$work/www" "$work/nginx"
declare -A types
for target in immediate quillon; do
  if [ "$target" = immediate ]; then url="http://127.0.0.1:$host_port/echo/resources";
  else url="http://127.0.0.1:$quillon_port/quillon/resources"; fi
  curl -fs -D "$work/$target.head" -o "$work/www/$target" "$url"
  types[$target]=$(grep -i '^content-type:' "$work/$target.head" | cut -d' ' -f2- | tr -d '\r')
done
bare_port=$(free_port)
"$build/bin/bare-http-daemon" "$bare_port" 2 "$work/www/immediate" "${types[immediate]}" \
  2>>"$work/host.log" &
pids+=($!)
server[bare]=$!
wait_for "http://127.0.0.1:$bare_port/"
curl -fs "http://127.0.0.1:$bare_port/" | cmp -s - "$work/www/immediate" ||
  { echo "bench: the bare daemon does not serve the immediate answer" >&2; exit 1; }

cat >"$work/nginx/nginx.conf" <<CONF
worker_processes 2;
daemon off;
pid $work/nginx/nginx.pid;
error_log $work/nginx/error.log;
events { worker_connections 1024; }
http {
  access_log off;
  keepalive_timeout 65;
  keepalive_requests 1000000;
  types { }
  server {
    listen 127.0.0.1:$nginx_port;
    location = /immediate { default_type "${types[immediate]}"; alias $work/www/immediate; }
    location = /quillon { default_type "${types[quillon]}"; alias $work/www/quillon; }
  }
}
CONF
nginx -p "$work/nginx" -c "$work/nginx/nginx.conf" &
pids+=($!)
server[nginx-immediate]=$!
server[nginx-quillon]=$!
wait_for "http://127.0.0.1:$nginx_port/immediate"
for target in immediate quillon; do
  curl -fs "http://127.0.0.1:$nginx_port/$target" | cmp -s - "$work/www/$target" ||
    { echo "bench: nginx does not serve the same bytes for $target" >&2; exit 1; }
done

declare -A sum
printf '%-6s %-14s %5s %12s %10s %8s\n' round target conns 'req/s' 'p99 ms' busiest
for round in $(seq 1 "$rounds"); do
  for conns in 16 64; do
    for target in immediate nginx-immediate bare quillon nginx-quillon; do
      case $target in
        immediate) url="http://127.0.0.1:$host_port/echo/resources" ;;
        quillon) url="http://127.0.0.1:$quillon_port/quillon/resources" ;;
        bare) url="http://127.0.0.1:$bare_port/" ;;
        nginx-*) url="http://127.0.0.1:$nginx_port/${target#nginx-}" ;;
      esac
      read -r rps p99 busiest _ < <(measure "$url" "$conns" "${server[$target]}")
      printf '%-6s %-14s %5s %12s %10s %8s\n' "$round" "$target" "$conns" "$rps" "$p99" "$busiest"
      sum[$target-$conns]=$(( ${sum[$target-$conns]:-0} + rps ))
    done
  done
done
echo
for conns in 16 64; do
  ratio "$conns" "immediate host/nginx" immediate nginx-immediate
  ratio "$conns" "immediate host/bare" immediate bare
  ratio "$conns" "bare/nginx" bare nginx-immediate
  ratio "$conns" "quillon host/nginx" quillon nginx-quillon
done
