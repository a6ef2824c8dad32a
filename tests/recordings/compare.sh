#!/usr/bin/env bash
# SPDX-License-Identifier: Apache-2.0
# usage: compare.sh PLAYER NAME
# Plays NAME.in with kestsim_play and compares what came of it with NAME.expected. Prints the
# difference and exits with another status than 0 when there is one.
set -euo pipefail
player=$1
CDPATH='' cd "$(dirname "$0")"
"$player" "$2.in" | diff -u --label "$2.expected" --label "as played now" "$2.expected" - || {
    echo "When this is meant to change: scripts/recordings $2, and say why in the commit." >&2
    exit 1
}
