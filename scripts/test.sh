#!/usr/bin/env bash
# Builds everything and runs every test through CTest.
# Installs missing Debian packages first; a second run only rebuilds what changed.
#   VQM_BUILD_DIR   build folder (default: build)
#   VQM_SANITIZE    "address,undefined" or "thread" for a sanitizer build
#   VQM_TEST_TARGETS  build only these test programs and run only their tests (CI's sanitizer
#                   stages); the tests that drive the built programs (label "program") are left out
set -euo pipefail
top=$(cd "$(dirname "${BASH_SOURCE[0]}")/.." && pwd)
build=${VQM_BUILD_DIR:-$top/build}
sanitize=${VQM_SANITIZE:-}

source "$top/scripts/packages.sh"
vqm_ensure_packages "${VQM_PACKAGES[@]}"

# Sanitizer builds are for the tests alone: no benchmark programs.
bench=ON
[ -n "$sanitize" ] && bench=OFF
cmake -S "$top" -B "$build" -G Ninja -DVQM_SANITIZE="$sanitize" -DVQM_BUILD_BENCH="$bench" >/dev/null
filter=()
if [ -n "${VQM_TEST_TARGETS:-}" ]; then
    # shellcheck disable=SC2086  # a list of target names
    cmake --build "$build" --parallel "$(nproc)" --target ${VQM_TEST_TARGETS}
    filter=(-E '_NOT_BUILT$' -LE program)
else
    cmake --build "$build" --parallel "$(nproc)"
fi
if [ "$sanitize" = thread ]; then
    export TSAN_OPTIONS="suppressions=$top/scripts/tsan.supp ${TSAN_OPTIONS:-}"
fi
# The Modem page writes the data-call command wherever a window is built: the tests keep it out
# of the user's own configuration.
export XDG_CONFIG_HOME="$build/test-home/config" VQM_WVDIAL_CONF="$build/test-home/wvdialrc"
mkdir -p "$XDG_CONFIG_HOME"
# Most tests wait on the simulated card's line (a reply ends after 200 ms of silence), so twice
# as many run at once as there are cores.
ctest --test-dir "$build" --output-on-failure --parallel "$(( $(nproc) * 2 ))" "${filter[@]}"
