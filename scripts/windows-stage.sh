#!/usr/bin/env bash
# Builds everything as 64-bit and as 32-bit Windows programs and runs the tests under Wine.
#
# Ends with one line for each width, the last lines of the output:
#
#   windows-x64: N passed, M failed
#   windows-x86: skipped: REASON
#
# and fails when a build or a test does. What cannot be installed is no failure: it is skipped, aloud.
set -euo pipefail
cd "$(dirname "$0")/.."
. scripts/setup.sh
mkdir -p build
lines=()
status=0

finish() {
  stop_wine
  printf '%s\n' "${lines[@]}"
  exit "$status"
}
stop_wine() { :; }
skip_all() {
  lines=("windows-x64: skipped: $1" "windows-x86: skipped: $1")
  finish
}

# The tests that passed and failed in a verbose log of CTest: the cases of a test program, or the program
# where it counts none. A program that printed nothing has not run, and one that failed without a
# failed case has crashed or run out of time.
count_tests() {
  awk '
    match($0, /^[0-9]+: /) {
      id = $1; sub(/:/, "", id)
      if ($0 ~ /Test command: .*windows-run\.sh/) wine[id] = 1
      if ($0 !~ /^[0-9]+: (Test command:|Working Directory:|Test timeout|Environment variables:|$)/) printed[id]++
      if ($0 ~ /^[0-9]+: \[       OK \] /) ok[id]++
      if ($0 ~ /^[0-9]+: \[  FAILED  \] .*\([0-9]+ ms\)/) bad[id]++
    }
    match($0, /^ *[0-9]+\/[0-9]+ Test +#[0-9]+: /) {
      id = $0; sub(/^[^#]*#/, "", id); sub(/:.*/, "", id)
      passed += ok[id]; failed += bad[id]
      if ($0 ~ / Passed /) {
        if (wine[id] && !printed[id]) failed++; else if (!ok[id]) passed++
      } else if (!bad[id]) failed++
    }
    END { print passed + 0, failed + 0 }' "$1"
}

# Builds a width; false when that fails.
build() {
  local log=build/$1-build.log started=$SECONDS
  if ! { timeout 1500 cmake --preset "$1" && timeout 1500 cmake --build --preset "$1"; } >"$log" 2>&1; then
    tail -40 "$log"
    lines+=("$1: 0 passed, 1 failed: the build")
    status=1
    return 1
  fi
  echo "$1: built in $((SECONDS - started)) s"
}

run_tests() {
  local log=build/$1-test.log passed failed started=$SECONDS
  timeout 900 ctest --preset "$1" -V -j"$(nproc)" >"$log" 2>&1 || true
  read -r passed failed < <(count_tests "$log")
  if [ "$((passed + failed))" -eq 0 ]; then failed=1; fi
  if [ "$failed" -ne 0 ]; then
    status=1
    grep -aE -B12 '^[0-9]+: \[  FAILED  \]|\*\*\*' "$log" || tail -20 "$log"
  fi
  echo "$1: tested in $((SECONDS - started)) s"
  lines+=("$1: $passed passed, $failed failed")
}

(need_packages "${windows_build_packages[@]}") >build/windows-packages.log 2>&1 ||
  skip_all "the cross compilers cannot be installed: $(tail -1 build/windows-packages.log)"
built=()
for preset in windows-x64 windows-x86; do
  if build "$preset"; then built+=("$preset"); fi
done

if ! (need_packages "${windows_run_packages[@]}") >build/windows-packages.log 2>&1; then
  for preset in "${built[@]}"; do
    lines+=("$preset: built, tests skipped: Wine cannot be installed: $(tail -1 build/windows-packages.log)")
  done
  finish
fi
. scripts/wine.sh
reason_32=$(fetch_wine_32) && . scripts/wine.sh || true
if ! make_wine_prefix >build/windows-prefix.log 2>&1; then
  cat build/windows-prefix.log
  lines+=("windows-x64, windows-x86: Wine does not start")
  status=1
  finish
fi

# Where the DLLs of a width are missing a program "runs" without a word and ends with 0. This one ends
# with 5 when it ran.
canary_runs() {
  local code=0
  timeout 60 wine "build/$1/bin/zkusb_canary.exe" >/dev/null 2>&1 || code=$?
  [ "$code" -eq 5 ]
}
for preset in "${built[@]}"; do
  if canary_runs "$preset"; then
    run_tests "$preset"
  elif [ "$preset" = windows-x86 ]; then
    lines+=("$preset: built, tests skipped: ${reason_32:-Wine runs no 32-bit program here}")
  else
    lines+=("$preset: 0 passed, 1 failed: Wine runs no 64-bit program")
    status=1
  fi
done
finish
