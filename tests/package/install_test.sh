#!/bin/sh
# Installs a build, moves the installation, and lets an outside program find it there with CMake and
# with pkg-config. CMAKE and CC name the programs to use.
#   install_test.sh BUILD_FOLDER CONSUMER_FOLDER RECORDING    (raw 16-bit PCM, 16 kHz)
set -eu
build=$1
consumer=$2
recording=$3
work=$(mktemp -d)
trap 'rm -rf "$work"' EXIT
installed=$work/moved

# check WHAT WANTED GOT
check() {
  [ "$2" = "$3" ] && return
  printf '%s:\n%s\nexpected:\n%s\n' "$1" "$3" "$2"
  exit 1
}

"$CMAKE" --install "$build" --prefix "$work/first" >"$work/log" || { cat "$work/log"; exit 1; }
mv "$work/first" "$installed"

{
  "$CMAKE" -S "$consumer" -B "$work/build" -DCMAKE_C_COMPILER="$CC" \
    -DCMAKE_PREFIX_PATH="$installed" &&
    "$CMAKE" --build "$work/build"
} >"$work/log" 2>&1 || { cat "$work/log"; exit 1; }

pc=$(find "$installed" -name orvalis.pc)
PKG_CONFIG_LIBDIR=$(dirname "$pc")
export PKG_CONFIG_LIBDIR
# Unquoted: flags are words.
"$CC" "$consumer/consumer.c" $(pkg-config --cflags --libs orvalis) -o "$work/by_pkg_config"

answer='library 160705
0.51 s to 2.25 s'
LD_LIBRARY_PATH=$(pkg-config --variable=libdir orvalis)
export LD_LIBRARY_PATH
check "the consumer built by pkg-config" "$answer" "$("$work/by_pkg_config" <"$recording")"
unset LD_LIBRARY_PATH
check "the consumer built by CMake" "$answer" "$("$work/build/consumer" <"$recording")"

tool=$installed/bin/orvalis
check "the tool" '1 0.510 2.250 1.740' \
  "$("$tool" epd --raw - <"$recording" | tail -n 1 | xargs)"

# The manual page knows every option of the help.
options=$("$tool" epd --help | grep -o -e '--[a-z][a-z-]*')
for option in $options; do
  grep -qw -e "Fl ${option#-}" "$installed/share/man/man1/orvalis.1" ||
    check "$option in the manual page" described missing
done
