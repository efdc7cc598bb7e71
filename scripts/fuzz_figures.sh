#!/usr/bin/env bash
# Runs every libFuzzer target in turn for a fixed number of executions (10 million by default,
# one job each) from its starting inputs in fuzz/corpus/<target>/, and writes a table of executions,
# libFuzzer's final coverage (cov: edges, ft: features), the corpus it ended with, wall time and
# crashes to stdout and to $VQM_FUZZ_BUILD_DIR/fuzz-figures.md (or $VQM_FUZZ_FIGURES):
#   bash scripts/fuzz_figures.sh [runs] [target...]
# Targets are named as fuzz/CMakeLists.txt names them (fuzz_sms_pdu ...); all when none is given.
# VQM_FUZZ_RSS_LIMIT_MB raises libFuzzer's memory limit (2048 MB): EDS's vCard parser leaks a
# little on some damaged cards, about 1 GB over a million of them, which the limit would report
# as the target running out of memory.
set -euo pipefail
source "$(dirname "${BASH_SOURCE[0]}")/fuzz_common.sh"
runs=${1:-10000000}
shift || true

vqm_fuzz_build fuzzers
if [ $# -gt 0 ]; then
    targets=("$@")
else
    targets=()
    for target in "$build"/fuzz/fuzz_*; do
        [ -x "$target" ] && targets+=("$(basename "$target")")
    done
fi

work="$build/figures"
table=${VQM_FUZZ_FIGURES:-$build/fuzz-figures.md}
mkdir -p "$work"
{
    echo "| target | executions | exec/s | cov | ft | corpus (units / bytes) | wall time | crashes |"
    echo "|---|---|---|---|---|---|---|---|"
} | tee "$table"
failed=0
for name in "${targets[@]}"; do
    corpus="$work/$name/corpus"
    artifacts="$work/$name/artifacts"
    log="$work/$name/log"
    rm -rf "${work:?}/$name"
    mkdir -p "$corpus" "$artifacts" "$corpora/$name"
    start=$(date +%s%N)
    status=0
    "$build/fuzz/$name" -runs="$runs" -max_len=4096 -print_final_stats=1 \
        -rss_limit_mb="${VQM_FUZZ_RSS_LIMIT_MB:-2048}" \
        -artifact_prefix="$artifacts/" "$corpus" "$corpora/$name" >"$log" 2>&1 || status=$?
    ms=$((($(date +%s%N) - start) / 1000000))
    seconds=$((ms / 1000))
    # The last status line carries the final coverage and corpus ("#N DONE cov: C ft: F corp:
    # U/S ..."); the final stats the executions.
    last=$(grep -E '^#[0-9]+' "$log" | tail -n 1 || true)
    cov=$(sed -nE 's/.* cov: ([0-9]+).*/\1/p' <<<"$last")
    ft=$(sed -nE 's/.* ft: ([0-9]+).*/\1/p' <<<"$last")
    corp=$(sed -nE 's/.* corp: ([0-9]+\/[0-9]+[a-zA-Z]*).*/\1/p' <<<"$last")
    executions=$(sed -nE 's/^stat::number_of_executed_units: ([0-9]+)/\1/p' "$log")
    executions=${executions:-$(sed -nE 's/^#([0-9]+).*/\1/p' <<<"$last")}
    rate=$((${executions:-0} * 1000 / (ms > 0 ? ms : 1)))
    crashes=$(find "$artifacts" -type f | wc -l)
    [ "$status" -ne 0 ] && [ "$crashes" -eq 0 ] && crashes="exit $status"
    [ "$crashes" != 0 ] && failed=1
    printf '| %s | %s | %s | %s | %s | %s | %d min %02d s | %s |\n' "$name" "${executions:-?}" \
        "$rate" "${cov:-?}" "${ft:-?}" "${corp/\// / }" $((seconds / 60)) $((seconds % 60)) \
        "$crashes" | tee -a "$table"
done
echo "table in $table; logs, corpora and any crash in $work"
exit $failed
