#!/usr/bin/env bash
# The main job: sets up a fresh machine, builds everything (library, tools, examples) and decodes
# the sample capture with the sarn tool. Extra arguments go to `sarn decode` (e.g. --untyped).
set -euo pipefail
top=$(cd "$(dirname "$0")/.." && pwd)
"$top/scripts/setup.sh"
"$top/scripts/build.sh" "$top/build" -DSARN_BUILD_EXAMPLES=ON -DSARN_BUILD_TOOLS=ON
"$top/build/bin/sarn" decode "$@" "$top/examples/data/session.mrpc"
