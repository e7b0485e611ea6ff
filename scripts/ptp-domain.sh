#!/usr/bin/env bash
# A two-clock PTP domain of real ptp4l daemons, each in a network namespace
# of its own, joined by a veth pair: a master-capable clock (priority1 100)
# and a slave-only clock. Both use software time stamps and run with
# free_running 1, so neither ever steps or pulls this machine's clock. Their
# management sockets are files in the run folder, reachable from here.
#
#   ptp-domain.sh up DIR PREFIX   create the namespaces PREFIXm, PREFIXs and start both
#   ptp-domain.sh lock DIR        drive the slave to SLAVE (uncertainty 0)
#   ptp-domain.sh unlock DIR      and back to UNCALIBRATED (uncertainty 255)
#   ptp-domain.sh stop DIR ROLE   stop the master or the slave daemon
#   ptp-domain.sh start DIR ROLE  start it again
#   ptp-domain.sh down DIR        stop both and remove the namespaces
#   ptp-domain.sh sweep           remove domains whose creating process is gone
#   ptp-domain.sh check           exit 0 when this machine can run a domain
#
# `up` also writes DIR/tr.json, the live time service's configuration for the
# domain: time reference tr0 is the master, tr1 the slave.
# PREFIX is "qptp" followed by the pid of the process that owns the domain,
# optionally with a tag of digits after the "q" (e.g. "q7ptp1234", so that
# runs of several checkouts tell their namespaces apart), at most 14
# characters so that interface names fit; `sweep` removes the domains of
# owners that no longer run. Needs root, iproute2 and linuxptp.
set -euo pipefail

usage() { sed -n '2,23p' "$0" >&2; exit 2; }

role_namespace() {  # DIR ROLE
  local prefix
  prefix=$(cat "$1/prefix")
  case "$2" in
    master) echo "${prefix}m" ;;
    slave) echo "${prefix}s" ;;
    *) echo "ptp-domain: unknown role '$2' (master or slave)" >&2; exit 2 ;;
  esac
}

write_config() {  # DIR ROLE
  local dir=$1 role=$2
  {
    echo "[global]"
    # The clock is this machine's: never adjust it.
    echo "free_running 1"
    echo "use_syslog 0"
    echo "verbose 1"
    echo "uds_address $dir/$role.sock"
    # Short intervals make the state changes quick.
    echo "logAnnounceInterval -2"
    echo "logSyncInterval -2"
    echo "announceReceiptTimeout 2"
    if [ "$role" = master ]; then
      echo "priority1 100"
    else
      echo "slaveOnly 1"
    fi
  } > "$dir/$role.cfg"
}

start_daemon() {  # DIR ROLE
  local dir=$1 role=$2 ns
  ns=$(role_namespace "$dir" "$role")
  rm -f "$dir/$role.sock"
  ip netns exec "$ns" ptp4l -S -2 -i "$ns" -f "$dir/$role.cfg" >> "$dir/$role.log" 2>&1 &
  echo $! > "$dir/$role.pid"
  for _ in $(seq 100); do
    [ -S "$dir/$role.sock" ] && return 0
    kill -0 "$(cat "$dir/$role.pid")" 2>/dev/null || break
    sleep 0.1
  done
  echo "ptp-domain: ptp4l ($role) did not start; its log:" >&2
  cat "$dir/$role.log" >&2
  exit 1
}

stop_daemon() {  # DIR ROLE
  local dir=$1 role=$2 pid
  [ -f "$dir/$role.pid" ] || return 0
  pid=$(cat "$dir/$role.pid")
  rm -f "$dir/$role.pid"
  kill "$pid" 2>/dev/null || return 0
  for _ in $(seq 50); do
    kill -0 "$pid" 2>/dev/null || return 0
    sleep 0.1
  done
  kill -KILL "$pid" 2>/dev/null || true
}

