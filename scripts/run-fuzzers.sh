#!/usr/bin/env bash
# Runs each fuzz target of a fuzz build for a bounded time, on a scratch copy of its seed
# corpus (the committed corpus only grows by hand, with the inputs of fixed crashes).
set -euo pipefail
build=$1
seconds=${2:-60}
root=$(cd "$(dirname "$0")/.." && pwd)
status=0
for target in "$build"/tests/fuzz/fuzz_*; do
  [ -x "$target" ] || continue
  name=$(basename "$target")
  corpus="$root/tests/fuzz/corpus/${name#fuzz_}"
  work=$(mktemp -d)
  cp -r "$corpus"/. "$work"/ 2>/dev/null || true
  echo "== $name for ${seconds}s"
  if ! "$target" -max_total_time="$seconds" -rss_limit_mb=2048 -timeout=30 \
       -artifact_prefix="$build/$name-" "$work" > "$build/$name.log" 2>&1; then
    echo "$name FAILED; see $build/$name.log"; tail -n 40 "$build/$name.log"; status=1
  else
    grep -E '^(#[0-9]+.*DONE|Done)' "$build/$name.log" | tail -n 1 || true
  fi
  rm -rf "$work"
done
exit $status
