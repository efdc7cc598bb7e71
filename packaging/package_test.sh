#!/usr/bin/env bash
# Builds the Debian package from a configured build folder, installs it with dpkg -i into a
# scratch root that has a dpkg database of its own (never into the machine), runs the programs
# installed there and checks the package with lintian.
#   package_test.sh BUILD_DIR [SANITIZE]
# Exits 77 (CTest: skipped) in a sanitizer build: its package would hold sanitizer-built
# programs, and stripping and checking them only makes those CI builds slower.
set -euo pipefail
build=$1
sanitize=${2:-}
if [ -n "$sanitize" ]; then
    echo "skipped: a sanitizer build ($sanitize) is not packaged"
    exit 77
fi
for tool in dpkg dpkg-deb dpkg-shlibdeps apt-get lintian help2man; do
    command -v "$tool" >/dev/null || { echo "missing $tool (scripts/packages.sh lists it)"; exit 1; }
done

scratch=$(mktemp -d /tmp/vqm-package-XXXXXX)
trap 'rm -rf "$scratch"' EXIT
# What `cmake --build BUILD --target package` does after building everything; the tests run
# after the build, so CPack is run straight away, and its package goes to the scratch folder.
cpack --config "$build/CPackConfig.cmake" -B "$scratch/package" >"$scratch/cpack.log" 2>&1 ||
    { cat "$scratch/cpack.log"; exit 1; }
deb=$(ls "$scratch"/package/vqm-dialer_*.deb)
echo "package: $(basename "$deb")"

fail=0
check() {  # check DESCRIPTION COMMAND...
    if "${@:2}" >"$scratch/out" 2>&1; then
        echo "ok: $1"
    else
        echo "FAILED: $1"; cat "$scratch/out"; fail=1
    fi
}

# dpkg -i into the scratch root, with an empty database of its own there: dpkg unpacks,
# records and configures the package as on a machine that never had it. The root holds none
# of the libraries, so the dependencies are left to the check below (--force-depends); any
# maintainer script would run outside a chroot (--force-script-chrootless), which needs no
# root. --root is never left out: the test may run as root.
root=$scratch/root
admin=$root/var/lib/dpkg
mkdir -p "$admin/info" "$admin/updates" "$admin/triggers"
touch "$admin/status" "$admin/available"
scratch_dpkg() {
    # dpkg looks for ldconfig and start-stop-daemon in PATH before it installs anything.
    PATH=/usr/local/sbin:/usr/sbin:/sbin:$PATH dpkg --root="$root" --admindir="$admin" \
        --log="$scratch/dpkg.log" --force-not-root --force-script-chrootless "$@"
}
if ! scratch_dpkg --force-depends -i "$deb" >"$scratch/dpkg.out" 2>&1; then
    echo "FAILED: dpkg -i into the scratch root"; cat "$scratch/dpkg.out"; exit 1
fi
echo "ok: dpkg -i into the scratch root"
check "dpkg records the package as installed" grep -qx 'install ok installed' \
    <(dpkg-query --admindir="$admin" -W -f='${Status}\n' vqm-dialer)
check "dpkg lists /usr/bin/vqm-phone as the package's" \
    grep -qx '/usr/bin/vqm-phone' <(dpkg-query --admindir="$admin" -L vqm-dialer)

# The dependencies dpkg-shlibdeps wrote can be met on this machine's Debian: apt resolves the
# package against the packages installed and the archive's lists, and only simulates (no lock
# taken and no cache file written, even as root).
if apt-get install --simulate --no-install-recommends -q -o Debug::NoLocking=true \
    -o Dir::Cache::pkgcache= -o Dir::Cache::srcpkgcache= "$deb" >"$scratch/apt.out" 2>&1 &&
    grep -q '^Inst vqm-dialer ' "$scratch/apt.out"; then
    echo "ok: apt can meet the dependencies: $(dpkg-deb -f "$deb" Depends)"
else
    echo "FAILED: apt cannot meet the dependencies"; cat "$scratch/apt.out"; fail=1
fi

# The programs as installed, on the machine's own libraries.
check "vqm-dialer --version" grep -qx 'vqm-dialer 2.01' <("$root/usr/bin/vqm-dialer" --version)
check "vqm-phone --help" grep -q '^Usage: vqm-phone' <("$root/usr/bin/vqm-phone" --help)
for program in vqm-dialer vqm-cardsim vqm-settings vqm-phone vqm-commander; do
    check "$program in /usr/bin" test -x "$root/usr/bin/$program"
    check "$program man page" test -s "$root/usr/share/man/man1/$program.1.gz"
done
check "desktop entry" grep -q '^Exec=vqm-dialer$' "$root/usr/share/applications/vqm-dialer.desktop"
check "icon" test -s "$root/usr/share/icons/hicolor/scalable/apps/vqm-dialer.svg"
check "card manager's user service" grep -q '^ExecStart=/usr/bin/vqm-commander$' \
    "$root/usr/lib/systemd/user/vqm-commander.service"
check "nothing but the package's own files" test -z "$(find "$root/usr" -name '*.a' -o -name '*.h')"
check "dependencies from dpkg-shlibdeps" grep -q 'libqt6widgets6' <(dpkg-deb -f "$deb" Depends)

# lintian: an error tag fails the test, and so does lintian failing on its own (exit 1: it
# checked nothing); warnings are shown. --fail-on error makes an error tag exit 2.
lintian_code=0
lintian --fail-on error --tag-display-limit 0 "$deb" >"$scratch/lintian" 2>&1 || lintian_code=$?
cat "$scratch/lintian"
if [ "$lintian_code" -ne 0 ] && [ "$lintian_code" -ne 2 ]; then
    echo "FAILED: lintian did not run (exit $lintian_code)"; fail=1
elif [ "$lintian_code" -eq 2 ] || grep -q '^E: ' "$scratch/lintian"; then
    echo "FAILED: lintian reports errors"; fail=1
else
    echo "ok: lintian reports no errors"
fi
exit $fail
