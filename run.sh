#!/usr/bin/env bash
# Quick start on Debian 12 (as root, or with sudo):
#   ./run.sh demo [URL]     build the library and run the demo under Wine: it fetches a sample
#                           site from a local server, or URL, with a progress bar and the trace on
#   ./run.sh test           build everything, run every test, then fuzz 20 s each (what CI runs)
#   ./run.sh fuzz [seconds] build the native fuzz targets and run each (default 20 s)
#   ./run.sh bench [name]   build and run the benchmarks (all, or bench/<name>_bench)
#   ./run.sh soak [count]   build and run the soak of the HTTP client: count requests (10,000)
#                           against the local servers, printing handles and private memory
# Each command first installs the Debian packages it needs when they are missing.
set -euo pipefail
cd "$(dirname "$0")"

packages=(cmake ninja-build g++-mingw-w64-x86-64-posix wine wine64 libgnutls30 python3 openssl googletest
    clang-14 libclang-rt-14-dev)

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

# Each fuzzer runs for $1 seconds on a fresh copy of its seed corpus (what it finds stays in
# build/fuzz/run, never in fuzz/corpus). Any crash, broken check, time-out or memory blow-up fails.
fuzz() {
    local seconds=$1 status=0 program name work dictionary
    cmake -S fuzz -B build/fuzz -G Ninja -DCMAKE_CXX_COMPILER=clang++-14 >/dev/null
    cmake --build build/fuzz
    for program in build/fuzz/*_fuzz; do
        name=$(basename "$program" _fuzz)
        work=build/fuzz/run/$name
        rm -rf "$work"
        mkdir -p "$work/corpus" "$work/findings"
        cp fuzz/corpus/"$name"/* "$work/corpus/"
        dictionary=()
        [ -f fuzz/"$name".dict ] && dictionary=(-dict=fuzz/"$name".dict)
        echo "== $name: $seconds s"
        if "$program" "${dictionary[@]}" -max_total_time="$seconds" -timeout=10 -rss_limit_mb=2048 \
            -artifact_prefix="$work/findings/" "$work/corpus" >"$work/log" 2>&1; then
            grep -E '^#[0-9]+.*DONE|^Done' "$work/log"
        else
            tail -n 40 "$work/log"
            echo "$name: finding in $work/findings" >&2
            status=1
        fi
    done
    return $status
}

case "${1:-}" in
demo)
    install_missing
    build --target kelvra_demo
    state=build/mingw/demo
    url=${2:-}
    if [ -z "$url" ]; then
        # The sample site: a local server stopped by its process id however the demo ends.
        python3 tests/support/http_server.py start "$state"
        trap 'python3 tests/support/http_server.py stop "$state"' EXIT
        url="http://127.0.0.1:$(cat "$state/http_server.port")/site"
    fi
    mkdir -p "$state"
    "$wine_run" build/mingw/bin/kelvra_demo.exe "$url" "Z:$PWD/$state/body.bin"
    echo "(on this machine: the body is $PWD/$state/body.bin, c:\\keltrace is" \
        "$PWD/build/mingw/wineprefix/drive_c/keltrace)"
    ;;
test)
    install_missing
    cmake --workflow --preset mingw
    fuzz 20
    ;;
fuzz)
    install_missing
    fuzz "${2:-20}"
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
soak)
    install_missing
    build --target http_soak
    # The servers write their ports where the test programs look for them.
    state=build/mingw/tests/data
    python3 tests/support/http_server.py start "$state"
    trap 'python3 tests/support/http_server.py stop "$state"' EXIT
    "$wine_run" build/mingw/bin/http_soak.exe "http://127.0.0.1:$(cat "$state/http_server.port")" \
        "https://127.0.0.1:$(cat "$state/https_server.port")" "${2:-10000}"
    ;;
*)
    sed -n '2,10p' "$0" | sed 's/^# \{0,1\}//'
    exit 2
    ;;
esac
