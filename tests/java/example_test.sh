#!/bin/sh
# The example, which finds the library in the jar beside it, prints what the tool prints, and refuses
# what is no recording.
#   example_test.sh JAVA EXAMPLE_JAR TOOL RECORDING...
java=$1
jar=$2
tool=$3
shift 3
[ $# -gt 0 ] || exit 1
for recording; do
  wanted=$("$tool" epd "$recording") || exit 1
  got=$("$java" -Xcheck:jni -jar "$jar" "$recording" 2>&1)
  if [ "$got" != "$wanted" ]; then
    printf '%s:\n%s\nexpected:\n%s\n' "$recording" "$got" "$wanted"
    exit 1
  fi
done
if "$java" -jar "$jar" "$0" 2>/dev/null; then
  echo "a script was taken for a recording"
  exit 1
fi

# Without the library, an error that says what to do.
alone=$(mktemp -d)
trap 'rm -rf "$alone"' EXIT
cp "$jar" "$(dirname "$jar")/orvalis.jar" "$alone"
got=$("$java" -Djava.io.tmpdir="$alone/none" -jar "$alone/orvalis-example.jar" "$recording" 2>&1)
case $got in
  *UnsatisfiedLinkError*"libOrvalis.so is not available"*java.library.path*) ;;
  *) echo "without a place for the library: $got"; exit 1 ;;
esac
