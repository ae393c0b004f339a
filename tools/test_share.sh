#!/usr/bin/env bash
# Lines of the test suites against lines of the code they test, at a commit (default HEAD):
# tests/ (code, CMake, scripts; not tests/data) over src/ tools/ bench/ fuzz/ java/.
# The project keeps the share at 35% or below.
set -euo pipefail
cd "$(dirname "${BASH_SOURCE[0]}")/.."
rev=${1:-HEAD}
count() {
  git ls-tree -r --name-only "$rev" -- "$@" | grep -v '^tests/data/' |
    grep -E '(\.(cpp|h|S|cmake|sh|py|java|supp)|CMakeLists\.txt)$' |
    while read -r f; do git show "$rev:$f" | wc -l; done | awk '{s += $1} END {print s + 0}'
}
tests=$(count tests)
code=$(count src tools bench fuzz java)
awk -v t="$tests" -v c="$code" 'BEGIN { printf "tests %d, code %d: %.1f%%\n", t, c, 100 * t / c }'
