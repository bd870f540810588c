#!/bin/sh
# Fails if an object that is compiled for one instruction set shares a weak symbol with any other
# object: the linker keeps one of them, for every processor.
#   bodies_test.sh OBJECT...
symbols=$(for object; do
  set=$(expr "$object" : '.*/bodies/\([a-z0-9]*\)\.cpp')
  nm "$object" | awk -v set="${set:-common}" '$(NF - 1) ~ /^[WVu]$/ { print $NF, set }'
done | sort -u)
echo "$symbols" | grep -q ' portable$' || { echo "no body found"; exit 1; }
shared=$(echo "$symbols" | awk '
  $2 != "common" && $2 != "dispatch" && $2 != "portable" { special[$1] = 1 }
  { objects[$1]++ }
  END { for (name in special) if (objects[name] > 1) print name }' | c++filt)
[ -z "$shared" ] || { echo "shared between instruction sets:"; echo "$shared"; exit 1; }
