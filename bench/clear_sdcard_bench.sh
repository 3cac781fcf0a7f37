#!/bin/bash
# clear_sdcard against rm -rf on the same tree (100,000 files in 1,000 directories), both built
# the same way in the same run. Reports wall time and peak memory as ratios over three rounds.
#   bench/clear_sdcard_bench.sh BUILD_DIR     (BUILD_DIR holds libatcid_lib.a)
set -euo pipefail

src=$(cd "$(dirname "$0")/.." && pwd)
build=$(cd "${1:?usage: $0 BUILD_DIR}" && pwd)
rounds=${ROUNDS:-3}
bin="$build/clear_sdcard_bench"

g++ -std=c++20 -O2 -I"$src" "$src/bench/clear_sdcard_bench.cpp" "$build/libatcid_lib.a" \
  -lz -pthread -o "$bin"

work=$(mktemp -d "${TMPDIR:-/tmp}/clear_sdcard_bench.XXXXXX")
trap 'rm -rf "$work"' EXIT

now() { date +%s%N; }
# Runs a command under /usr/bin/time; prints "<wall seconds> <peak KiB>".
measure() {
  local start end
  start=$(now)
  /usr/bin/time -f %M -o "$work/rss" "$@" >/dev/null
  end=$(now)
  echo "$(( (end - start) / 1000 )) $(cat "$work/rss")"
}

ratios=()
for round in $(seq "$rounds"); do
  rm -rf "$work/a" "$work/b"
  mkdir "$work/a" "$work/b"
  "$bin" build "$work/a"
  "$bin" build "$work/b"
  sync
  read -r rm_us rm_kib < <(measure rm -rf "$work/b/storage/sdcard0")
  read -r clear_us clear_kib < <(measure "$bin" clear "$work/a")
  left=$(find "$work/a/storage/sdcard0" | wc -l)
  ratio=$(awk -v a="$clear_us" -v b="$rm_us" 'BEGIN { printf "%.2f", a / b }')
  ratios+=("$ratio")
  printf 'round %d: rm -rf %.3f s %d KiB | clear_sdcard %.3f s %d KiB (%d entries kept) | time ratio %s, memory ratio %s\n' \
    "$round" "$(awk -v u="$rm_us" 'BEGIN{print u/1e6}')" "$rm_kib" \
    "$(awk -v u="$clear_us" 'BEGIN{print u/1e6}')" "$clear_kib" "$left" "$ratio" \
    "$(awk -v a="$clear_kib" -v b="$rm_kib" 'BEGIN { printf "%.2f", a / b }')"
done
median=$(printf '%s\n' "${ratios[@]}" | sort -n | awk '{ v[NR] = $1 } END { print v[int((NR + 1) / 2)] }')
echo "median time ratio clear_sdcard / rm -rf: $median"
