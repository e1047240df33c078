#!/usr/bin/env bash
# Installs what the build needs on Debian 12 (only when something is missing) and builds Release
# into build/ (or $TESSEL_BUILD_DIR). Safe to run again: a second run only rebuilds what changed.
set -euo pipefail
cd "$(dirname "$0")/.."

PACKAGES=(
    build-essential cmake ninja-build pkg-config python3 git
    libopenimageio-dev openimageio-tools libimath-dev
    qt6-base-dev qt6-tools-dev qt6-tools-dev-tools libqt6opengl6-dev libxkbcommon-dev libgl-dev
    libgtest-dev libgmock-dev libbenchmark-dev nlohmann-json3-dev libcli11-dev libpugixml-dev
    glslang-tools xvfb xauth fonts-dejavu-core
)

missing=()
for p in "${PACKAGES[@]}"; do
    dpkg-query -W -f='${Status}' "$p" 2>/dev/null | grep -q "install ok installed" || missing+=("$p")
done
if [ ${#missing[@]} -gt 0 ]; then
    echo "setup: installing ${missing[*]}"
    SUDO=""
    [ "$(id -u)" -eq 0 ] || SUDO="sudo"
    $SUDO apt-get update
    DEBIAN_FRONTEND=noninteractive $SUDO apt-get install -y --no-install-recommends "${missing[@]}"
fi

# Debian's OpenImageIO CMake config lists this folder even without OpenCV.
if [ ! -d /usr/include/opencv4 ]; then
    SUDO=""
    [ "$(id -u)" -eq 0 ] || SUDO="sudo"
    $SUDO mkdir -p /usr/include/opencv4
fi

BUILD_DIR=${TESSEL_BUILD_DIR:-build}
JOBS=${TESSEL_JOBS:-$(nproc)}
cmake -S . -B "$BUILD_DIR" -G Ninja -DCMAKE_BUILD_TYPE=Release ${TESSEL_CMAKE_ARGS:-}
cmake --build "$BUILD_DIR" -j "$JOBS"
