#!/usr/bin/env bash
# Builds the libFuzzer targets with clang (address and undefined sanitizers) and runs each for a
# bounded time: `bash scripts/fuzz.sh` (20 s each; CI gives each 10 s) or `bash scripts/fuzz.sh 600`.
# Each starts from its starting inputs in fuzz/corpus/<target>/ and keeps what it finds in the build folder
# ($VQM_FUZZ_BUILD_DIR, build-fuzz by default).
set -euo pipefail
source "$(dirname "${BASH_SOURCE[0]}")/fuzz_common.sh"
seconds=${1:-20}

vqm_fuzz_build fuzzers
for target in "$build"/fuzz/fuzz_*; do
    [ -x "$target" ] || continue
    name=$(basename "$target")
    corpus="$build/corpus/$name"
    mkdir -p "$corpus" "$corpora/$name"
    echo "fuzzing $name for ${seconds}s"
    "$target" -max_total_time="$seconds" -max_len=4096 -print_final_stats=0 "$corpus" \
        "$corpora/$name" 2>&1 | tail -n 2
done
