#!/bin/sh
# Holds the finished library against its export list, both ways, against the public headers, and
# against what it may need.
#   exports_test.sh LIBRARY EXPORT_LIST HEADER...
LC_ALL=C
export LC_ALL
library=$1
list=$2
shift 2
failed=0
work=$(mktemp -d)
trap 'rm -rf "$work"' EXIT
cd "$work" || exit 1

# complain_if_any MESSAGE FILE
complain_if_any() {
  [ -s "$2" ] || return 0
  echo "$1"
  cat "$2"
  failed=1
}

nm -D --defined-only "$library" | awk '{print $3}' | sort >exported
sed -n 's/^ *\([A-Za-z_][A-Za-z0-9_]*\);$/\1/p' "$list" | sort >listed
comm -23 listed exported >missing
complain_if_any "listed but not exported:" missing
comm -13 listed exported >surplus
complain_if_any "exported but not listed:" surplus

# The linker exports nothing that is not listed, so a name that the list forgot shows only here.
cat "$@" | sed -e 's|/\*.*\*/||' -e '/\/\*/,/\*\//d' -e '/^#/d' >declarations
{
  grep -o '[A-Za-z_][A-Za-z0-9_]*(' declarations | tr -d '('
  sed -n 's/^extern .*int[0-9]*_t *\**\(const \)\{0,1\}//p' declarations |
    tr -d ' ;' | tr ',' '\n' | sed 's/\[.*//'
} | sort >declared
comm -23 declared exported >undelivered
complain_if_any "declared in a public header but not exported:" undelivered

# The C library, its mathematics and, on some machines, the loader: no C++ runtime.
readelf -dW "$library" | sed -n 's/.*(NEEDED).*\[\(.*\)\]/\1/p' >needed
grep -Ev '^(libc|libm|ld-linux[^.]*)\.so' needed >unwanted
complain_if_any "the library needs more than libc and libm:" unwanted

# Loadable where pages have 16 KB.
readelf -lW "$library" | awk '$1 == "LOAD" && $NF != "0x4000"' >misaligned
complain_if_any "segments that are not aligned to 16 KB:" misaligned

# A host may define any of these names: no call of the library itself may then end there.
nm -D --defined-only "$library" | awk '$2 == "T" {print $3}' | sort >functions
readelf -rW "$library" | awk '{print $5}' | sort -u >relocated
comm -12 functions relocated >interposable
complain_if_any "functions of its own that the library calls by their exported names:" interposable

# Every check above passes on nothing at all.
for list in exported declared needed functions relocated; do
  if [ ! -s $list ]; then
    echo "nothing $list: the tools that read the library have failed"
    failed=1
  fi
done
exit $failed
