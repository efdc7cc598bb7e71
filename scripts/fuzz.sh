#!/usr/bin/env bash
# Builds the libFuzzer targets with clang (address and undefined sanitizers) and runs each for a
# bounded time: `bash scripts/fuzz.sh` (20 s each; CI gives each 10 s) or `bash scripts/fuzz.sh 600`.
set -euo pipefail
top=$(cd "$(dirname "${BASH_SOURCE[0]}")/.." && pwd)
seconds=${1:-20}
build=${VQM_FUZZ_BUILD_DIR:-$top/build-fuzz}

source "$top/scripts/packages.sh"
vqm_ensure_packages "${VQM_PACKAGES[@]}" clang libclang-rt-14-dev

CC=clang CXX=clang++ cmake -S "$top" -B "$build" -G Ninja -DVQM_FUZZ=ON -DVQM_BUILD_TESTS=OFF \
    -DVQM_SANITIZE=address,undefined -DCMAKE_CXX_FLAGS=-fsanitize=fuzzer-no-link >/dev/null
cmake --build "$build" --parallel "$(nproc)" --target fuzzers
for target in "$build"/fuzz/fuzz_*; do
    [ -x "$target" ] || continue
    name=$(basename "$target")
    corpus="$build/corpus/$name"
    mkdir -p "$corpus"
    echo "fuzzing $name for ${seconds}s"
    "$target" -max_total_time="$seconds" -max_len=4096 -print_final_stats=0 "$corpus" 2>&1 | tail -n 2
done
