# Sourced by ./run and ./test: installs what is missing and builds. Says what it does in one line each.
set -euo pipefail
cd "$(dirname "${BASH_SOURCE[0]}")/.."

packages_to_build=(
    g++ cmake ninja-build pkg-config
    qt6-base-dev libgl-dev libegl-dev libepoxy-dev
    libgstreamer1.0-dev libgstreamer-plugins-base1.0-dev libgstrtspserver-1.0-dev
    libavahi-core-dev libglib2.0-dev libpango1.0-dev libsoup-3.0-dev libpulse-dev libsdl2-dev libsystemd-dev libxml2-dev
    libgtest-dev libgmock-dev libbenchmark-dev libx11-dev libxtst-dev libxcb1-dev
    libpng-dev libtiff-dev libjpeg-dev
)
packages_to_run=(
    libgl1-mesa-dri fonts-dejavu-core
    gstreamer1.0-plugins-base gstreamer1.0-plugins-good gstreamer1.0-plugins-bad gstreamer1.0-plugins-ugly
    gstreamer1.0-libav
    qt6-image-formats-plugins
)
# A virtual screen with a window manager, and namespaces, for machines without a display and for tests.
packages_for_screen=(xvfb openbox x11-utils util-linux mount iproute2)
# The suppressions of leaks name functions, which only llvm's symbolizer can tell.
packages_to_test=(clang libclang-rt-dev llvm libegl1 libgl1 x11-xserver-utils dbus-daemon binutils pulseaudio
    pulseaudio-utils)
packages_of_peers=(avahi-daemon avahi-utils dbus ffmpeg mpv picom chromium chromium-driver onvif-tools
    libonvif-dev)
# Clients that are published for Node alone; they go into build/peers.
node_packages_of_peers=(onvif@0.8.3)
packages_to_lint=(clang-format clang-tidy git)

# install_packages NAME...: installs those that are missing, as root or with sudo.
install_packages() {
    local missing=() name
    for name in "$@"; do
        dpkg-query -W -f='${Status}' "$name" 2>/dev/null | grep -q 'ok installed' || missing+=("$name")
    done
    [ ${#missing[@]} -gt 0 ] || return 0
    local as_root=()
    if [ "$(id -u)" != 0 ]; then
        if ! command -v sudo >/dev/null; then
            echo "These Debian packages are missing and there is no sudo to install them: ${missing[*]}" >&2
            exit 1
        fi
        as_root=(sudo)
    fi
    echo "Installing ${#missing[@]} Debian packages: ${missing[*]}"
    local log
    log=$(mktemp)
    if ! { "${as_root[@]}" apt-get update &&
        "${as_root[@]}" env DEBIAN_FRONTEND=noninteractive \
            apt-get install -y --no-install-recommends "${missing[@]}"; } >"$log" 2>&1; then
        tail -n 20 "$log" >&2
        echo "The packages could not be installed; the whole output is in $log" >&2
        exit 1
    fi
    rm -f "$log"
}

# install_node_packages NAME@VERSION...: puts those that are missing into build/peers, and npm where there is none.
install_node_packages() {
    command -v npm >/dev/null || install_packages nodejs npm
    local missing=() package manifest
    for package in "$@"; do
        manifest=build/peers/node_modules/${package%@*}/package.json
        grep -qs "\"version\": \"${package##*@}\"" "$manifest" || missing+=("$package")
    done
    [ ${#missing[@]} -gt 0 ] || return 0
    echo "Installing ${#missing[@]} Node packages: ${missing[*]}"
    mkdir -p build/peers
    if ! npm install --prefix build/peers --no-save --no-package-lock --no-audit --no-fund --ignore-scripts \
        "${missing[@]}" >build/peers/install.log 2>&1; then
        tail -n 20 build/peers/install.log >&2
        echo "The packages could not be installed; the whole output is in build/peers/install.log" >&2
        exit 1
    fi
}

# announce_build PRESET LOG: says that a build is under way once the build tool, whose output it reads, makes something.
announce_build() {
    local line said=no
    while IFS= read -r line; do
        if [ $said = no ] && [[ $line =~ ^\[[0-9]+/[0-9]+\]\ (Building|Linking) ]]; then
            echo "Building '$1' (the log is in $2)"
            said=yes
        fi
    done
}

# set_option PRESET NAME ON|OFF: changes an option of a build that has been configured with another value.
set_option() {
    local cache=build/$1/CMakeCache.txt
    [ ! -e "$cache" ] || grep -q "^$2:BOOL=$3\$" "$cache" || cmake --preset "$1" "-D$2=$3" >/dev/null
}

# build PRESET [TARGET...]: configures where that has not been done and builds what has changed. With QIVO_WERROR=ON in
# the environment warnings are errors; without it a build stays what it was.
build() {
    local preset=$1 targets=() log=build/$1.log werror=${QIVO_WERROR:-}
    shift
    [ $# -eq 0 ] || targets=(--target "$@")
    mkdir -p build
    [ -z "$werror" ] || set_option "$preset" QIVO_WERROR "$werror"
    if [ ! -e "build/$preset/build.ninja" ] &&
        ! cmake --preset "$preset" ${configure_options:-} ${werror:+"-DQIVO_WERROR=$werror"} >"$log" 2>&1; then
        cat "$log" >&2
        echo "Configuring '$preset' failed." >&2
        exit 1
    fi
    if ! cmake --build --preset "$preset" "${targets[@]}" 2>&1 | tee "$log" | announce_build "$preset" "$log"; then
        grep -E 'error|FAILED|warning' -A 5 "$log" | head -n 60 >&2
        echo "Building '$preset' failed; the whole output is in $log" >&2
        exit 1
    fi
}
