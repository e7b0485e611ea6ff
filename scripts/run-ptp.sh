#!/usr/bin/env bash
# Serves live ptp4l state: starts a two-daemon PTP domain in network
# namespaces (scripts/ptp-domain.sh), drives its slave to SLAVE, and runs the
# stand-in host with the plug-in of the given build folder over it. Ctrl-C
# stops the host, then the daemons, and removes the namespaces.
set -euo pipefail
build=${1:?build folder}
listen=${2:-127.0.0.1:8080}
root=$(cd "$(dirname "$0")/.." && pwd)
domain="$root/scripts/ptp-domain.sh"

if ! why=$("$domain" check); then
  echo "run-ptp: $why" >&2
  echo "run-ptp: run it as root on a machine that allows network namespaces" >&2
  exit 1
fi
"$domain" sweep
dir=$(mktemp -d /tmp/quillon-ptp.XXXXXX)
cleanup() {
  "$domain" down "$dir" || true
  rm -rf "$dir"
}
trap cleanup EXIT
trap 'exit 130' INT TERM

"$domain" up "$dir" "qptp$$"
"$domain" lock "$dir"
echo "run-ptp: ptp4l master (tr0) and slave (tr1) running; configuration $dir/tr.json," \
     "daemon logs $dir/master.log and $dir/slave.log"
echo "run-ptp: drive the slave with: $domain unlock $dir   (and lock)"
KOPDM_PTP4L_CONFIG="$dir/tr.json" "$root/scripts/run.sh" "$build" "$listen"
