#!/usr/bin/env bash
# GET /quillon/resources served live from two ptp4l daemons against the same
# request served from the built-in simulated scenario: wrk -t1 for 5 s at 16
# and 64 connections, the two hosts taking turns, ROUNDS times (default 3).
# The daemons are the demonstration domain of scripts/ptp-domain.sh (root
# and network namespaces needed), its slave driven to SLAVE, so that the
# live listing has the same shape as the simulated one's.
# Prints requests per second and p99 latency per run, then the mean ratio
# live/simulated.
#
# Usage: bench/host/live.sh [ROUNDS]      (installs wrk when missing)
set -euo pipefail
rounds=${1:-3}
duration=${DURATION:-5s}
root=$(cd "$(dirname "$0")/../.." && pwd)
build="$root/build/release"
domain_script="$root/scripts/ptp-domain.sh"

"$root/scripts/install-deps.sh" perf
"$domain_script" check > /dev/null || { "$domain_script" check; exit 1; }
cmake --preset release -S "$root" >/dev/null
cmake --build "$build" -j "$(nproc)" --target ws-runtime quillon >/dev/null
# shellcheck source=bench/host/common.sh
source "$root/bench/host/common.sh"

ptp_domain_up bench-live "qptp$$"

declare -A server port
start_host() {  # target env...
  local target=$1
  shift
  port[$target]=$(free_port)
  env "$@" "$build/bin/ws-runtime" --listen "127.0.0.1:${port[$target]}" --threads 2 --quiet \
    2>>"$work/host.log" &
  pids+=($!)
  server[$target]=$!
  wait_for "http://127.0.0.1:${port[$target]}/quillon/resources"
}
start_host simulated KOPDM_PTP4L_CONFIG=
start_host live KOPDM_PTP4L_CONFIG="$work/domain/tr.json"

# Both must be answering listings, the live one with the slave published.
for _ in $(seq 1 100); do
  curl -fs "http://127.0.0.1:${port[live]}/quillon/resources" | grep -q '"success":true.*tr1' && break
  sleep 0.1
done
echo "live listing:      $(curl -s "http://127.0.0.1:${port[live]}/quillon/resources")"
echo "simulated listing: $(curl -s "http://127.0.0.1:${port[simulated]}/quillon/resources")"

declare -A sum
printf '%-6s %-10s %5s %12s %10s %8s\n' round target conns 'req/s' 'p99 ms' 'non-2xx'
for round in $(seq 1 "$rounds"); do
  for conns in 16 64; do
    for target in simulated live; do
      read -r rps p99 _ failed < <(measure "http://127.0.0.1:${port[$target]}/quillon/resources" \
                                           "$conns" "${server[$target]}")
      printf '%-6s %-10s %5s %12s %10s %8s\n' "$round" "$target" "$conns" "$rps" "$p99" "$failed"
      sum[$target-$conns]=$(( ${sum[$target-$conns]:-0} + rps ))
    done
  done
done
echo
for conns in 16 64; do
  ratio "$conns" "live/simulated" live simulated
done
