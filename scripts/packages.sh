# Debian packages the build and the tests need; sourced by the set-up scripts.
VQM_PACKAGES=(
    build-essential cmake ninja-build pkg-config
    libgtest-dev libgmock-dev libbenchmark-dev
    libsqlite3-dev sqlite3
    qt6-base-dev qt6-multimedia-dev qt6-qpa-plugins libx11-dev libxext-dev dbus
    clang-format gammu libgammu-dev
    libebook-contacts-1.2-4 libebook-1.2-21 evolution-data-server
    help2man lintian python3
)

# Installs whatever of the list is missing; nothing is fetched when all is there.
vqm_ensure_packages() {
    local missing=() p
    for p in "$@"; do
        if ! dpkg-query -W -f='${Status}' "$p" 2>/dev/null | grep -q 'install ok installed'; then
            missing+=("$p")
        fi
    done
    [ ${#missing[@]} -eq 0 ] && return 0
    echo "Installing missing packages: ${missing[*]}"
    local sudo=""
    if [ "$(id -u)" -ne 0 ]; then
        command -v sudo >/dev/null || { echo "Need root or sudo to install: ${missing[*]}" >&2; return 1; }
        sudo="sudo"
    fi
    $sudo env DEBIAN_FRONTEND=noninteractive apt-get update -q
    $sudo env DEBIAN_FRONTEND=noninteractive apt-get install -y -q --no-install-recommends "${missing[@]}"
}
