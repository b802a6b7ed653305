#!/usr/bin/env bash
# Instruction counts of product loading, which stay put on a busy machine
# where times do not: runs one iteration each of the bare parse and of
# LoadProduct under valgrind's callgrind and prints the inclusive counts of
# the parse, the load and the metadata extraction within the load, and their
# ratios (see README.md). Usage: bench/load_instructions.sh [build folder]
set -euo pipefail
build=${1:-build}
bench="$build/bin/product_load_bench"
out=$(mktemp -d)
trap 'rm -rf "$out"' EXIT

# Inclusive instructions of the first function whose name contains $2.
inclusive() {
  callgrind_annotate --inclusive=yes --threshold=100 "$1" |
    awk -v name="$2" '!found && index($0, name) {
      found = 1; gsub(",", "", $1); print $1 }'
}

for b in BM_BareParseValidating BM_LoadProduct; do
  valgrind --tool=callgrind --callgrind-out-file="$out/$b.out" "$bench" \
    --benchmark_filter="^$b\$" --benchmark_min_time=0.000001 >/dev/null 2>&1
done
parse=$(inclusive "$out/BM_BareParseValidating.out" "::ParseBare(")
load=$(inclusive "$out/BM_LoadProduct.out" ":LoadProduct(")
metadata=$(inclusive "$out/BM_LoadProduct.out" ":ExtractProductMetadata(")
awk -v p="$parse" -v l="$load" -v m="$metadata" 'BEGIN {
  printf "bare parse (Val_Always)   %6.1f M instructions\n", p / 1e6
  printf "LoadProduct               %6.1f M instructions\n", l / 1e6
  printf "  metadata extraction     %6.1f M instructions\n", m / 1e6
  printf "load / bare parse         %6.2f\n", l / p
  printf "metadata / rest of load   %6.3f\n", m / (l - m)
}'
