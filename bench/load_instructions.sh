#!/usr/bin/env bash
# Instruction counts of product loading and of rs2 info, which stay put on a
# busy machine where times do not: runs one iteration each of the bare
# parses, of LoadProduct and of opening and describing the real product under
# valgrind's callgrind and prints their inclusive counts and ratios (see
# README.md). Usage: bench/load_instructions.sh [build folder]
set -euo pipefail
build=${1:-build}
out=$(mktemp -d)
trap 'rm -rf "$out"' EXIT

# Inclusive instructions of the first function whose name contains $2.
inclusive() {
  callgrind_annotate --inclusive=yes --threshold=100 "$1" |
    awk -v name="$2" '!found && index($0, name) {
      found = 1; gsub(",", "", $1); print $1 }'
}

count() { # program benchmark
  valgrind --tool=callgrind --callgrind-out-file="$out/$2.out" "$build/bin/$1" \
    --benchmark_filter="^$2\$" --benchmark_min_time=0.000001 >/dev/null 2>&1
}
count product_load_bench BM_BareParseValidating
count product_load_bench BM_LoadProduct
count info_bench BM_BareParseWithTables
count info_bench BM_OpenAndDescribe
count info_bench BM_OpenOnly
parse=$(inclusive "$out/BM_BareParseValidating.out" "::ParseBare(")
load=$(inclusive "$out/BM_LoadProduct.out" ":LoadProduct(")
metadata=$(inclusive "$out/BM_LoadProduct.out" ":ExtractProductMetadata(")
tables=$(inclusive "$out/BM_BareParseWithTables.out" "::ParseBareWithTables(")
info=$(inclusive "$out/BM_OpenAndDescribe.out" "::OpenAndDescribe(")
open=$(inclusive "$out/BM_OpenOnly.out" "host::OpenRaster(")
awk -v p="$parse" -v l="$load" -v m="$metadata" -v t="$tables" -v i="$info" \
  -v o="$open" 'BEGIN {
  printf "bare parse (Val_Always)   %6.1f M instructions\n", p / 1e6
  printf "LoadProduct               %6.1f M instructions\n", l / 1e6
  printf "  metadata extraction     %6.1f M instructions\n", m / 1e6
  printf "load / bare parse         %6.2f\n", l / p
  printf "metadata / rest of load   %6.3f\n", m / (l - m)
  printf "bare parse of product.xml and its tables %6.1f M instructions\n", t / 1e6
  printf "open (host::OpenRaster)                  %6.1f M instructions\n", o / 1e6
  printf "open and describe (rs2 info)             %6.1f M instructions\n", i / 1e6
  printf "open / bare parses                       %6.2f\n", o / t
  printf "open and describe / bare parses          %6.2f\n", i / t
}'
