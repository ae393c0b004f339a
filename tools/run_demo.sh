#!/usr/bin/env bash
# Builds the library and the demo, then runs the road of one password.
set -euo pipefail
cd "$(dirname "${BASH_SOURCE[0]}")/.."
bash tools/setup/setup.sh
cmake -S . -B build -G Ninja -DCMAKE_BUILD_TYPE=Release >/dev/null
cmake --build build -j"${TESSEL_JOBS:-2}" --target tessel_demo
./build/tools/demo/tessel_demo --out build/demo-frames "$@"
