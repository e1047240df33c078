#!/usr/bin/env bash
# Sets up and builds when needed, then runs the whole test suite with CTest.
set -euo pipefail
cd "$(dirname "$0")/.."
scripts/setup.sh
BUILD_DIR=${TESSEL_BUILD_DIR:-build}
export QT_QPA_PLATFORM=${QT_QPA_PLATFORM:-offscreen}
ctest --test-dir "$BUILD_DIR" --output-on-failure -j "${TESSEL_JOBS:-$(nproc)}" "$@"

# The shading runtime's threading tests under ThreadSanitizer, in a build folder of their own
# (only the threading tests and the libraries they need are built). TESSEL_TSAN=0 skips this step.
if [ "${TESSEL_TSAN:-1}" != "0" ]; then
    TSAN_DIR="${BUILD_DIR}-tsan"
    cmake -S . -B "$TSAN_DIR" -G Ninja -DCMAKE_BUILD_TYPE=RelWithDebInfo -DTESSEL_SANITIZE=thread \
        -DTESSEL_BUILD_BENCH=OFF ${TESSEL_CMAKE_ARGS:-} > /dev/null
    cmake --build "$TSAN_DIR" --target osl_concurrency_tests -j "${TESSEL_JOBS:-$(nproc)}"
    TSAN_OPTIONS="halt_on_error=1 second_deadlock_stack=1 ${TSAN_OPTIONS:-}" \
        "$TSAN_DIR/bin/osl_concurrency_tests"
fi
