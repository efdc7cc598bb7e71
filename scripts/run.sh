#!/usr/bin/env bash
# Builds the dialer and the simulated card, starts the card (with its demo SIM on the first
# run) and then the dialer connected to it. Installs missing Debian packages first.
# On a machine without a display the dialer runs on a virtual X display that a VNC viewer on
# this machine can show (127.0.0.1 only); the script says where.
#   VQM_BUILD_DIR   build folder (default: build)
#   VQM_VNC_PORT    VNC port when there is no display (default: the first free from 5900)
set -euo pipefail
top=$(cd "$(dirname "${BASH_SOURCE[0]}")/.." && pwd)
build=${VQM_BUILD_DIR:-$top/build}

source "$top/scripts/packages.sh"
headless=0
if [ -z "${DISPLAY:-}" ] && [ -z "${WAYLAND_DISPLAY:-}" ]; then headless=1; fi
extra=()
[ $headless = 1 ] && extra+=(xvfb x11vnc)
vqm_ensure_packages "${VQM_PACKAGES[@]}" ${extra[@]+"${extra[@]}"}

cmake -S "$top" -B "$build" -G Ninja >/dev/null
cmake --build "$build" --parallel "$(nproc)" --target vqm-dialer vqm-cardsim vqm-settings
dialer=$build/shell/vqm-dialer
cardsim=$build/cardsim/vqm-cardsim
settings=$build/tools/vqm-settings

# The simulated card's identity is what finds its port; keep a user's own choice.
"$settings" get PnpId >/dev/null 2>&1 || "$settings" set PnpId TAVRO_CARD_PHONE --str

pids=()
cleanup() {
    # Children first: the dialer runs under dbus-run-session when the session has no bus.
    for pid in ${pids[@]+"${pids[@]}"}; do
        pkill -TERM -P "$pid" 2>/dev/null || true
        kill "$pid" 2>/dev/null || true
    done
    wait 2>/dev/null || true
}
trap cleanup EXIT INT TERM

state=${XDG_STATE_HOME:-$HOME/.local/state}/VQMFull
mkdir -p "$state"
if "$cardsim" ctl status >/dev/null 2>&1; then
    echo "Using the simulated card that is already running."
else
    "$cardsim" >"$state/cardsim.log" 2>&1 &
    pids+=($!)
    for _ in $(seq 50); do "$cardsim" ctl status >/dev/null 2>&1 && break; sleep 0.1; done
    echo "Simulated card started (log: $state/cardsim.log)."
fi
echo "Play the network side from another shell, e.g.:"
echo "  $cardsim ctl ring +447700900123      (an incoming call)"
echo "  $cardsim ctl pull                    (take the card out)"

if [ $headless = 1 ]; then
    display=:$(( 90 + RANDOM % 100 ))
    while [ -e "/tmp/.X11-unix/X${display#:}" ]; do display=:$(( ${display#:} + 1 )); done
    Xvfb "$display" -screen 0 240x320x24 -nolisten tcp >/dev/null 2>&1 &
    pids+=($!)
    port=${VQM_VNC_PORT:-5900}
    while ss -ltn 2>/dev/null | grep -q ":$port "; do port=$((port + 1)); done
    for _ in $(seq 50); do [ -e "/tmp/.X11-unix/X${display#:}" ] && break; sleep 0.1; done
    x11vnc -display "$display" -localhost -rfbport "$port" -forever -shared -nopw -quiet \
        >/dev/null 2>&1 &
    pids+=($!)
    export DISPLAY=$display
    echo "No display here: the dialer is on a virtual display served by VNC at 127.0.0.1:$port."
    echo "View it from this machine with a VNC viewer, e.g.  gvncviewer 127.0.0.1::$port"
    echo "(or tunnel it: ssh -L $port:127.0.0.1:$port this-machine, then view localhost::$port)."
fi

echo "Starting the dialer; close it (File > Exit) or press Ctrl-C to stop everything."
# Notifications need a session bus; a bare console has none, so give the dialer its own.
runner=()
[ -z "${DBUS_SESSION_BUS_ADDRESS:-}" ] && runner=(dbus-run-session --)
# In the background and waited for, so that a stop sent to this script ends everything at once.
${runner[@]+"${runner[@]}"} "$dialer" "$@" &
dialer_pid=$!
pids+=("$dialer_pid")
wait "$dialer_pid"
