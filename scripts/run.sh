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
# A playground starts afresh: the device keeps its coherency requirements in
# memory only, unless the caller names a state directory (docs/device.md).
export KOSDLIB_STATE_DIRECTORY="${KOSDLIB_STATE_DIRECTORY:-}"
exec "$host" --listen "$listen"
