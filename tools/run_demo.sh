#!/usr/bin/env bash
# Builds the library, the demo and the server-side opener (tessel_open), then runs the road of
# one password. The frames and the two outputs (*.b64) land in build/demo-frames; the demo ends
# with the tessel_open commands that open the outputs from the repository root.
set -euo pipefail
cd "$(dirname "${BASH_SOURCE[0]}")/.."
bash tools/setup/setup.sh
cmake -S . -B build -G Ninja -DCMAKE_BUILD_TYPE=Release >/dev/null
cmake --build build -j"${TESSEL_JOBS:-2}" --target tessel_demo tessel_open
./build/tools/demo/tessel_demo --out build/demo-frames "$@"
