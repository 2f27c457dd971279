# Sourced by ./test: what its stages do, and how they are shown.
#
# A stage is a function stage_NAME. It runs in a shell of its own with its output in build/log/NAME.log, ends with
# `outcome PASSED FAILED SKIPPED [REASON]`, and fails when something in it does.

export CTEST_OUTPUT_ON_FAILURE=1
# A compiler cache saves most of a second build. Without one everything works as well.
if command -v ccache >/dev/null; then
  export CMAKE_CXX_COMPILER_LAUNCHER=${CMAKE_CXX_COMPILER_LAUNCHER-ccache}
  export CMAKE_C_COMPILER_LAUNCHER=${CMAKE_C_COMPILER_LAUNCHER-ccache}
fi

# What each stage is, and about how many seconds it takes on two cores from nothing. With every case some take longer.
about() {
  case $1 in
    tree) echo 'the tree of files: order of the rooms, format, test lists|5' ;;
    native) echo "all native tests under the address sanitizer|${seconds_native:-130}" ;;
    windows-x64) echo "the 64-bit Windows tests under Wine|${seconds_windows:-180}" ;;
    windows-x86) echo 'the 32-bit Windows tests under Wine|280' ;;
    plain) echo 'growth by exact counts, what the module exports, 10,000 orders of threads, 200,000 broadcasts|130' ;;
    threads) echo 'what shares memory, under the thread sanitizer|90' ;;
    fuzz) echo 'each fuzz target for a moment|70' ;;
    tidy) echo 'clang-tidy over every source file|75' ;;
    reproducible) echo 'the Windows files, built twice: the same bytes|110' ;;
  esac
}

outcome() { printf '%s|%s|%s|%s\n' "$1" "$2" "$3" "${4:-}" >"$outcome_file"; }

build_preset() { # PRESET [TARGET...]
  local preset=$1
  shift
  cmake --preset "$preset" && cmake --build --preset "$preset" -j "$(nproc)" --target "${@:-all}"
}

# Runs the tests of a preset, reads the counts from the log and says the outcome.
test_preset() { # PRESET [OPTION OF CTEST...]
  local preset=$1 log passed failed skipped reasons
  shift
  log=build/log/$preset-ctest.log
  : >"$log"
  ctest --preset "$preset" -V -j"$(nproc)" "${which_tests[@]}" "$@" >"$log" 2>&1 &
  local ctest_process=$!
  # What the line of progress reads.
  tail -n +1 -f --pid=$ctest_process "$log" 2>/dev/null | grep -aE --line-buffered '^ *[0-9]+/[0-9]+ Test' || true
  wait "$ctest_process" || true
  { read -r passed failed skipped; reasons=$(cat); } < <(awk -f scripts/count-tests.awk "$log")
  [ $((passed + failed)) -gt 0 ] || failed=1
  if [ "$failed" -gt 0 ]; then
    echo "--- what failed"
    grep -aE -B12 '^[0-9]+: \[  FAILED  \]|\*\*\*(Failed|Timeout|Exception|Not Run)' "$log" | tail -80 || tail -20 "$log"
  fi
  outcome "$passed" "$failed" "$skipped" "$(tr '\n' ';' <<<"$reasons" | sed 's/;*$//')"
  [ "$failed" -eq 0 ]
}

stage_tree() { scripts/check-tree.sh && outcome 1 0 0; }
stage_native() { build_preset asan && test_preset asan; }
stage_plain() {
  build_preset release ZKUsbMonitor zkusb_bench zkusb_growth zkusb_schedule_tests zkusb_storm &&
    test_preset release -R '^(module_exports|zkusb_growth|zkusb_schedules_long|zkusb_storm_long)'
}
stage_threads() {
  build_preset tsan zkusb_tree_tests zkusb_records_tests zkusb_com_tests zkusb_simulation_tests zkusb_monitor_tests \
    zkusb_notifier_tests zkusb_module_tests &&
    test_preset tsan -R '^zkusb_[a-z_]*_tests\.(Ring|Walk|ConnectionRecord|TreeThreads|SimulatedRegistry|MonitorStress|ModuleStress|NotifierStress)'
}
stage_fuzz() { build_preset fuzz zkusb_fuzz_targets && test_preset fuzz -R '^zkusb_fuzz'; }
stage_windows-x64() { windows_stage windows-x64; }
stage_windows-x86() { windows_stage windows-x86; }
windows_stage() { . scripts/windows-stage.sh; }
stage_tidy() { scripts/check-tidy.sh --all && outcome 1 0 0; }
stage_reproducible() { scripts/check-reproducible.sh && outcome 1 0 0; }

# The last step that a log tells of: "[12/57]" of a build, "12/270 Test" of a test run.
progress_of() {
  tail -c 4000 "$1" 2>/dev/null | grep -aoE '^\[[0-9]+/[0-9]+\]|^ *[0-9]+/[0-9]+ Test' | tail -1 |
    sed -E 's/^\[(.*)\]/building \1, /; s/^ *([0-9]+\/[0-9]+) Test/testing \1, /' || true
}

# Begins a stage in the background.
begin_stage() { # NAME
  local name=$1 log=build/log/$1.log
  rm -f "build/log/$name.outcome"
  (
    set -eo pipefail
    outcome_file=build/log/$name.outcome
    "stage_$name"
  ) >"$log" 2>&1 </dev/null &
  process_of[$name]=$!
}

# Takes the outcome of a stage that has ended into the table.
end_stage() { # NAME SECONDS
  local name=$1 seconds=$2 status=0 passed failed skipped reason
  wait "${process_of[$name]}" || status=$?
  unset "process_of[$name]"
  [ -f "build/log/$name.outcome" ] || outcome_file=build/log/$name.outcome outcome 0 1 0 "it ended before its tests"
  [ "$status" -eq 0 ] || tail -100 "build/log/$name.log"
  echo "      $name: $seconds s"
  IFS='|' read -r passed failed skipped reason <"build/log/$name.outcome"
  # A stage that failed in something else than a test has failed all the same.
  [ "$status" -eq 0 ] || [ "$failed" -gt 0 ] || failed=1
  all_passed=$((all_passed + passed))
  all_failed=$((all_failed + failed))
  all_skipped=$((all_skipped + skipped))
  rows+=("$(printf '%-14s %7d %7d %8d %8d' "$name" "$passed" "$failed" "$skipped" "$seconds")")
  [ -z "$reason" ] || rows+=("$(tr ';' '\n' <<<"$reason" | sed 's/^/    skipped: /')")
}

# Runs stages side by side with a line of progress, on a terminal anew each second, else once a minute.
declare -A process_of
run_stages() { # NAME...
  local started=$SECONDS name line
  for name; do
    stage_number=$((stage_number + 1))
    line=$(about "$name")
    echo "[$stage_number/$stage_count] $name: ${line%|*}"
    begin_stage "$name"
  done
  while [ "${#process_of[@]}" -gt 0 ]; do
    sleep 1
    line=
    for name; do
      [ -n "${process_of[$name]-}" ] || continue
      if kill -0 "${process_of[$name]}" 2>/dev/null; then
        line+="$name: $(progress_of "build/log/$name.log")$((SECONDS - started)) s  "
      else
        [ ! -t 1 ] || printf '\r\033[K'
        end_stage "$name" $((SECONDS - started))
      fi
    done
    if [ -t 1 ]; then
      printf '\r\033[K      %s' "$line"
    elif [ -n "$line" ] && [ $(((SECONDS - started) % 60)) -eq 59 ]; then
      echo "      $line"
    fi
  done
  [ ! -t 1 ] || printf '\r\033[K'
}
