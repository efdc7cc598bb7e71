#!/usr/bin/env bash
# Builds the Debian package from a configured build folder, unpacks it into a scratch root (never
# into the machine), runs programs from there and checks the package with lintian.
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
for tool in dpkg-deb dpkg-shlibdeps lintian help2man; do
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

dpkg-deb -x "$deb" "$scratch/root"
fail=0
check() {  # check DESCRIPTION COMMAND...
    if "${@:2}" >"$scratch/out" 2>&1; then
        echo "ok: $1"
    else
        echo "FAILED: $1"; cat "$scratch/out"; fail=1
    fi
}
root=$scratch/root
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
check "nothing but the package's own files" test -z "$(find "$root" -name '*.a' -o -name '*.h')"
check "dependencies from dpkg-shlibdeps" grep -q 'libqt6widgets6' <(dpkg-deb -f "$deb" Depends)

# lintian: errors fail the test; warnings are shown.
lintian --tag-display-limit 0 "$deb" >"$scratch/lintian" 2>&1 || true
cat "$scratch/lintian"
if grep -q '^E: ' "$scratch/lintian"; then
    echo "FAILED: lintian reports errors"; fail=1
else
    echo "ok: lintian reports no errors"
fi
exit $fail
