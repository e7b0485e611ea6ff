#!/usr/bin/env bash
# Instructions and allocations (malloc included) per in-process request, for
# the listing with four time references, one timescale document and the
# not-found error answer. Callgrind counts the same for the same binary
# whatever else the machine is doing; each kind runs twice, for REQUESTS/5
# and REQUESTS requests, and the difference leaves out start-up.
#
# With KOPDM_PTP4L_CONFIG naming a live configuration (scripts/ptp-domain.sh
# writes one), the time service is the live one over ptp4l daemons; its
# listing is the one kind that applies: KINDS=resources.
#
# Usage: [KINDS="resources ..."] bench/service/answer_cost.sh [REQUESTS]
#        (default 5000 requests, all three kinds; release build)
set -euo pipefail
requests=${1:-5000}
few=$((requests / 5))
root=$(cd "$(dirname "$0")/../.." && pwd)
build="$root/build/release"

"$root/scripts/install-deps.sh" perf
cmake --preset release -S "$root" >/dev/null
cmake --build "$build" -j "$(nproc)" --target answer_cost >/dev/null

work=$(mktemp -d /tmp/bench-answer-cost-XXXXXX)
trap 'rm -rf "$work"' EXIT

count() {  # kind requests
  valgrind --tool=callgrind --callgrind-out-file="$work/out" \
    "$build/bin/answer_cost" "$1" "$2" >/dev/null 2>"$work/log"
  awk '/^summary:/ { print $2 }' "$work/out"
}

for kind in ${KINDS:-resources timescale error}; do
  low=$(count "$kind" "$few")
  high=$(count "$kind" "$requests")
  allocations=$("$build/bin/answer_cost" "$kind" "$requests")
  printf '%-10s %8d instructions per request; %s\n' "$kind" \
    $(( (high - low) / (requests - few) )) "${allocations#*: }"
done
