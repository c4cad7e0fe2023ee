#!/bin/bash
# The layer check must find an include against the arrows and name it, and pass a tree that has none.
set -euo pipefail
check=$(cd "$(dirname "$0")/../scripts" && pwd)/check-layers
work=$(mktemp -d)
trap 'rm -rf "$work"' EXIT
failed=0

# expect LINE FILE INCLUDE: a tree whose only file holds INCLUDE must give LINE, or pass if LINE is empty.
expect() {
  rm -rf "$work/tree"
  mkdir -p "$work/tree/$(dirname "$2")"
  printf '#include %s\n' "$3" >"$work/tree/$2"
  local output result=0
  output=$("$check" "$work/tree" 2>&1) || result=$?
  if [ -n "$1" ] && { [ "$result" -eq 0 ] || [[ $output != *"$1"* ]]; }; then
    echo "$2 with $3 must be told \"$1\", got: $output"
    failed=1
  elif [ -z "$1" ] && [ "$result" -ne 0 ]; then
    echo "$2 with $3 must pass, got: $output"
    failed=1
  fi
}

expect '' commands/a.cpp '"base/text_log.h"'
expect '' storage/efs/deep/a.h '"kral/types.h"'
expect '' platform/win32/a.cpp '<windows.h>'
expect '' tests/storage/posix/a_test.cpp '<unistd.h>'
expect '' rfcal/band_exports.cpp '"frame/export_call.h"'
expect '' tools/kral/sim/sim_verb.cpp '"handset/virtual_handset.h"'
expect '' tests/a_test.cpp '"download/images/image.h"'
expect '' download/boot/a.cpp '"download/link/failure.h"'
expect 'platform/a.h:1: includes base/x.h: platform/ must not know base/' platform/a.h '"base/x.h"'
expect 'frame/ must not know storage/efs/' frame/a.cpp '"storage/efs/client.h"'
expect 'base/ must not know frame/' base/a.cpp '"frame/diag_ftm.h"'
expect 'storage/nv/ must not know storage/backup/' storage/nv/a.cpp '"storage/backup/jobs.h"'
expect 'download/stream/ must not know download/boot/' download/stream/a.cpp '"download/boot/kivrat.h"'
expect 'handset/line/ must not know transport/line/' handset/line/a.cpp '"transport/line/fcs16.h"'
expect 'tools/kral/fs/ must not know handset/' tools/kral/fs/a.cpp '"handset/virtual_handset.h"'
expect 'rfcal/bands/ must not know frame/' rfcal/bands/a.cpp '"frame/export_call.h"'
expect 'headers of the operating system' transport/line/a.cpp '<windows.h>'
expect 'headers of the operating system' tests/storage/a_test.cpp '<unistd.h>'
expect 'headers of the operating system' tools/kral/a.cpp '<sys/stat.h>'
expect 'paths start at the root' transport/line/a.cpp '"fcs16.h"'
expect '0 includes' frame/none.txt 'nothing'
exit "$failed"
