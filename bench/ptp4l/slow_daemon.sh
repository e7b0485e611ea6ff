#!/usr/bin/env bash
# The live time service next to a slow daemon: the demonstration domain of
# scripts/ptp-domain.sh (root and network namespaces needed), its slave
# locked and served directly as tr0, its master as tr1 behind
# ptp-delay-relay, which hands every answer back DELAY ms late (default 150:
# under the default timeoutMillis of 200, over the default maxAgeMillis of
# 100). The host runs with its default thread count.
#
#   phase "one client": one connection listing resources for 3 s;
#   phase "64 listers": 64 connections listing and one reading the device
#   document, at once, for 8 s.
#
# Prints, per phase and client, the median, p99 and worst latency, the
# requests and the failed ones (answers other than 2xx, and socket errors),
# then the datagrams per second the relay forwarded to the daemon and handed
# back, and the most requests in flight through it at once.
#
# Usage: bench/ptp4l/slow_daemon.sh [DELAY_MS]   (root)
# Latencies are every request's, measured by http-load (bench/ptp4l).
# DOMAIN_TAG=digits names the namespaces q<DOMAIN_TAG>ptp<pid>{m,s}.
set -euo pipefail
delay=${1:-150}
root=$(cd "$(dirname "$0")/../.." && pwd)
build="$root/build/release"
domain_script="$root/scripts/ptp-domain.sh"

"$domain_script" check > /dev/null || { "$domain_script" check; exit 1; }
cmake --preset release -S "$root" >/dev/null
cmake --build "$build" -j 2 --target ws-runtime quillon ptp-delay-relay http-load >/dev/null
# shellcheck source=bench/host/common.sh
source "$root/bench/host/common.sh"

ptp_domain_up bench-slow-daemon "q${DOMAIN_TAG:-}ptp$$"

"$build/bin/ptp-delay-relay" "$work/relay.sock" "$work/domain/master.sock" "$delay" \
  > "$work/relay.out" &
relay=$!
pids+=("$relay")
cat > "$work/tr.json" <<JSON
{"timeReferences": [
   {"id": "tr0", "uds": "$work/domain/slave.sock"},
   {"id": "tr1", "uds": "$work/relay.sock"}]}
JSON
port=$(free_port)
KOPDM_PTP4L_CONFIG="$work/tr.json" "$build/bin/ws-runtime" --listen "127.0.0.1:$port" --quiet \
  2>>"$work/host.log" &
pids+=($!)
base="http://127.0.0.1:$port/quillon"
wait_for "$base/resources"
for _ in $(seq 1 100); do
  curl -fs "$base/resources" | grep -q '"success":true.*tr0' && break
  sleep 0.1
done
echo "listing: $(curl -s "$base/resources")"
echo "device:  $(curl -s "$base/syncableDevices/pendulo/timekeeper/genericTk")"

# "<requests> <answers> <most in flight>" of the relay since the last report.
relay_report() {
  local lines
  lines=$(wc -l < "$work/relay.out")
  kill -USR1 "$relay"
  for _ in $(seq 1 100); do
    [ "$(wc -l < "$work/relay.out")" -gt "$lines" ] && break
    sleep 0.01
  done
  tail -n 1 "$work/relay.out"
}

print_row() {  # phase client "median p99 worst requests failed"
  local median p99 worst requests failed
  read -r median p99 worst requests failed <<< "$3"
  printf '%-11s %-8s %8s %8s %8s %9s %7s %7s\n' "$1" "$2" "$median" "$p99" "$worst" \
    "$requests" "$failed" \
    "$(awk -v f="$failed" -v r="$requests" 'BEGIN { printf "%.2f%%", r ? 100 * f / r : 0 }')"
}

print_relay() {  # phase seconds "before" "after"
  local r0 a0 r1 a1 most
  read -r r0 a0 _ <<< "$3"
  read -r r1 a1 most <<< "$4"
  awk -v p="$1" -v s="$2" -v r="$((r1 - r0))" -v a="$((a1 - a0))" -v m="$most" 'BEGIN {
    printf "%-11s relay: %.1f requests/s and %.1f answers/s to and from the daemon, most in flight %d\n",
           p, r / s, a / s, m }'
}

printf '%-11s %-8s %8s %8s %8s %9s %7s %7s\n' phase client 'median' 'p99' 'worst' requests failed share
printf '%-11s %-8s %8s %8s %8s %9s %7s %7s\n' '' '' '(ms)' '(ms)' '(ms)' '' '' ''
sleep 1  # nothing recent: the first call waits, as after any idle second
before=$(relay_report)
one=$("$build/bin/http-load" "$port" 3 "1:/quillon/resources")
after=$(relay_report)
print_row "one client" listing "$one"
print_relay "one client" 3 "$before" "$after"

before=$(relay_report)
both=$("$build/bin/http-load" "$port" 8 "64:/quillon/resources" \
        "1:/quillon/syncableDevices/pendulo/timekeeper/genericTk")
after=$(relay_report)
print_row "64 listers" listing "$(sed -n 1p <<< "$both")"
print_row "64 listers" device "$(sed -n 2p <<< "$both")"
print_relay "64 listers" 8 "$before" "$after"
echo "load: $(cut -d' ' -f1-3 /proc/loadavg) (1, 5, 15 min) on $(nproc) processors"
