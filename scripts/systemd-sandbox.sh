#!/usr/bin/env bash
# A throw-away machine with a booted systemd, for trying the packages under
# systemd without touching this one: systemd runs as PID 1 of new PID, mount
# and network namespaces, over an overlay of / whose upper layer is a tmpfs.
# Everything written inside (dpkg's database, /etc, /var, the units' state)
# lands in that tmpfs and is gone at power-off. The overlay is what keeps
# this machine's /tmp safe: systemd's boot-time tmpfiles cleans the /tmp it
# sees, and here that is a tmpfs of the sandbox.
#
# As a command (root):
#   systemd-sandbox.sh [DEB_FOLDER]
# boots the sandbox, installs the .deb files of DEB_FOLDER with dpkg, and
# opens a shell inside it; leaving the shell powers the sandbox off and
# checks that nothing of it is left. `make package-try` does this with the
# packages of `make package`.
#
# Sourced, it gives the functions that the deployment test drives it with:
#   sandbox_can_boot             prints why this machine cannot, or nothing
#   sandbox_boot LOG [FOLDER]    boots; FOLDER's .deb files go to /root/debs
#   sandbox_inside COMMAND...    runs COMMAND inside
#   sandbox_write FILE           writes standard input to FILE inside
#   sandbox_poweroff             powers off, or kills after 30 s
#   sandbox_leftovers            prints what is left of it, or nothing
#   sandbox_forget               removes the scratch folder and the canary

sandbox_scratch=""
sandbox_canary=""
sandbox_cgroup=""
sandbox_unshare_pid=""
sandbox_pid=""
sandbox_hierarchies=()  # the named and unified ones (hybrid), or the one (version 2)
for hierarchy in /sys/fs/cgroup/systemd /sys/fs/cgroup/unified /sys/fs/cgroup; do
  [ -f "$hierarchy/cgroup.procs" ] && sandbox_hierarchies+=("$hierarchy")
done
unset hierarchy

# Runs in the new namespaces as their PID 1, then becomes systemd.
sandbox_boot_script='
set -e
scratch=$1
mount -t tmpfs -o mode=0755 sandbox "$scratch"
mkdir "$scratch/upper" "$scratch/work" "$scratch/root"
mount -t overlay overlay \
  -o "lowerdir=/,upperdir=$scratch/upper,workdir=$scratch/work" "$scratch/root"
