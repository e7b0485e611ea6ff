#!/usr/bin/env bash
# The packaged service as a new user deploys it, under a booted systemd in the
# sandbox of scripts/systemd-sandbox.sh:
#   steps    both .deb packages installed with dpkg; the simulated service;
#            linuxptp's own ptp4l@IFACE.service (a test drop-in: -S,
#            free_running 1, slaveOnly 1) linked by a veth pair to a master
#            ptp4l in another network namespace and driven to SLAVE; live mode
#            enabled as docs/deploying.md says; requirements that outlive a
#            restart and a SIGKILL; a clean stop; a purge that leaves no
#            conffile and no state; the exposure figures of both modes;
#   checks   after power-off, a canary in this machine's /tmp is still there,
#            no mount, network namespace or process of the sandbox is left.
#
#   deploy_test.sh SOURCE_DIR WORK_DIR [PACKAGE_DIR]
# Without PACKAGE_DIR the packages are built first, in WORK_DIR/packages.
# Exits 77 (skipped) with the reason where the machine cannot do it.
set -euo pipefail
source_dir=$(cd "${1:?source folder}" && pwd)
# shellcheck source=../../scripts/systemd-sandbox.sh
source "$source_dir/scripts/systemd-sandbox.sh"
work_dir=${2:?work folder}
package_dir=${3:-}

readonly SKIP=77
readonly DEVICE=/quillon/syncableDevices/pendulo/timekeeper/genericTk
readonly MASTER_MAC=02:51:00:00:00:01
readonly MASTER_ID=02-51-00-FF-FE-00-00-01
readonly LISTEN=127.0.0.1:18020  # set in /etc/default/ws-runtime, as a user would
readonly VENDOR="Content-Type: vnd.ko.syncDomain.v0/json; charset=utf-8"

skip() { echo "SKIP: $*"; exit $SKIP; }
fail() { echo "FAIL: $*" >&2; exit 1; }
step() { echo "== $*"; }

# ---------------------------------------------------------------- preconditions
preconditions() {
  local reason tool
  reason=$(sandbox_can_boot)
  [ -z "$reason" ] || skip "$reason"
  for tool in ptp4l pmc ip curl dpkg-deb unshare nsenter systemd-analyze; do
    command -v "$tool" > /dev/null || skip "$tool is not installed"
  done
}

# ---------------------------------------------------------------- packages
build_packages() {
  package_dir="$work_dir/packages"
  step "building the packages in $package_dir"
  cmake -S "$source_dir" -B "$package_dir" -G Ninja -DCMAKE_BUILD_TYPE=Release \
    -DCMAKE_INSTALL_PREFIX=/usr -DQUILLON_BUILD_TESTS=OFF -DQUILLON_BUILD_BENCH=OFF > /dev/null
  cmake --build "$package_dir" -j 2 > "$work_dir/package-build.log" ||
    { cat "$work_dir/package-build.log"; fail "the package build failed"; }
  rm -f "$package_dir"/*.deb
  (cd "$package_dir" && cpack -G DEB > "$work_dir/cpack.log") ||
    { cat "$work_dir/cpack.log"; fail "cpack failed"; }
}

cleanup() {
  local status=$?
  if [ $status -ne 0 ] && [ -n "$sandbox_unshare_pid" ]; then
    echo "-- the sandbox's journal, last lines:"
    sandbox_inside journalctl --no-pager -n 60 2>&1 || true
  fi
  sandbox_poweroff
  local problems
  problems=$(sandbox_leftovers)
  ip netns list 2> /dev/null | grep -q '^q20' && problems+="a q20 network namespace is left; "
  sandbox_forget
  if [ -n "$problems" ]; then
    echo "FAIL: $problems" >&2
    status=1
  elif [ -n "$sandbox_scratch" ]; then
    echo "sandbox gone: canary kept, no mount, namespace or process left"
  fi
  exit $status
}

# ---------------------------------------------------------------- inside helpers
http() {  # METHOD PATH [BODY]: prints "STATUS BODY"
  local args=(-s -o /dev/stdout -w ' %{http_code}' -X "$1" "http://$LISTEN$2")
  [ $# -ge 3 ] && args+=(-H "$VENDOR" --data-binary "$3")
  local out
  out=$(sandbox_inside curl "${args[@]}" 2> /dev/null) || true
  echo "${out##* } ${out% *}"
}

wait_for() {  # SECONDS DESCRIPTION COMMAND...: retries COMMAND until it succeeds
  local limit=$1 what=$2
  shift 2
  local deadline=$((SECONDS + limit))
  until "$@"; do
    [ $SECONDS -lt $deadline ] ||
      fail "$what: not within $limit s${last_answer:+; the last answer: $last_answer}"
    sleep 0.05
  done
}

last_answer=""
answers() {  # PATTERN METHOD PATH: the answer matches PATTERN
  last_answer=$(http "$2" "$3")
  [[ "$last_answer" == $1 ]]
}

exposure() {  # the figure, which must stay at or below 2.0
  local figure
  figure=$(sandbox_inside systemd-analyze security ws-runtime.service 2>&1 |
           sed -n 's/.*Overall exposure level for ws-runtime.service: \([0-9.]*\).*/\1/p')
  awk -v e="$figure" 'BEGIN { exit !(e != "" && e <= 2.0) }' ||
    fail "exposure '$figure' is above 2.0"
  echo "$figure"
}

