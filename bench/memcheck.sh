#!/usr/bin/env bash
# Runs the end-to-end test programs under valgrind's memcheck, one at a time,
# and prints one line per program: its exit status, the processes valgrind
# followed (the program, and the shells and rs2 tools its tests start), their
# errors and the bytes they lost definitely and indirectly. A definite or
# indirect leak counts as an error, so any of them fails the program.
#
#   bench/memcheck.sh [build folder] [test program ...]
#
# The build folder defaults to build; without program names the driver's
# end-to-end programs below are run. Exits 1 when a program fails or reports
# an error. Leaks in system libraries are suppressed by bench/valgrind.supp,
# which says why for each. A long run (ten minutes on two busy cores), not
# part of ctest.
set -uo pipefail
here=$(cd "$(dirname "$0")" && pwd) || exit 1
build=${1:-build}
shift || true
programs=("$@")
if [ ${#programs[@]} -eq 0 ]; then
  programs=(driver_module_tests driver_tests segment_directory_tests
    model_tests metadata_tests read_tests geo_tests realdata_tests
    rs2_tool_tests export_tests backscatter_tests quicklook_tests)
fi
bin=$(cd "$build/bin" && pwd) || exit 1
export VXB_DRIVER_PATH
VXB_DRIVER_PATH=$(cd "$build/lib" && pwd)/rs2driver.so || exit 1
# Valgrind's logs (one per process) and the programs' output go to a
# scratch folder, or to $RS2_MEMCHECK_LOGS, where they are kept.
if [ -n "${RS2_MEMCHECK_LOGS:-}" ]; then
  logs=$RS2_MEMCHECK_LOGS
  mkdir -p "$logs"
else
  logs=$(mktemp -d)
  trap 'rm -rf "$logs"' EXIT
fi

# Children are followed so that the rs2 tool the tests start is checked too.
# Skipped (with all they start): nm, which reads the module's symbols, and
# timeout and script, whose tests depend on the tool's native timing or on a
# terminal.
skipped='*/nm,*/timeout,*/script'
leakErrors=definite,indirect
memcheck=(nice -n 5 valgrind --tool=memcheck --leak-check=full
  --errors-for-leak-kinds="$leakErrors" --error-exitcode=1
  --trace-children=yes --trace-children-skip="$skipped"
  --suppressions="$here/valgrind.supp" --num-callers=30)

# Sum of the first number after $1 over the logs of one program.
total() { # pattern program
  awk -v pattern="$1" '{
      at = index($0, pattern)
      if (at) { rest = substr($0, at + length(pattern)); gsub(",", "", rest)
                split(rest, word, " "); sum += word[1] } }
    END { print sum + 0 }' "$logs/$2".*.log
}

failed=0
printf '%-24s %6s %9s %7s %12s %12s  %s\n' program status processes errors \
  'definite B' 'indirect B' tests
for program in "${programs[@]}"; do
  if [ ! -x "$bin/$program" ]; then
    printf '%-24s not built\n' "$program"
    failed=1
    continue
  fi
  rm -f "$logs/$program".*.log
  "${memcheck[@]}" --log-file="$logs/$program.%p.log" "$bin/$program" \
    --gtest_brief=1 >"$logs/$program.out" 2>&1
  status=$?
  processLogs=("$logs/$program".*.log)
  processes=${#processLogs[@]}
  errors=$(total 'ERROR SUMMARY:' "$program")
  definite=$(total 'definitely lost:' "$program")
  indirect=$(total 'indirectly lost:' "$program")
  passed=$(sed -n 's/^\[  PASSED  \] \([0-9]*\) tests\{0,1\}\.$/\1/p' \
    "$logs/$program.out")
  failures=$(grep -E '^\[  FAILED  \] [A-Za-z]' "$logs/$program.out" |
    sort -u | wc -l)
  tests="${passed:-0} passed, $failures failed"
  printf '%-24s %6s %9s %7s %12s %12s  %s\n' "$program" "$status" \
    "$processes" "$errors" "$definite" "$indirect" "$tests"
  if [ "$status" != 0 ] || [ "$errors" != 0 ]; then
    failed=1
    # What went wrong: the failed tests and every log that reports an error.
    grep -E '^\[  FAILED  \]' "$logs/$program.out" | sort -u | sed 's/^/    /'
    grep -L 'ERROR SUMMARY: 0 errors' "$logs/$program".*.log | while read -r log; do
      echo "    --- $(basename "$log")"
      sed -n -e '/^==[0-9]*== Command:/p' \
        -e '/^==[0-9]*== \(Invalid\|Mismatched\|Conditional\|Use of\|Syscall\|Source and\|Argument\)/,/^==[0-9]*== $/p' \
        -e '/^==[0-9]*== [0-9,]* (*[0-9, a-z]*)* *bytes in .* are \(definitely\|indirectly\) lost/,/^==[0-9]*== $/p' \
        "$log" | head -200 | sed 's/^/    /'
    done
  fi
done
exit "$failed"
