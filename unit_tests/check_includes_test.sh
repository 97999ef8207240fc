#!/bin/sh
# The check of includes finds what is planted, each in a tree of its own, and names the file.
#   check_includes_test.sh CHECK
tree=$(mktemp -d)
trap 'rm -rf "$tree"' EXIT
status=0

# Whether the check refuses FILE in a sound tree once it holds these lines; with "sound" for refuses, that it does not.
expect() {  # refuses|sound FILE LINE...
  expected=$1 file=$2
  shift 2
  rm -rf "$tree"/*
  mkdir -p "$tree/desk/base" "$tree/desk/scenes" "$tree/chart" "$tree/tools" "$tree/$(dirname "$file")"
  echo '#include "desk/base/text.h"' >"$tree/tools/main.cpp"
  echo '#include <string>' >"$tree/desk/base/text.h"
  echo '#include "chart/points.h"' >"$tree/chart/upright.h"
  printf '%s\n' "$@" >"$tree/$file"
  said=$("$check" "$tree" 2>&1)
  found=$?
  case "$expected,$found,$said" in sound,0,'' | refuses,1,*"$file: "*) return ;; esac
  echo "$file with $*: expected $expected, the check answers $found: $said" >&2
  status=1
}

check=$1
expect sound desk/scenes/scene.cpp '#include "chart/chart_layout.h"' '#include "desk/base/text.h"' '#include <map>'
expect refuses desk/base/text.h '#include "tools/options.h"'
expect refuses desk/scenes/scene.h '#include "desk/simulation/camera.h"'
expect refuses desk/scenes/scene.h '#include "desk/measure/record.h"'
expect refuses desk/scenes/scene.h '#include "qvtester/tester.h"'
expect refuses chart/points.h '#include "core/slots.h"' '#include "desk/base/text.h"'
expect refuses core/slots.h '#include "chart/points.h"'
expect refuses chart/points.h '#include "chart/upright.h"'
expect refuses elsewhere/file.cpp '#include "desk/base/text.h"'
exit $status