# ---------------------------------------------------------------- steps
install_packages() {
  step "dpkg --install both packages"
  sandbox_inside sh -c 'dpkg --install /root/debs/*.deb' > "$work_dir/dpkg.log" 2>&1 ||
    { cat "$work_dir/dpkg.log"; fail "dpkg --install failed"; }
  sandbox_inside dpkg-query -W -f '${Package} ${Version} ${Status}\n' quillon quillon-platform
}

serve_simulated() {
  step "simulated mode"
  sandbox_inside sed -i "s/^WS_RUNTIME_LISTEN=.*/WS_RUNTIME_LISTEN=$LISTEN/" /etc/default/ws-runtime
  sandbox_inside systemctl start ws-runtime.service
  wait_for 10 "the simulated listing" answers '200 *"success":true*' GET /quillon/resources
  simulated_exposure=$(exposure)
  echo "simulated exposure: $simulated_exposure; the points it still counts:"
  sandbox_inside systemd-analyze security ws-runtime.service 2>&1 | grep '✗' || true
}

start_ptp_domain() {
  step "ptp4l@q20s.service (linuxptp's unit with a test drop-in) and a master in netns q20m"
  sandbox_inside ip netns add q20m
  sandbox_inside ip link add q20s type veth peer name q20m address "$MASTER_MAC" netns q20m
  sandbox_inside ip link set q20s up
  sandbox_inside ip -n q20m link set lo up
  sandbox_inside ip -n q20m link set q20m up
  # Never adjust this machine's clock; short intervals for quick state changes.
  local common=$'[global]\nfree_running 1\nnetwork_transport L2\nlogAnnounceInterval -2\n'
  common+=$'logSyncInterval -2\nannounceReceiptTimeout 2\n'
  printf '%sslaveOnly 1\n' "$common" | sandbox_write /etc/linuxptp/q20-slave.conf
  printf '%spriority1 100\nuds_address /run/q20-master\n' "$common" |
    sandbox_write /etc/linuxptp/q20-master.conf
  sandbox_inside mkdir -p /etc/systemd/system/ptp4l@q20s.service.d
  printf '[Service]\nExecStart=\nExecStart=%s\n' \
    '/usr/sbin/ptp4l -f /etc/linuxptp/q20-slave.conf -S -i %I' |
    sandbox_write /etc/systemd/system/ptp4l@q20s.service.d/test.conf
  sandbox_inside systemctl daemon-reload
  # The machine's clock is at stake: only ever a free-running daemon.
  sandbox_inside systemctl show -P ExecStart ptp4l@q20s.service | grep -q 'q20-slave.conf -S -i q20s' ||
    fail "the test drop-in of ptp4l@q20s.service is not in effect"
  sandbox_inside systemctl start ptp4l@q20s.service
  sandbox_inside systemd-run --quiet --unit q20-master ip netns exec q20m \
    /usr/sbin/ptp4l -f /etc/linuxptp/q20-master.conf -S -i q20m
  wait_for 10 "the slave's management socket" sandbox_inside test -S /var/run/ptp4l
  echo "daemon socket: $(sandbox_inside stat -c '%A %U %G %n' /var/run/ptp4l)"
  wait_for 20 "the slave to take the uncertainty 0" lock_slave
  wait_for 20 "the slave's port to be SLAVE" slave_state
}

