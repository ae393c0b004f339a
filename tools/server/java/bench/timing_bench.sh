#!/usr/bin/env bash
# The Java opener's timing classes (TimingBench.java) on the 1024- and 2048-bit test keys,
# compiled straight from the sources (no CMake build needed, so tools/perf_table.sh can run it
# from a bench-only build). Prints the C++ timing bench's line format on stdout.
# Usage: tools/server/java/bench/timing_bench.sh   (TESSEL_TIMING_OPENS=N for fewer opens)
set -euo pipefail
root=$(cd "$(dirname "${BASH_SOURCE[0]}")/../../../.." && pwd)
classes=$(mktemp -d)
trap 'rm -rf "$classes"' EXIT
javac --release 17 -nowarn -encoding UTF-8 -d "$classes" "$root"/tools/server/java/com/qn/tessel/server/*.java \
  "$root/tools/server/java/bench/TimingBench.java"
java -cp "$classes" TimingBench "$root/tests/data/dispatch_app_key_1024.pem" "$root/tests/data/dispatch_enc_key_2048.pem"
