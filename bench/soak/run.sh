#!/usr/bin/env bash
# Soak: REQUESTS mixed requests (the listing, the device, a timescale that
# does not exist, a PUT to the device) against the release host and plug-in
# over 16 keep-alive connections, while the scenario file is replaced
# REPLACEMENTS times, half of them renamed over and half written in place.
# Prints the host's resident memory and open descriptors at the start, in
# the middle and at the end, and the answers by status.
#   bench/soak/run.sh [REQUESTS] [REPLACEMENTS]   (defaults 1000000 and 1000)
set -euo pipefail
cd "$(dirname "$0")/../.."
requests=${1:-1000000}
replacements=${2:-1000}
command -v wrk >/dev/null || scripts/install-deps.sh perf
cmake --preset release >/dev/null
nice -n 10 cmake --build --preset release --target ws-runtime quillon >/dev/null

scratch=$(mktemp -d)
host=
cleanup() {
  [ -n "$host" ] && kill "$host" 2>/dev/null && wait "$host" 2>/dev/null
  rm -rf "$scratch"
}
trap cleanup EXIT
scenario=$scratch/scenario.json
cp examples/scenarios/default.json "$scenario"

KOPDM_SIM_SCENARIO=$scenario build/release/bin/ws-runtime --listen 127.0.0.1:0 --quiet \
  --threads 2 2>"$scratch/host.log" &
host=$!
for _ in $(seq 100); do
  grep -q "listening on" "$scratch/host.log" && break
  sleep 0.1
done
port=$(sed -n 's/.*listening on 127.0.0.1:\([0-9]*\) .*/\1/p' "$scratch/host.log")
[ -n "$port" ] || { cat "$scratch/host.log"; exit 1; }

sample() {  # label
  printf '%-7s resident %6s KiB, %3s descriptors\n' "$1" \
    "$(awk '/VmRSS/ {print $2}' /proc/"$host"/status)" "$(ls /proc/"$host"/fd | wc -l)"
}
curl -s "http://127.0.0.1:$port/quillon/resources" >/dev/null
sample start

# The replacements run beside wrk, paced to spread over the run; half are
# renamed over the file, half written in place.
(
  for i in $(seq "$replacements"); do
    source=examples/scenarios/default.json
    [ $((i % 4)) -ge 2 ] && source=examples/scenarios/many_references.json
    if [ $((i % 2)) -eq 0 ]; then
      cp "$source" "$scenario.new" && mv "$scenario.new" "$scenario"
    else
      cat "$source" >"$scenario"
    fi
    [ "$i" -eq $((replacements / 2)) ] && sample middle
    sleep "${PACE:-0.02}"
  done
  echo "replacements: $replacements"
) &
replacer=$!

started=$(date +%s.%N)
REQUESTS=$requests FINISHED_MARK=$scratch/finished UNEXPECTED_LOG=$scratch/unexpected \
  wrk -t1 -c16 -d3600s -s bench/soak/mixed.lua --latency "http://127.0.0.1:$port" \
  >"$scratch/wrk.log" &
client=$!
while [ ! -e "$scratch/finished" ] && kill -0 "$client" 2>/dev/null; do sleep 0.2; done
elapsed=$(echo "$(date +%s.%N) - $started" | bc)
kill -INT "$client" 2>/dev/null || true
wait "$client" || true
wait "$replacer"
sample end
printf 'requests: %s in %.1f s\n' "$requests" "$elapsed"
grep -E "Non-2xx|Socket errors|answers:" "$scratch/wrk.log" || true
# A listing that spans a replacement which removes a time reference answers
# that the reference does not exist; a half-read file would answer
# "scenario unusable" (-1074100993) instead.
echo "of the first $requests: $(cat "$scratch/finished" 2>/dev/null || echo '?')"
cut -c1-400 "$scratch/unexpected" 2>/dev/null | head -3
# Every fourth request asks for a timescale that does not exist: 500 with
# the error code in X-Status-Code, by design. Anything else is a fault.
for kind in "/quillon/resources" "/quillon/syncableDevices/pendulo/timekeeper/genericTk" \
            "/quillon/timescales/pendulo/tr9/00-00-00-FF-FE-00-00-00"; do
  printf '%s -> %s\n' "$kind" "$(curl -s -o /dev/null -w '%{http_code}' "http://127.0.0.1:$port$kind")"
done
