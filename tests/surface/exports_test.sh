#!/bin/sh
# Holds the finished library against its export list, both ways, and against what it may need.
#   exports_test.sh LIBRARY EXPORT_LIST
LC_ALL=C
export LC_ALL
failed=0
work=$(mktemp -d)
trap 'rm -rf "$work"' EXIT

sed -n 's/^ *\([A-Za-z_][A-Za-z0-9_]*\);$/\1/p' "$2" | sort >"$work/listed"
nm -D --defined-only "$1" | awk '{print $3}' | sort >"$work/exported"
if [ ! -s "$work/listed" ] || ! diff "$work/listed" "$work/exported" >"$work/differences"; then
  echo "listed (<) and exported (>) names differ:"
  cat "$work/differences"
  failed=1
fi

# The C library, its mathematics and, on some machines, the loader: no C++ runtime.
readelf -dW "$1" | sed -n 's/.*(NEEDED).*\[\(.*\)\]/\1/p' >"$work/needed"
if [ ! -s "$work/needed" ] || grep -Ev '^(libc|libm|ld-linux[^.]*)\.so' "$work/needed" >"$work/extra"; then
  echo "the library needs more than libc and libm:"
  cat "$work/extra"
  failed=1
fi

# Loadable where pages have 16 KB.
if ! readelf -lW "$1" | awk '$1 == "LOAD" {++n; if ($NF != "0x4000") bad = 1} END {exit bad || !n}'; then
  echo "a segment is not aligned to 16 KB"
  failed=1
fi
exit $failed
