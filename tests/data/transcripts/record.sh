#!/bin/sh
# Records the GDB/MI transcripts of this directory: compiles the programs
# under tests/debuggees/ into a scratch directory, feeds each NAME.commands file to
# "gdb --nx --interpreter=mi2" and keeps everything GDB and the program print
# on their shared standard output, byte for byte, in NAME.mi.
#
# A .commands file names its program on a first line "# program: FILE".
# Inside the commands, @BIN@ stands for the compiled program and @line:TAG@
# for the number of the source line that carries the marker "line:TAG".
# Usage: record.sh [NAME...]   (all transcripts without arguments)
set -eu

here=$(cd "$(dirname "$0")" && pwd)
scratch=$(mktemp -d "${TMPDIR:-/tmp}/transcripts.XXXXXX")
trap 'rm -rf "$scratch"' EXIT

compile() {
  source=$1
  binary=$2
  case "$source" in
  *.c) gcc -g -O0 -pthread -o "$binary" "$source" ;;
  *.cpp) g++ -g -O0 -o "$binary" "$source" ;;
  *.pas) fpc -g -O- -FE"$scratch" -o"$binary" "$source" >"$scratch/fpc.log" ;;
  *) echo "record.sh: no compiler for $source" >&2; exit 1 ;;
  esac
}

# Replaces @line:TAG@ by the line number of the marker in the source.
expand_lines() {
  source=$1
  awk -v source="$source" '
    BEGIN {
      while ((getline text < source) > 0) {
        ++number
        if (match(text, /line:[A-Za-z0-9_-]+/))
          lines[substr(text, RSTART + 5, RLENGTH - 5)] = number
      }
    }
    {
      while (match($0, /@line:[A-Za-z0-9_-]+@/)) {
        tag = substr($0, RSTART + 6, RLENGTH - 7)
        if (!(tag in lines)) { print "record.sh: no marker line:" tag > "/dev/stderr"; exit 1 }
        $0 = substr($0, 1, RSTART - 1) lines[tag] substr($0, RSTART + RLENGTH)
      }
      print
    }'
}

record() {
  name=$1
  commands="$here/$name.commands"
  program=$(sed -n '1s/^# program: *//p' "$commands")
  [ -n "$program" ] || { echo "record.sh: $commands names no program" >&2; exit 1; }
  cp "$here/../../debuggees/$program" "$scratch/$program"
  binary="$scratch/${program%.*}"
  compile "$scratch/$program" "$binary"
  grep -v '^#' "$commands" | sed "s|@BIN@|$binary|g" | expand_lines "$scratch/$program" >"$scratch/$name.in"
  # The pipe into cat makes GDB's and the program's standard output one pipe,
  # as the debugger back-end sees them.
  (cd "$scratch" && timeout 120 gdb --nx --interpreter=mi2 <"$scratch/$name.in" 2>"$scratch/$name.err" | cat >"$here/$name.mi")
  if [ -s "$scratch/$name.err" ]; then
    echo "record.sh: $name: GDB wrote to stderr:" >&2
    cat "$scratch/$name.err" >&2
  fi
  echo "recorded $name.mi"
}

if [ $# -eq 0 ]; then
  for commands in "$here"/*.commands; do
    name=$(basename "$commands" .commands)
    set -- "$@" "$name"
  done
fi
for name in "$@"; do
  record "$name"
done