set_uncertainty() {  # DIR VALUE
  local dir=$1 answer
  answer=$(pmc -u -b 0 -i "$dir/pmc.$$" -s "$dir/slave.sock" \
               "SET SYNCHRONIZATION_UNCERTAIN_NP $2" 2>&1) || true
  rm -f "$dir/pmc.$$"
  if ! grep -q "uncertain *$2" <<< "$answer"; then
    echo "ptp-domain: the slave did not take the uncertainty $2: $answer" >&2
    exit 1
  fi
}

remove_namespace() {  # NAME
  local pid
  for pid in $(ip netns pids "$1" 2>/dev/null); do kill -KILL "$pid" 2>/dev/null || true; done
  ip netns del "$1" 2>/dev/null || true
}

domain_up() {  # DIR PREFIX
  local dir=$1 prefix=$2
  case "$prefix" in
    q*ptp[0-9]*) [[ "$prefix" =~ ^q[0-9]*ptp[0-9]+$ && ${#prefix} -le 14 ]] ||
                   { echo "ptp-domain: the prefix must be q[TAG]ptp<pid>, 14 characters at most" >&2; exit 2; } ;;
    *) echo "ptp-domain: the prefix must be q[TAG]ptp<pid>" >&2; exit 2 ;;
  esac
  mkdir -p "$dir"
  echo "$prefix" > "$dir/prefix"
  ip netns add "${prefix}m"
  ip netns add "${prefix}s"
  ip link add "${prefix}m" address 02:51:00:00:00:01 netns "${prefix}m" type veth \
    peer name "${prefix}s" address 02:51:00:00:00:02 netns "${prefix}s"
  for ns in "${prefix}m" "${prefix}s"; do
    ip -n "$ns" link set lo up
    ip -n "$ns" link set "$ns" up
  done
  write_config "$dir" master
  write_config "$dir" slave
  start_daemon "$dir" master
  start_daemon "$dir" slave
  cat > "$dir/tr.json" <<JSON
{"timeReferences": [
   {"id": "tr0", "uds": "$dir/master.sock"},
   {"id": "tr1", "uds": "$dir/slave.sock"}]}
JSON
}

domain_down() {  # DIR
  local dir=$1 prefix
  [ -f "$dir/prefix" ] || return 0
  prefix=$(cat "$dir/prefix")
  stop_daemon "$dir" slave
  stop_daemon "$dir" master
  remove_namespace "${prefix}s"
  remove_namespace "${prefix}m"
}

sweep() {
  local name owner
  for name in $(ip netns list 2>/dev/null | awk '{print $1}'); do
    [[ "$name" =~ ^q[0-9]*ptp([0-9]+)[ms]$ ]] || continue
    owner=${BASH_REMATCH[1]}
    kill -0 "$owner" 2>/dev/null && continue
    remove_namespace "$name"
  done
}

check() {
  local probe="qptpcheck$$"
  command -v ptp4l > /dev/null || { echo "ptp4l is not installed (Debian package linuxptp)"; exit 1; }
  command -v pmc > /dev/null || { echo "pmc is not installed (Debian package linuxptp)"; exit 1; }
  command -v ip > /dev/null || { echo "ip is not installed (Debian package iproute2)"; exit 1; }
  if ! error=$(ip netns add "$probe" 2>&1); then
    echo "cannot create a network namespace: $error"
    exit 1
  fi
  ip netns del "$probe"
}

[ $# -ge 1 ] || usage
case "$1" in
  up) [ $# -eq 3 ] || usage; domain_up "$2" "$3" ;;
  lock) [ $# -eq 2 ] || usage; set_uncertainty "$2" 0 ;;
  unlock) [ $# -eq 2 ] || usage; set_uncertainty "$2" 255 ;;
  stop) [ $# -eq 3 ] || usage; role_namespace "$2" "$3" > /dev/null; stop_daemon "$2" "$3" ;;
  start) [ $# -eq 3 ] || usage; start_daemon "$2" "$3" ;;
  down) [ $# -eq 2 ] || usage; domain_down "$2" ;;
  sweep) sweep ;;
  check) check ;;
  *) usage ;;
esac
