#!/usr/bin/env bash
# The main job: sets up a fresh machine, builds the library and runs the demonstration program.
set -euo pipefail
top=$(cd "$(dirname "$0")/.." && pwd)
"$top/scripts/setup.sh"
"$top/scripts/build.sh" "$top/build" -DSARN_BUILD_EXAMPLES=ON
"$top/build/examples/sarn_demo" "$@"
