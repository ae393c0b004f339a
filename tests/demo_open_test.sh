#!/usr/bin/env bash
# A newcomer's road from the demo to the backend: the demo saves its two outputs in a scratch
# folder and prints the tessel_open commands that open them; each command, run from the source
# root exactly as printed, must exit 0 and report "password: match".
# Usage: demo_open_test.sh TESSEL_DEMO SOURCE_DIR
set -euo pipefail
work=$(mktemp -d)
trap 'rm -rf "$work"' EXIT
fail() { cat "$work/demo.txt"; echo "FAIL $1"; exit 1; }
"$1" --out "$work" >"$work/demo.txt" 2>&1 || fail "the demo exited non-zero"
mapfile -t commands < <(grep -E '^  [^ ]*tessel_open ' "$work/demo.txt")
[ "${#commands[@]}" -eq 2 ] || fail "expected 2 tessel_open commands, found ${#commands[@]}"
cd "$2"
for command in "${commands[@]}"; do
  echo "\$ $command"
  out=$(bash -c "$command") || fail "exit status $? from: $command"
  echo "$out"
  grep -qx 'password: match' <<<"$out" || fail "no 'password: match' from: $command"
done
