#!/usr/bin/env bash
# Runs fuzz targets of the fuzz build (make fuzz) one after another, each for
# at most RUNS executions or SECONDS seconds, under AddressSanitizer and
# UndefinedBehaviorSanitizer, starting from its seed corpus. New inputs go to
# build/fuzz/work/<target>/, crashes to build/fuzz/findings/<target>/, and
# each target's final counts to build/fuzz/<target>.log.
#   scripts/run-fuzzers.sh SECONDS RUNS TARGET...   (TARGET: folder under fuzz/)
set -euo pipefail
cd "$(dirname "$0")/.."
seconds=$1 runs=$2
shift 2
export ASAN_OPTIONS=detect_leaks=1:abort_on_error=1
export UBSAN_OPTIONS=halt_on_error=1:print_stacktrace=1
for target in "$@"; do
  work=build/fuzz/work/$target findings=build/fuzz/findings/$target
  mkdir -p "$work" "$findings"
  cp -n fuzz/corpus/"$target"/* "$work"/ 2>/dev/null || true
  echo "== $target: at most $runs runs or $seconds s"
  nice -n 15 build/fuzz/bin/"${target}_fuzzer" -runs="$runs" -max_total_time="$seconds" \
    -timeout=10 -rss_limit_mb=2048 -print_final_stats=1 -artifact_prefix="$findings"/ \
    "$work" >build/fuzz/"$target".log 2>&1 || echo "$target: stopped with a finding (see $findings)"
  grep -E "stat::number_of_executed_units|stat::average_exec_per_sec|Done [0-9]+ runs" \
    build/fuzz/"$target".log || tail -5 build/fuzz/"$target".log
done
