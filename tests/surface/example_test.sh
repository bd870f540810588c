#!/bin/sh
# Holds a header's worked example against the file that is compiled and run.
#   example_test.sh HEADER FILE
example=$(sed -n '/orked example/,/^ \* (tests\//p' "$1" |
  sed -n -e 's/^ \*     //p' -e 's/^ \*$//p' | sed '/./,$!d')
if [ -z "$example" ]; then
  echo "$1 has no worked example"
  exit 1
fi
case $(cat "$2") in
  *"$example"*) exit 0 ;;
esac
echo "the worked example of $1 is not that of $2:"
echo "$example" | diff - "$2"
exit 1
