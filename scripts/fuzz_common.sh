# Sourced by the fuzz scripts: the clang build of the libFuzzer targets (address and undefined
# sanitizers) in $VQM_FUZZ_BUILD_DIR (build-fuzz by default), and where the starting inputs are kept.
top=$(cd "$(dirname "${BASH_SOURCE[0]}")/.." && pwd)
build=${VQM_FUZZ_BUILD_DIR:-$top/build-fuzz}
corpora=$top/fuzz/corpus

source "$top/scripts/packages.sh"

# vqm_fuzz_build <cmake targets...>
vqm_fuzz_build() {
    vqm_ensure_packages "${VQM_PACKAGES[@]}" clang libclang-rt-14-dev
    CC=clang CXX=clang++ cmake -S "$top" -B "$build" -G Ninja -DVQM_FUZZ=ON -DVQM_BUILD_TESTS=OFF \
        -DVQM_SANITIZE=address,undefined -DCMAKE_CXX_FLAGS=-fsanitize=fuzzer-no-link >/dev/null
    cmake --build "$build" --parallel "$(nproc)" --target "$@"
}
