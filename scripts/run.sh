#!/usr/bin/env bash
# Starts the stand-in host with the plug-in of the given build folder.
set -euo pipefail
build=${1:?build folder}
listen=${2:-127.0.0.1:8080}
root=$(cd "$(dirname "$0")/.." && pwd)
host="$root/$build/bin/ws-runtime"
if [ ! -x "$host" ]; then
  echo "run: $host is not built yet" >&2
  exit 1
fi
# The plug-in finds its explanation texts through a marker file naming the
# shared-data directory; point it at the source tree's data instead of the
# installed location, so error answers carry a real "errorText".
marker="$root/$build/share.dir"
printf '%s\n' "$root/data/share" > "$marker"
export KOSYSQ_SHARE_DIR_FILE="$marker"
# The device's coherency requirements outlive a restart here too, in the
# build folder, unless the caller names another place (docs/device.md).
if [ -z "${KOSDLIB_STATE_DIRECTORY+set}" ]; then
  export KOSDLIB_STATE_DIRECTORY="$root/$build/state"
  mkdir -p "$KOSDLIB_STATE_DIRECTORY"
fi
exec "$host" --listen "$listen"
