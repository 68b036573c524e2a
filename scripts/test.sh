#!/usr/bin/env bash
# The test command: sets up a fresh machine, builds with tests and runs ctest.
#   scripts/test.sh                    normal build in build/
#   SARN_SANITIZE=ON scripts/test.sh   ASan+UBSan build in build-sanitize/
set -euo pipefail
top=$(cd "$(dirname "$0")/.." && pwd)
"$top/scripts/setup.sh"
if [ "${SARN_SANITIZE:-OFF}" = "ON" ]; then
  dir="$top/build-sanitize"
  "$top/scripts/build.sh" "$dir" -DCMAKE_BUILD_TYPE=Debug -DSARN_SANITIZE=ON -DSARN_BUILD_TESTS=ON
  export ASAN_OPTIONS=detect_leaks=1:abort_on_error=1
  export UBSAN_OPTIONS=print_stacktrace=1:halt_on_error=1
else
  dir="$top/build"
  "$top/scripts/build.sh" "$dir" -DSARN_BUILD_TESTS=ON -DSARN_BUILD_EXAMPLES=ON
fi
ctest --test-dir "$dir" --output-on-failure -j "$(nproc)"
