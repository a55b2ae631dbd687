#!/usr/bin/env bash
# Load run of the dev host with wrk on loopback: "EnumSystemExperts" through
# the plug-in, then the host's floor (the same request answered with a fixed
# document of the same length, without the plug-in), in one run against one
# server. Prints both rates and their ratio; the goal is a ratio of 0.80.
#
# usage: bench/webhost/load.sh [BUILD_DIR] (default build/default)
# environment: DURATION (10s), THREADS (2), CONNECTIONS (16)
set -euo pipefail

root=$(cd "$(dirname "$0")/../.." && pwd)
build=${1:-$root/build/default}
host=$build/platform/webhost/qelwebhost
duration=${DURATION:-10s}
threads=${THREADS:-2}
connections=${CONNECTIONS:-16}

for tool in wrk curl; do
  command -v "$tool" >/dev/null || { echo "load.sh: $tool is missing (scripts/setup installs it)" >&2; exit 1; }
done
[ -x "$host" ] || { echo "load.sh: $host not built (cmake --build --preset default --target qelwebhost)" >&2; exit 1; }

work=$(mktemp -d /tmp/qelwebhost-bench-XXXXXX)
server=
cleanup() {
  if [ -n "$server" ]; then kill "$server" 2>/dev/null || true; wait "$server" 2>/dev/null || true; fi
  rm -rf "$work"
}
trap cleanup EXIT

# The access log would measure the terminal; it goes to a file.
"$host" --listen 127.0.0.1:0 --bench-floor --max-connections $((connections + 8)) \
  >"$work/stdout" 2>"$work/stderr" &
server=$!
port=
for _ in $(seq 1 200); do
  port=$(sed -n 's|.*listening on http://127.0.0.1:\([0-9]*\)/.*|\1|p' "$work/stdout")
  [ -n "$port" ] && break
  kill -0 "$server" 2>/dev/null || { cat "$work/stderr" >&2; exit 1; }
  sleep 0.05
done
[ -n "$port" ] || { echo "load.sh: the host did not start" >&2; exit 1; }

form='form_data=Function%3DEnumSystemExperts%26'
base=http://127.0.0.1:$port
bytes=$(curl -s --max-time 10 --data-raw "$form" "$base/qelsysapi/Server" | wc -c)
[ "$bytes" -gt 0 ] || { echo "load.sh: no answer from the plug-in" >&2; exit 1; }

cat >"$work/post.lua" <<LUA
wrk.method = "POST"
wrk.body = "$form"
wrk.headers["Content-Type"] = "application/x-www-form-urlencoded"
LUA

rate() {  # URL -> requests per second
  wrk -t "$threads" -c "$connections" -d "$duration" -s "$work/post.lua" "$1" |
    awk '/^Requests\/sec:/ { print $2 } /Non-2xx/ { print "non-2xx answers: " $0 > "/dev/stderr"; exit 1 }'
}

echo "document: $bytes bytes; wrk -t $threads -c $connections -d $duration"
plugin=$(rate "$base/qelsysapi/Server")
floor=$(rate "$base/bench/floor?bytes=$bytes")
awk -v p="$plugin" -v f="$floor" 'BEGIN {
  printf "EnumSystemExperts (plug-in): %10.0f requests/s\n", p
  printf "floor (host only):           %10.0f requests/s\n", f
  printf "ratio: %.3f (goal 0.80)\n", p / f
}'
