#!/bin/sh
# Installs a build, and makes its Debian package; lets an outside program find either with CMake and
# with pkg-config where it was not made for: the one moved, the other unpacked below a root of its
# own. CMAKE and CC name the programs to use.
#   install_test.sh BUILD_FOLDER CONSUMER_FOLDER RECORDING    (raw 16-bit PCM, 16 kHz)
set -eu
build=$1
consumer=$2
recording=$3
work=$(mktemp -d)
trap 'rm -rf "$work"' EXIT

# check WHAT WANTED GOT
check() {
  [ "$2" = "$3" ] && return
  printf '%s:\n%s\nexpected:\n%s\n' "$1" "$3" "$2"
  exit 1
}

# quietly COMMAND...
quietly() {
  "$@" >"$work/log" 2>&1 || { cat "$work/log"; exit 1; }
}

# check_installation NAME PREFIX
check_installation() {
  made=$work/made/$1
  mkdir -p "$made"
  quietly "$CMAKE" -S "$consumer" -B "$made" -DCMAKE_C_COMPILER="$CC" -DCMAKE_PREFIX_PATH="$2"
  quietly "$CMAKE" --build "$made"

  pc=$(find "$2" -name orvalis.pc)
  PKG_CONFIG_LIBDIR=$(dirname "$pc")
  export PKG_CONFIG_LIBDIR
  # Unquoted: flags are words.
  "$CC" "$consumer/consumer.c" $(pkg-config --cflags --libs orvalis) -o "$made/by_pkg_config"
  libraries=$(pkg-config --variable=libdir orvalis)

  answer='library 160705
0.36 s to 2.50 s'
  check "$1: the consumer built by pkg-config" "$answer" \
    "$(LD_LIBRARY_PATH=$libraries "$made/by_pkg_config" <"$recording")"
  check "$1: the consumer built by CMake" "$answer" "$("$made/consumer" <"$recording")"
  check "$1: the tool" '1 0.360 2.500 2.140' \
    "$("$2/bin/orvalis" epd --raw - <"$recording" | tail -n 1 | xargs)"
  for file in bash-completion/completions/orvalis zsh/site-functions/_orvalis \
      fish/vendor_completions.d/orvalis.fish; do
    [ -s "$2/share/$file" ] || check "$1: $file" present missing
  done
  # The completion for bash knows the commands, options and values that the tool has.
  for typed in 'orvalis pro=process' 'orvalis help inp=input' 'orvalis vad --min-si=--min-silence' \
      'orvalis epd --format j=json'; do
    check "$1: completion of ${typed%=*}" "${typed#*=}" "$(PATH=$2/bin:$PATH bash -c '
      . "$1" && read -ra COMP_WORDS <<<"$2" && COMP_CWORD=$((${#COMP_WORDS[@]} - 1)) && _orvalis
      echo "${COMPREPLY[*]}"' - "$2/share/bash-completion/completions/orvalis" "${typed%=*}")"
  done
  [ -d "$build/java" ] || return 0
  for jar in orvalis orvalis-sources orvalis-javadoc orvalis-example; do
    [ -s "$2/share/java/$jar.jar" ] || check "$1: $jar.jar" present missing
  done
}

quietly "$CMAKE" --install "$build" --prefix "$work/first"
mv "$work/first" "$work/moved"
check_installation installed "$work/moved"

quietly "$(dirname "$CMAKE")/cpack" -G DEB --config "$build/CPackConfig.cmake" -B "$work/package"
package=$(find "$work/package" -maxdepth 1 -name '*.deb')
quietly dpkg-deb -x "$package" "$work/root"
check_installation packaged "$work/root/usr"
# The C library and the tool's own libraries, found by dpkg-shlibdeps.
for library in libc6 libsndfile1 libsamplerate0 libfmt; do
  dpkg-deb -f "$package" Depends | grep -q "$library" ||
    check "the package's dependency $library" present missing
done

# The manual page knows every option of the help.
commands=$("$work/moved/bin/orvalis" --help | sed -n '/^Subcommands:/,/^$/s/^  \([a-z][a-z]*\).*/\1/p')
check "the commands" "epd vad denoise level process energy spectrum version help" "$(echo $commands)"
for command in $commands; do
  options=$("$work/moved/bin/orvalis" "$command" --help | sed -n '/^Options:/,/^$/p' |
    grep -o -e '--[a-z][a-z-]*')
  for option in $options; do
    grep -qw -e "It .*Fl ${option#-}" "$work/moved/share/man/man1/orvalis.1" ||
      check "$option of $command in the manual page" described missing
  done
  grep -qw -e "Cm .*$command" "$work/moved/share/man/man1/orvalis.1" ||
    check "$command in the manual page" described missing
done
