#!/usr/bin/env bash
# Runs what the documents tell a reader to run: the programs and commands in README.md, docs/, the
# manual page and the tool's help, on real recordings; and follows their links. CC, and JAVA unless
# it is built without, name the programs to use.
#   documents_test.sh PROJECT BUILD RECORDINGS INCLUDED_FOLDER...
set -euo pipefail
project=$1 build=$2 recordings=$3
includes=$(printf -- '-I%s ' "${@:4}")
raw=$recordings/goforward.raw mono=$recordings/cards/001.wav
documents=("$project"/*.md "$project"/docs/*.md)
work=$(mktemp -d)
trap 'rm -rf "$work"' EXIT

complain() {
  printf '%s\n' "$@"
  exit 1
}

# program NAME: one of that name, which does what standard input says.
mkdir "$work/bin" "$work/given"
program() {
  { echo '#!/bin/sh'; cat; } >"$work/bin/$1"
  chmod +x "$work/bin/$1"
}
program orvalis <<<"exec '$build/cli/orvalis' \"\$@\""
program run <<<"[ \$# -gt 0 ] || set -- '$recordings'/librivox/*-0890.wav; exec orvalis epd \"\$@\""
program cc <<<"exec '$(command -v "$CC")' -std=c99 -Wall -pedantic-errors -Werror \"\$@\""
program pkg-config <<<"echo '$includes -L$build -lOrvalis -Wl,-rpath,$build'"
program java <<<"exec '${JAVA-}' \"\$@\""
program arecord <<<"exec cat '$raw'"
program aplay <<<'[ "$(wc -c)" -gt 10000 ]'
PATH=$work/bin:$PATH

# Two microphones: the same samples, said to be pairs.
cp "$mono" "$work/pairs.wav"
printf '\2\0\200\76\0\0\0\372\0\0\4\0' | dd of="$work/pairs.wav" bs=1 seek=22 conv=notrunc 2>"$work/log"

# give_inputs LINE: the files that a command names, all but those that it writes, and folders.
give_inputs() {
  local word input=$mono words
  [[ $1 =~ --(mics|channel)\ 2 ]] && input=$work/pairs.wav
  read -ra words <<<"${1//\*/some}"
  for word in "${words[@]}"; do
    case ${word#<} in
      */) mkdir "$word" ;;
      out.* | clean.* | level.* | */*) ;;
      *.raw) cp "$raw" "${word#<}" ;;
      *.wav | *.flac | *.mp3) cp "$input" "${word#<}" ;;
    esac
  done
}

# run_line DOCUMENT LINE: in a folder of its own. A command has to succeed and to give something.
ran=0
run_line() {
  local name=${1#"$project/"} line folder=$work/folder
  read -r line <<<"${2%%#*}"
  case $line in
    git\ * | sudo\ * | scripts/build\ * | scripts/test*) return ;;
    scripts/run*) line=${line#scripts/} ;;
    */tests/test_*) line+=' --gtest_list_tests | grep "^  "' ;;
    java\ *) [[ ${JAVA-} ]] || return 0 ;;
  esac
  rm -rf "$folder"
  mkdir -p "$folder/build"
  ln -s "$build" "$folder/build/release"
  cp "$work/given/"* "$folder"
  cd "$folder"
  give_inputs "$line"
  ls -R >"$work/before"
  bash -o pipefail -c "$line" </dev/null >"$work/out" 2>"$work/err" || complain "$name: $2" "$(<"$work/err")"
  [[ -s $work/out || $(ls -R) != "$(<"$work/before")" || $line == *aplay* ]] ||
    complain "$name: $2" "gives nothing"
  case $line in
    cc\ *) cp listen "$work/given" ;;
    ./listen*) [[ ! -s $work/err ]] && ! grep -Ev '^[0-9.]+ s to [0-9.]+ s$' "$work/out" ;;
    java\ *) ! grep -Ev '^utterance [0-9]+: [0-9]+ to [0-9]+' "$work/out" ;;
    run) [[ $(<"$1") == *"$(<"$work/out")"* ]] ;;
  esac || complain "$name: $2" "prints something else:" "$(cat "$work/out" "$work/err")"
  ran=$((ran + 1))
}

# blocks LANGUAGE DOCUMENT: the contents of its fenced blocks of a language.
blocks() {
  awk -v fence="\`\`\`$1" '/^ *```/ { inside = $1 == fence; next } inside' "$2"
}

blocks c "$project/README.md" >"$work/given/listen.c"
blocks java "$project/README.md" >"$work/given/Listen.java"
for document in "${documents[@]}"; do
  while read -r line; do run_line "$document" "$line"; done < <(blocks sh "$document")
  while read -r link; do
    [[ $link == http* || -e $(dirname "$document")/${link%%#*} ]] ||
      complain "$document: the link $link leads nowhere"
  done < <(grep -o '](\([^)]*\)' "$document" | cut -c3- | grep -v '^#')
done
manual=$project/cli/orvalis.1
while read -r line; do run_line "$manual" "$line"; done < <(sed -n '/^\.Bd/,/^\.Ed/{/^\./!p}' "$manual")
for command in $(orvalis --help | sed -n '/^Subcommands:/,/^$/s/^  \([a-z]*\) .*/\1/p'); do
  while read -r line; do run_line "$command --help" "${line%%   *}"; done < \
    <(orvalis "$command" --help | sed -n '/^Examples:/,$s/^  //p')
done
echo "$ran commands"
[[ $ran -gt 40 ]]
