# Sourced by scripts/stages.sh as a stage: builds one width as Windows programs and runs its tests under Wine. $1 is the
# preset. What cannot be installed is no failure: it is skipped, aloud.

preset=$1

# True where the kernel runs 32-bit programs: a program of a few instructions ends with 5.
kernel_runs_32_bits() {
  local program code=0
  program=$(mktemp)
  base64 -d >"$program" <<<'f0VMRgEBAQAAAAAAAAAAAAIAAwABAAAAVIAECDQAAAAAAAAAAAAAADQAIAABACgAAAAAAAEAAAAAAAAAAIAECACABAhgAAAAYAAAAAUAAAAAEAAAuAEAAAC7BQAAAM2A'
  chmod +x "$program"
  "$program" 2>/dev/null || code=$?
  rm -f "$program"
  [ "$code" -eq 5 ]
}

# Where the DLLs of a width are missing a program "runs" without a word and ends with 0. This one ends with 5 when it
# ran.
canary_runs() {
  local code=0
  timeout 60 wine "build/$1/bin/zkusb_canary.exe" >/dev/null 2>&1 || code=$?
  [ "$code" -eq 5 ]
}

run_windows_stage() {
  if ! need_packages "${windows_build_packages[@]}"; then
    outcome 0 0 1 'the cross compilers cannot be installed'
    return 0
  fi
  build_preset "$preset" "${windows_targets[@]}" || { outcome 0 1 0; return 1; }
  if [ "$preset" = windows-x86 ] && ! kernel_runs_32_bits; then
    outcome 0 0 1 'built, tests not run: this kernel runs no 32-bit programs'
    return 0
  fi
  if ! need_packages "${windows_run_packages[@]}"; then
    outcome 0 0 1 'built, tests not run: Wine cannot be installed'
    return 0
  fi
  . scripts/wine.sh
  local reason=
  if [ "$preset" = windows-x86 ]; then
    reason=$(fetch_wine_32) || true
    . scripts/wine.sh
  fi
  make_wine_prefix || { echo 'Wine does not start'; outcome 0 1 0; return 1; }
  local status=0
  if canary_runs "$preset"; then
    test_preset "$preset" || status=$?
  elif [ -n "$reason" ]; then
    outcome 0 0 1 "built, tests not run: $reason"
  else
    echo "Wine runs no program of $preset"
    outcome 0 1 0
    status=1
  fi
  stop_wine
  return "$status"
}
run_windows_stage
