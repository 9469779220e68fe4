#!/usr/bin/env bash
# bench.sh [--compare | --baseline] [filter]: builds the benchmarks, runs those whose name matches the regular expression, and
# prints each of ours beside its yardstick. --compare then says which ratios became worse than those of the last release
# (bench/baseline.json), and ends with 1 if any did; --baseline puts the ratios there, which is part of a release.
. "$(dirname "${BASH_SOURCE[0]}")/scripts/common.sh"

baseline=()
case ${1:-} in
--compare) baseline=(--compare bench/baseline.json) && shift ;;
--baseline) baseline=(--write bench/baseline.json) && shift ;;
-*)
    echo "usage: bench.sh [--compare | --baseline] [filter]" >&2
    exit 2
    ;;
esac
filter=${1:-.}
results=build/bench-results

install_packages
step "building the benchmarks"
configure bench build/bench || give_up
build build/bench benchmarks || give_up

rm -rf "$results"
mkdir -p "$results"
for program in build/bench/bin/bench_*; do
    name=$(basename "$program")
    "$program" --benchmark_list_tests --benchmark_filter="$filter" 2>/dev/null | grep -q / || continue
    step "running $name"
    # In turns, so that a busy minute falls on ours and the yardstick alike.
    if ! "$program" --benchmark_filter="$filter" --benchmark_repetitions=3 --benchmark_report_aggregates_only=true \
        --benchmark_enable_random_interleaving=true --benchmark_min_time=0.1 \
        --benchmark_out="$results/$name.json" --benchmark_out_format=json >"$results/$name.log" 2>&1; then
        cat "$results/$name.log"
        give_up
    fi
done

shopt -s nullglob
files=("$results"/*.json)
[ ${#files[@]} -eq 0 ] && give_up "No benchmark matches \"$filter\"."
echo
step "comparing the times"
python3 scripts/bench_ratios.py "${baseline[@]}" "${files[@]}" || exit 1
