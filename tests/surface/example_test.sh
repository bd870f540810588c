#!/bin/sh
# Holds a header's example, the code in front of the line that names FILE, against the file that is
# compiled and run.
#   example_test.sh HEADER FILE
example=$(awk -v file="(tests/$(basename "$2") " '
  index($0, file) { printf "%s", code; exit }
  /^ \*     / { code = code substr($0, 8) "\n"; next }
  /^ \*$/ { code = code == "" ? "" : code "\n"; next }
  { code = "" }' "$1")
if [ -z "$example" ]; then
  echo "$1 has no example of that name"
  exit 1
fi
case $(cat "$2") in
  *"$example"*) exit 0 ;;
esac
echo "the example of $1 is not that of $2:"
echo "$example" | diff - "$2"
exit 1
