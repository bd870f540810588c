#!/bin/sh
# Fails if rooms include one another in a circle: the engine's folders, and the project's others.
#   rooms_test.sh PROJECT
cd "$1" || exit 1
folders=$(ls -d */ | grep -v '^build')
arrows=$({
  find $folders -name '*.h'
  grep -r --include='*.[ch]' --include='*.cpp' '^#include ["<]' $folders
} | awk -F '[:"<>]' '
  function room(path) {
    match(path, /^(Voice_Engine\/)?[^\/]*/)
    return substr(path, 1, RLENGTH)
  }
  NF == 1 { name = $1; sub(/.*\//, "", name); path_of[name] = path_of[$1] = $1; next }
  $3 in path_of && room($1) != room(path_of[$3]) { print room($1), room(path_of[$3]) }' | sort -u)
echo "$arrows"
[ -n "$arrows" ] && echo "$arrows" | tsort >/dev/null