root=$scratch/root
mount -t proc proc "$root/proc"
# sysfs read-only, so that nothing in the sandbox (udev) writes to this
# machine'"'"'s devices; the control groups below it stay writable for systemd.
mount --rbind /sys "$root/sys"
mount -o remount,bind,ro "$root/sys"
mount --rbind /dev "$root/dev"
for dir in run tmp var/tmp; do mount -t tmpfs -o mode=1777 "sandbox-${dir//\//-}" "$root/$dir"; done
chmod 0755 "$root/run"
mkdir -p "$root/root/debs"
[ -z "$2" ] || cp "$2"/*.deb "$root/root/debs/"
mkdir -p "$root/.oldroot"
cd "$root"
pivot_root . .oldroot
umount -l /.oldroot
rmdir /.oldroot
export container=quillon-sandbox
# basic.target: what services need, without the gettys (this machine'"'"'s
# terminals) and the services this machine enables for itself.
exec /lib/systemd/systemd --system --unit=basic.target
'

sandbox_can_boot() {
  if [ "$(id -u)" -ne 0 ]; then
    echo "needs root to create namespaces and mount an overlay"
  elif ! grep -qw overlay /proc/filesystems && ! modprobe overlay 2> /dev/null; then
    echo "the kernel has no overlay file system"
  elif [ ! -x /lib/systemd/systemd ]; then
    echo "systemd is not installed (Debian package systemd)"
  elif ! unshare --pid --mount --net --fork true 2> /dev/null; then
    echo "cannot create PID, mount and network namespaces here"
  fi
}

sandbox_boot() {  # LOG [DEB_FOLDER]
  local log=$1 debs=${2:-}
  sandbox_scratch=$(mktemp -d /tmp/quillon-sandbox-XXXXXX)
  sandbox_canary=$(mktemp /tmp/quillon-sandbox-canary-XXXXXX)
  # A control group of its own, which the sandbox's systemd takes for its
  # root, so that it manages nothing outside.
  sandbox_cgroup="quillon-sandbox-$$"
  (
    for hierarchy in "${sandbox_hierarchies[@]}"; do
      mkdir -p "$hierarchy/$sandbox_cgroup"
      echo "$BASHPID" > "$hierarchy/$sandbox_cgroup/cgroup.procs"
    done
    # --kill-child: should the caller be killed outright, the sandbox goes too.
    exec unshare --pid --mount --net --fork --kill-child --propagation private -- \
      bash -c "$sandbox_boot_script" boot "$sandbox_scratch" "$debs"
  ) > "$log" 2>&1 &
  sandbox_unshare_pid=$!
  local i
  for i in $(seq 100); do
    sandbox_pid=$(pgrep -P "$sandbox_unshare_pid" || true)
    [ -n "$sandbox_pid" ] && [ "$(cat "/proc/$sandbox_pid/comm" 2> /dev/null)" = systemd ] && break
    kill -0 "$sandbox_unshare_pid" 2> /dev/null || { cat "$log" >&2; return 1; }
    sleep 0.1
  done
  local started=$SECONDS state
  # Until systemd listens, systemctl cannot connect at all.
  while state=$(sandbox_inside timeout 60 systemctl is-system-running --wait 2>&1)
        [[ "$state" == Failed* ]]; do
    [ $((SECONDS - started)) -lt 60 ] || break
    sleep 0.1
  done
  echo "systemd is $state after $((SECONDS - started)) s"
  case "$state" in running|degraded) ;; *) return 1 ;; esac
}

sandbox_inside() { nsenter -t "$sandbox_pid" -m -p -n -- "$@"; }
sandbox_write() { sandbox_inside sh -c 'cat > "$1"' sh "$1"; }

sandbox_poweroff() {
  [ -n "$sandbox_unshare_pid" ] || return 0
  if kill -0 "$sandbox_unshare_pid" 2> /dev/null; then
    sandbox_inside systemctl poweroff > /dev/null 2>&1 || true
    local i
    for i in $(seq 300); do kill -0 "$sandbox_unshare_pid" 2> /dev/null || break; sleep 0.1; done
    # PID 1 of the namespace takes every process of it along.
    if kill -0 "$sandbox_unshare_pid" 2> /dev/null; then
      echo "systemd did not power off in 30 s: killing the sandbox" >&2
      kill -KILL "$sandbox_pid" 2> /dev/null || true
    fi
  fi
  wait "$sandbox_unshare_pid" 2> /dev/null || true
  sandbox_unshare_pid=""
  local hierarchy
  for hierarchy in "${sandbox_hierarchies[@]}"; do
    [ -n "$sandbox_cgroup" ] && [ -d "$hierarchy/$sandbox_cgroup" ] &&
      find "$hierarchy/$sandbox_cgroup" -depth -type d -exec rmdir {} + 2> /dev/null
  done
  return 0
}

sandbox_leftovers() {
  [ -n "$sandbox_scratch" ] || return 0
  local problems=""
  [ -f "$sandbox_canary" ] ||
    problems+="the canary $sandbox_canary in this machine's /tmp is gone; "
  grep -q "$sandbox_scratch" /proc/self/mountinfo &&
    problems+="a mount under $sandbox_scratch is left; "
  [ -n "$sandbox_pid" ] && kill -0 "$sandbox_pid" 2> /dev/null &&
    problems+="the sandbox's systemd ($sandbox_pid) still runs; "
  local hierarchy
  for hierarchy in "${sandbox_hierarchies[@]}"; do
    [ -n "$sandbox_cgroup" ] && [ -d "$hierarchy/$sandbox_cgroup" ] &&
      problems+="the control group $hierarchy/$sandbox_cgroup is left; "
  done
  echo "$problems"
}

sandbox_forget() {
  [ -n "$sandbox_scratch" ] && rmdir "$sandbox_scratch" 2> /dev/null
  [ -n "$sandbox_canary" ] && rm -f "$sandbox_canary"
  return 0
}

sandbox_main() {
  set -euo pipefail
  local debs=${1:-} reason
  reason=$(sandbox_can_boot)
  [ -z "$reason" ] || { echo "systemd-sandbox: $reason" >&2; exit 1; }
  [ -z "$debs" ] || debs=$(cd "$debs" && pwd)
  # Global: the exit trap runs after this function's locals are gone.
  sandbox_log=$(mktemp /tmp/quillon-sandbox-log-XXXXXX)
  trap 'sandbox_poweroff; problems=$(sandbox_leftovers); sandbox_forget; rm -f "$sandbox_log"
        [ -z "$problems" ] || { echo "systemd-sandbox: $problems" >&2; exit 1; }
        echo "systemd-sandbox: powered off; nothing of it is left"' EXIT
  trap 'exit 143' TERM INT
  sandbox_boot "$sandbox_log" "$debs" || { echo "systemd-sandbox: systemd did not come up" >&2; exit 1; }
  if [ -n "$debs" ]; then
    sandbox_inside sh -c 'dpkg --install /root/debs/*.deb'
  fi
  echo "systemd-sandbox: a shell inside (exit to power off); the packages: /root/debs"
  sandbox_inside env -C /root bash -l || true
}

if [ "${BASH_SOURCE[0]}" = "$0" ]; then
  sandbox_main "$@"
fi
