#!/usr/bin/env bash
# Runs each fuzz target of a fuzz build for a bounded time, on a scratch copy of its seed
# corpus (the committed corpus only grows by hand, with the inputs of fixed crashes).
set -euo pipefail
build=$1
seconds=${2:-60}
root=$(cd "$(dirname "$0")/.." && pwd)
# A report of undefined behaviour is a crash like any other.
export UBSAN_OPTIONS=${UBSAN_OPTIONS:-print_stacktrace=1:halt_on_error=1}
# OpenCV reads its decoder bounds once, when it is loaded, so they are set here: a forged
# header may ask for at most 2^18 pixels, which even at 512 samples of 8 bytes per pixel
# (1 GiB) stays within the fuzzers' 2 GiB. (OpenCV bounds pixels, not samples.)
export OPENCV_IO_MAX_IMAGE_PIXELS=${OPENCV_IO_MAX_IMAGE_PIXELS:-262144}
status=0
found=0
for target in "$build"/tests/fuzz/fuzz_*; do
  [ -x "$target" ] || continue
  found=$((found + 1))
  name=$(basename "$target")
  corpus="$root/tests/fuzz/corpus/${name#fuzz_}"
  work=$(mktemp -d)
  cp -r "$corpus"/. "$work"/ 2>/dev/null || true
  options=()
  # The targets that read request texts start from the documents' keys and values.
  [ "$name" = fuzz_image ] || options+=("-dict=$root/tests/fuzz/json.dict")
  echo "== $name for ${seconds}s"
  # -close_fd_mask=1: the library's log on standard output would only fill the log file.
  if ! "$target" -max_total_time="$seconds" -rss_limit_mb=2048 -timeout=30 -close_fd_mask=1 \
       "${options[@]}" -artifact_prefix="$build/$name-" "$work" > "$build/$name.log" 2>&1; then
    echo "$name FAILED; see $build/$name.log"; tail -n 60 "$build/$name.log"; status=1
  else
    grep -E '^(#[0-9]+.*DONE|Done)' "$build/$name.log" | tail -n 1 || true
  fi
  rm -rf "$work"
done
if [ "$found" -eq 0 ]; then
  echo "no fuzz target in $build/tests/fuzz"; status=1
fi
exit $status
