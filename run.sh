#!/usr/bin/env bash
# Quick start on Debian 12 (as root, or with sudo):
#   ./run.sh demo           build the library and run the demo program under Wine
#   ./run.sh test           build everything and run every test (what CI runs)
#   ./run.sh bench [name]   build and run the benchmarks (all, or bench/<name>_bench)
# Each command first installs the Debian packages it needs when they are missing.
set -euo pipefail
cd "$(dirname "$0")"

packages=(cmake ninja-build g++-mingw-w64-x86-64-posix wine wine64 libgnutls30 python3 googletest)

as_root() {
    if [ "$(id -u)" -eq 0 ]; then "$@"; else sudo "$@"; fi
}

install_missing() {
    local missing=() package
    for package in "${packages[@]}"; do
        dpkg-query -W -f='${Status}' "$package" 2>/dev/null | grep -q 'install ok installed' || missing+=("$package")
    done
    if [ ${#missing[@]} -gt 0 ]; then
        echo "Installing: ${missing[*]}"
        as_root apt-get update -qq
        as_root env DEBIAN_FRONTEND=noninteractive apt-get install -y -qq --no-install-recommends "${missing[@]}"
    fi
}

build() {
    cmake --preset mingw >/dev/null
    cmake --build --preset mingw "$@"
}

wine_run=build/mingw/wine-run

case "${1:-}" in
demo)
    install_missing
    build --target kelvra_demo
    "$wine_run" build/mingw/bin/kelvra_demo.exe
    ;;
test)
    install_missing
    cmake --workflow --preset mingw
    ;;
bench)
    install_missing
    build
    "$wine_run" --start
    trap '"$wine_run" --stop' EXIT
    status=0
    for program in build/mingw/bin/${2:-*}_bench.exe; do
        echo "== $(basename "$program" .exe)"
        "$wine_run" "$program" || status=1
    done
    exit $status
    ;;
*)
    sed -n '2,6p' "$0" | sed 's/^# \{0,1\}//'
    exit 2
    ;;
esac
