# Shell functions shared by the host benchmarks: free ports, waiting for a
# server, one measured wrk run, and the demonstration ptp4l domain. Sourced;
# needs $duration set.

free_port() {
  python3 -c 'import socket; s=socket.socket(); s.bind(("127.0.0.1",0)); print(s.getsockname()[1])'
}

wait_for() {  # url
  for _ in $(seq 1 200); do
    curl -fs -o /dev/null "$1" && return 0
    sleep 0.05
  done
  echo "bench: $1 did not come up" >&2
  exit 1
}

# CPU ticks used so far by each thread of the process and, for nginx, by each
# worker process: "<id> <ticks>" per line.
cpu_ticks() {  # pid
  local unit
  for unit in /proc/"$1"/task/* $(pgrep -P "$1" | sed 's|^|/proc/|'); do
    awk -v id="${unit##*/}" '{ print id, $14 + $15 }' "$unit/stat" 2>/dev/null
  done | sort
}

# One wrk run: prints "<requests/s> <p99 in ms> <busiest thread's CPU share>
# <answers not 2xx or 3xx>".
measure() {  # url connections pid
  local before after result busiest rps p99 failed
  before=$(cpu_ticks "$3")
  result=$(wrk -t1 -c"$2" -d"$duration" --latency "$1" | awk '
    /Requests\/sec/ { rps = $2 }
    /Non-2xx or 3xx responses/ { failed = $NF }
    /^ +99%/ { v = $2; if (v ~ /us$/) { sub(/us/, "", v); v /= 1000 }
               else if (v ~ /ms$/) { sub(/ms/, "", v) } else if (v ~ /s$/) { sub(/s/, "", v); v *= 1000 }
               p99 = v }
    END { printf "%.0f %.3f %d\n", rps, p99, failed }')
  after=$(cpu_ticks "$3")
  busiest=$(join <(echo "$before") <(echo "$after") |
    awk '{ d = $3 - $2; total += d; if (d > max) max = d }
         END { printf "%.2f", (total > 0 ? max / total : 0) }')
  read -r rps p99 failed <<< "$result"
  echo "$rps $p99 $busiest $failed"
}

# One mean ratio line of two targets' rates, summed over the rounds in the
# caller's associative array `sum` ("<target>-<connections>" keys).
ratio() {  # connections label numerator denominator
  awk -v c="$1" -v l="$2" -v h="${sum[$3-$1]}" -v n="${sum[$4-$1]}" \
    'BEGIN { printf "ratio -c%-3s %-26s = %.2f\n", c, l, h / n }'
}

# A scratch folder ($work), the processes to stop at exit ($pids, for the
# caller to add to) and the demonstration domain of scripts/ptp-domain.sh in
# it, its slave locked; all of it removed when the script exits.
ptp_domain_up() {  # scratch-prefix namespace-prefix; needs $domain_script
  work=$(mktemp -d "/tmp/$1-XXXXXX")
  pids=()
  trap ptp_domain_cleanup EXIT
  "$domain_script" sweep
  "$domain_script" up "$work/domain" "$2"
  "$domain_script" lock "$work/domain"
}

ptp_domain_cleanup() {
  for pid in "${pids[@]}"; do kill "$pid" 2>/dev/null || true; done
  wait 2>/dev/null || true
  "$domain_script" down "$work/domain" || true
  rm -rf "$work"
}
