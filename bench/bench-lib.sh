# Helpers for the benchmark scripts (sourced). Servers started here are
# stopped when the script exits.
#
#   start_server <command...>  runs a server that prints "port <n>"; sets $port
#   start_zyrd <build-dir> <log>  runs the daemon (under the root that
#                                scripts/local-env.sh set up) on a free port,
#                                its standard error in log; sets $port and
#                                $zyrd_pid
#   measure <label> <url> [lua]  runs wrk once against url, prints one line
#                                with requests per second and latency
#                                percentiles; sets $rate
# Settings: BENCH_SECONDS (default 10), BENCH_CONNECTIONS (16), BENCH_THREADS (2).

bench_seconds=${BENCH_SECONDS:-10}
bench_connections=${BENCH_CONNECTIONS:-16}
bench_threads=${BENCH_THREADS:-2}
bench_pids=()

bench_cleanup() {
  local p
  for p in "${bench_pids[@]}"; do
    kill "$p" 2>/dev/null || true
    wait "$p" 2>/dev/null || true
  done
}
trap bench_cleanup EXIT

command -v wrk >/dev/null || { echo "wrk is not installed (scripts/install-deps)" >&2; exit 1; }

start_server() {
  local out
  out=$(mktemp)
  "$@" >"$out" &
  bench_pids+=($!)
  port=
  for _ in $(seq 200); do
    port=$(sed -n 's/^port //p' "$out")
    [[ -n "$port" ]] && break
    sleep 0.05
  done
  rm -f "$out"
  [[ -n "$port" ]] || { echo "bench: $1 did not start" >&2; exit 1; }
}

start_zyrd() {
  local log=$2
  : >"$log"  # there before the first look, however late the daemon starts
  ZYRD_HTTP_PORT=0 "$1/zyrd" 2>>"$log" &
  zyrd_pid=$!
  bench_pids+=("$zyrd_pid")
  port=
  for _ in $(seq 400); do
    port=$(sed -n 's/.*HTTP endpoint listening on TCP port \([0-9]*\).*/\1/p' "$log")
    [[ -n "$port" ]] && break
    kill -0 "$zyrd_pid" 2>/dev/null || break
    sleep 0.05
  done
  [[ -n "$port" ]] || { cat "$log" >&2; echo "bench: zyrd did not start" >&2; exit 1; }
}

measure() {
  local label=$1 url=$2 script=${3:-bench/post.lua} out
  out=$(wrk -t"$bench_threads" -c"$bench_connections" -d"${bench_seconds}s" --latency \
    -s "$script" "$url")
  rate=$(awk '/^Requests\/sec:/ {print $2}' <<<"$out")
  local errors
  errors=$(awk '/Non-2xx|Socket errors/ {printf "%s ", $0}' <<<"$out")
  # shellcheck disable=SC2046
  printf '%-26s %10s req/s   latency p50 %-8s p75 %-8s p90 %-8s p99 %-8s %s\n' "$label" "$rate" \
    $(awk '/^ +(50|75|90|99)%/ {print $2}' <<<"$out") "$errors"
}
