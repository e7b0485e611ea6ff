#!/usr/bin/env bash
# Installs the Debian packages that building and testing need, and only those
# that are missing. Runs apt-get as root, or through sudo where that is there.
set -euo pipefail

packages=(
  cmake ninja-build g++ pkg-config make locales
  libgtest-dev libgmock-dev libbenchmark-dev
  libcjson-dev libjansson-dev libmicrohttpd-dev libcurl4-openssl-dev libssl-dev
  linuxptp iproute2 nginx-light
  systemd dpkg-dev binutils curl
  python3 python3-jsonschema python3-yaml
)
# Extra sets for the optional tools: 'fuzz', 'perf' and 'package' (see README).
for extra in "$@"; do
  case "$extra" in
    fuzz) packages+=(clang libclang-rt-14-dev) ;;
    perf) packages+=(wrk nginx-light linux-perf valgrind) ;;
    package) packages+=(dpkg-dev binutils systemd) ;;
    *) echo "install-deps: unknown extra set '$extra'" >&2; exit 2 ;;
  esac
done

missing=()
for p in "${packages[@]}"; do
  if ! dpkg-query -W -f='${Status}' "$p" 2>/dev/null | grep -q 'install ok installed'; then
    missing+=("$p")
  fi
done
[ ${#missing[@]} -eq 0 ] && exit 0

echo "install-deps: installing ${missing[*]}"
if [ "$(id -u)" -eq 0 ]; then
  sudo=()
elif command -v sudo >/dev/null 2>&1; then
  sudo=(sudo)
else
  echo "install-deps: need root or sudo to install: ${missing[*]}" >&2
  exit 1
fi
export DEBIAN_FRONTEND=noninteractive
"${sudo[@]}" apt-get update -qq
"${sudo[@]}" apt-get install -y -qq --no-install-recommends "${missing[@]}"
