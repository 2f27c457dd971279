# Reads a verbose log of CTest and prints "PASSED FAILED SKIPPED", then a line for each test that was skipped, with the
# last line that it printed: its reason. Where a test is a program with cases of its own, the cases count; else the test.
#
# A Windows program that printed nothing has not run. One that failed without a failed case has crashed or run out of
# time.
match($0, /^[0-9]+: /) {
  id = $1; sub(/:/, "", id)
  if ($0 ~ /Test command: .*windows-run\.sh/) wine[id] = 1
  if ($0 !~ /^[0-9]+: (Test command:|Working Directory:|Test timeout|Environment variables:|$)/) {
    printed[id]++
    last[id] = $0
    sub(/^[0-9]+: /, "", last[id]); sub(/\r$/, "", last[id])
  }
  if ($0 ~ /^[0-9]+: \[       OK \] /) ok[id]++
  if ($0 ~ /^[0-9]+: \[  FAILED  \] .*\([0-9]+ ms\)/) bad[id]++
  if ($0 ~ /^[0-9]+: \[  SKIPPED \] .*\([0-9]+ ms\)/) {
    left[id]++
    reasons[++nreasons] = before[id]
  }
  before[id] = last[id]
}
match($0, /^ *[0-9]+\/[0-9]+ Test +#[0-9]+: /) {
  id = $0; sub(/^[^#]*#/, "", id); sub(/:.*/, "", id)
  name = $0; sub(/^[^:]*: */, "", name); sub(/ .*/, "", name)
  passed += ok[id]; failed += bad[id]
  if ($0 ~ /\*\*\*Skipped/) {
    if (left[id]) skipped += left[id]
    else { skipped++; reasons[++nreasons] = name ": " last[id] }
  } else if ($0 ~ / Passed /) {
    skipped += left[id]
    if (wine[id] && !printed[id]) failed++
    else if (!ok[id] && !left[id]) passed++
  } else if (!bad[id]) failed++
}
END {
  print passed + 0, failed + 0, skipped + 0
  for (i = 1; i <= nreasons; ++i) print reasons[i]
}