pmc_slave() { sandbox_inside pmc -u -b 0 -s /var/run/ptp4l "$@" 2>&1; }
lock_slave() { pmc_slave "SET SYNCHRONIZATION_UNCERTAIN_NP 0" | grep -q "uncertain *0"; }
slave_state() { pmc_slave "GET PORT_DATA_SET" | grep -q "portState *SLAVE"; }

enable_live_mode() {
  step "live mode as the docs say: configuration, KOPDM_PTP4L_CONFIG, restart"
  sandbox_inside mkdir -p /etc/quillon
  echo '{"timeReferences":[{"id":"tr0","uds":"/var/run/ptp4l"}]}' | sandbox_write /etc/quillon/tr.json
  echo "KOPDM_PTP4L_CONFIG=/etc/quillon/tr.json" | sandbox_inside tee -a /etc/default/ws-runtime > /dev/null
  local started
  started=$(date +%s%N)
  sandbox_inside systemctl restart ws-runtime.service
  wait_for 20 "a live listing that names the master" \
    answers "200 *\"success\":true*$MASTER_ID*" GET /quillon/resources
  echo "restart to first live answer: $(( ($(date +%s%N) - started) / 1000000 )) ms"
  local device
  device=$(http GET "$DEVICE")
  [[ "$device" =~ \"offsetNanos\":-?[0-9]+\} ]] || fail "the live device has no offset: $device"
  echo "live device: ${device:0:300}"
  live_exposure=$(exposure)
  echo "live exposure: $live_exposure"
}

requirements_survive() {
  step "requirements outlive a restart and a SIGKILL"
  local body answer bound=1000000000
  for round in restart kill; do
    body="{\"maxOffsetNanos\":$((bound += 1))}"
    answer=$(http PUT "$DEVICE" "$body")
    [[ "$answer" == 200* ]] || fail "PUT $body: $answer"
    local before
    before=$(sandbox_inside systemctl show -P MainPID ws-runtime.service)
    if [ "$round" = restart ]; then
      sandbox_inside systemctl restart ws-runtime.service
    else
      sandbox_inside systemctl kill -s KILL ws-runtime.service
      wait_for 20 "the unit's restart after SIGKILL" restarted "$before"
    fi
    wait_for 20 "the requirements after $round" \
      answers "200 *\"coherencyRequirements\":$body,*" GET "$DEVICE"
    echo "after $round: $(http GET "$DEVICE" | grep -o '"coherencyRequirements":[^}]*}')"
  done
}

restarted() {
  local pid
  pid=$(sandbox_inside systemctl show -P MainPID ws-runtime.service)
  [ "$pid" != 0 ] && [ "$pid" != "$1" ]
}

stop_and_purge() {
  step "stop, then purge"
  sandbox_inside systemctl stop ws-runtime.service
  local result
  result=$(sandbox_inside systemctl show -P Result ws-runtime.service)
  [ "$result" = success ] || fail "systemctl stop ended with result $result"
  echo "stopped with result $result"
  sandbox_inside test -d /var/lib/private/ws-runtime || fail "no state directory before the purge"
  sandbox_inside dpkg --purge quillon-platform quillon > "$work_dir/purge.log" 2>&1 ||
    { cat "$work_dir/purge.log"; fail "dpkg --purge failed"; }
  local path
  for path in /etc/default/ws-runtime /etc/korvane/share/share.dir /var/lib/private/ws-runtime \
              /var/lib/ws-runtime; do
    ! sandbox_inside test -e "$path" || fail "$path is left after the purge"
  done
  echo "purged: no conffile and no state left"
}

main() {
  preconditions
  mkdir -p "$work_dir"
  work_dir=$(cd "$work_dir" && pwd)
  [ -n "$package_dir" ] || build_packages
  package_dir=$(cd "$package_dir" && pwd)
  ls "$package_dir"/quillon_*.deb "$package_dir"/quillon-platform_*.deb > /dev/null ||
    fail "no packages in $package_dir"
  trap cleanup EXIT
  trap 'exit 143' TERM INT
  step "booting systemd in new PID, mount and network namespaces over an overlay of /"
  sandbox_boot "$work_dir/systemd.log" "$package_dir" ||
    { cat "$work_dir/systemd.log"; fail "systemd did not come up in the sandbox"; }
  install_packages
  serve_simulated
  start_ptp_domain
  enable_live_mode
  requirements_survive
  stop_and_purge
  echo "systemd-analyze security ws-runtime.service: exposure $simulated_exposure simulated," \
       "$live_exposure live"
}

main
