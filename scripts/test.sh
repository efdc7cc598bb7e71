#!/usr/bin/env bash
# Builds everything and runs every test through CTest.
# Installs missing Debian packages first; a second run only rebuilds what changed.
#   VQM_BUILD_DIR   build folder (default: build)
#   VQM_SANITIZE    "address,undefined" or "thread" for a sanitizer build
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
cmake --build "$build" --parallel "$(nproc)"
if [ "$sanitize" = thread ]; then
    export TSAN_OPTIONS="suppressions=$top/scripts/tsan.supp ${TSAN_OPTIONS:-}"
fi
# The Modem page writes the data-call command wherever a window is built: the tests keep it out
# of the user's own configuration.
export XDG_CONFIG_HOME="$build/test-home/config" VQM_WVDIAL_CONF="$build/test-home/wvdialrc"
mkdir -p "$XDG_CONFIG_HOME"
# Most tests wait on the simulated card's line (a reply ends after 200 ms of silence), so twice
# as many run at once as there are cores.
ctest --test-dir "$build" --output-on-failure --parallel "$(( $(nproc) * 2 ))"
