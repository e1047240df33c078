#!/usr/bin/env bash
# Sets up and builds when needed, then runs the CLI's default job and says where its result is.
set -euo pipefail
cd "$(dirname "$0")/.."
scripts/setup.sh
BUILD_DIR=${TESSEL_BUILD_DIR:-build}
mkdir -p out
"$BUILD_DIR"/bin/tessel default --output-dir out
