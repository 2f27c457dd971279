#!/usr/bin/env bash
# Runs every fuzz target for so many seconds each, as many side by side as there are processors, and ends
# with a table: what ran, how often, what it covers, and what it found.
#
#   scripts/fuzz-for.sh SECONDS [TARGET...]
#
# Finds that cover something new stay in build/fuzz/corpus/TARGET and are taken up by the next run; inputs
# that break something stay in build/fuzz/findings. Fails when there are any.
set -euo pipefail
cd "$(dirname "$0")/.."
seconds=${1:?usage: scripts/fuzz-for.sh SECONDS [TARGET...]}
shift
. scripts/setup.sh
need_packages "${build_packages[@]}" "${test_packages[@]}"

cmake --preset fuzz >/dev/null
targets=()
while read -r name _; do
  if [ $# -eq 0 ] || [[ " $* " == *" $name "* ]]; then targets+=("$name"); fi
done <build/fuzz/fuzz-targets.txt
cmake --build --preset fuzz --target "${targets[@]/#/zkusb_fuzz_}" >build/fuzz/build.log 2>&1 || {
  tail -40 build/fuzz/build.log
  exit 1
}

run() {
  local name=$1 found=build/fuzz/corpus/$1 line program corpus options
  line=$(grep "^$name " build/fuzz/fuzz-targets.txt)
  read -r _ program corpus options <<<"$line"
  mkdir -p "$found" build/fuzz/findings
  # shellcheck disable=SC2086
  "$program" $options -max_total_time="$seconds" -print_final_stats=1 -rss_limit_mb=4096 \
    -artifact_prefix="build/fuzz/findings/$name-" "$found" "$corpus" >"build/fuzz/$name.log" 2>&1 ||
    echo "ended with $?" >>"build/fuzz/$name.log"
}
export -f run
export seconds
printf '%s\n' "${targets[@]}" | xargs -P "$(nproc)" -I{} bash -c 'run {}'

failed=0
printf '%-14s %12s %10s %8s %8s  %s\n' target runs runs/s edges corpus result
for name in "${targets[@]}"; do
  log=build/fuzz/$name.log
  runs=$(sed -n 's/^stat::number_of_executed_units: *//p' "$log")
  rate=$(sed -n 's/^stat::average_exec_per_sec: *//p' "$log")
  edges=$(grep -ao ' cov: [0-9]*' "$log" | tail -1 | tr -dc 0-9 || true)
  kept=$(find "build/fuzz/corpus/$name" -type f | wc -l)
  result=$(sed -n 's/^ended with.*/&/p; s/^SUMMARY: //p; s/^does not hold: .*/&/p' "$log" | tail -1)
  if [ -n "$result" ]; then failed=1; fi
  printf '%-14s %12s %10s %8s %8s  %s\n' "$name" "${runs:--}" "${rate:--}" "${edges:--}" "$kept" "${result:-nothing found}"
done
exit "$failed"
