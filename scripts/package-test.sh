#!/usr/bin/env bash
# Installs the Debian packages of a package build into a throw-away root with
# dpkg, lists what they hold and need, checks the installed tree the way the
# install test does (no build paths, the service answers with the installed
# explanation texts, the unit verifies), then purges them and checks that
# nothing of theirs is left. The machine's own dpkg database is not touched.
set -euo pipefail
build=${1:?package build folder}
root_dir=$(cd "$(dirname "$0")/.." && pwd)
build=$(cd "$build" && pwd)
shopt -s nullglob
debs=("$build"/*.deb)
[ ${#debs[@]} -eq 2 ] || { echo "package-test: expected two .deb files in $build" >&2; exit 1; }

scratch=$(mktemp -d /tmp/quillon-packages-XXXXXX)
trap 'rm -rf "$scratch"' EXIT
root="$scratch/root"
mkdir -p "$root/var/lib/dpkg/info" "$root/var/lib/dpkg/updates"
touch "$root/var/lib/dpkg/status" "$root/var/lib/dpkg/available"

for deb in "${debs[@]}"; do
  echo "== $(basename "$deb")"
  dpkg-deb --field "$deb" Package Version Architecture Depends Suggests
  echo "-- conffiles: $(dpkg-deb --ctrl-tarfile "$deb" | tar -xO ./conffiles 2>/dev/null | tr '\n' ' ')"
  dpkg-deb --contents "$deb" | awk '{print "   " $6 ($7 ? " " $7 " " $8 : "")}'
done

# The scratch root has no libc6 or libmicrohttpd12 of its own: the packages'
# dependencies on them are met by the machine, not by this root. Nor has it a
# shell to chroot into for the maintainer scripts (CPack's ldconfig calls), so
# they run outside it, in a private mount namespace whose /etc is a scratch
# layer over the machine's: the cache ldconfig writes is thrown away.
in_scratch_etc() {
  mkdir -p "$scratch/etc-upper" "$scratch/etc-work"
  unshare --mount --propagation private -- sh -c \
    'mount -t overlay overlay -o "lowerdir=/etc,upperdir=$1/etc-upper,workdir=$1/etc-work" /etc && shift && exec "$@"' \
    sh "$scratch" "$@"
}
in_scratch_etc dpkg --root="$root" --force-depends --force-script-chrootless --install "${debs[@]}"
dpkg --root="$root" --list 'quillon*' | tail -n 2

"$root_dir/tests/install/install_test.py" --root "$root" --build-tree "$build" \
  --bindir /usr/bin --unit /usr/lib/systemd/system/ws-runtime.service \
  --explanations "$root_dir/data/share/errors/English/quillon.txt"

in_scratch_etc dpkg --root="$root" --force-script-chrootless --purge quillon-platform quillon
left=$(find "$root" -mindepth 1 -not -path "$root/var/lib/dpkg*" -not -type d)
if [ -n "$left" ]; then
  echo "package-test: left behind after purge:" >&2
  echo "$left" >&2
  exit 1
fi
echo "package-test: installed, served and purged cleanly"
