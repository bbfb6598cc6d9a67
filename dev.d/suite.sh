#!/bin/bash
# One suite of "./dev test", as a process of its own so that it can be ended as a whole: suite.sh NAME.
set -euo pipefail

ROOT=$(cd -- "$(dirname -- "${BASH_SOURCE[0]}")/.." && pwd -P)
SUITE=$1
# shellcheck disable=SC2034 # names the log
COMMAND=$1
for file in common packages sources cmake stage suites; do
    # shellcheck source=/dev/null
    . "$ROOT/dev.d/$file.sh"
done
RESULT=$LOGS/$SUITE.result

cd -- "$ROOT"
start_log
rm -f -- "$RESULT"
"suite_$SUITE"
