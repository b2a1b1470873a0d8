#!/bin/sh
# The @SUITE@ CTF applet: writes its log beside itself. Its cases are
# NAME=RESULT words.
{
echo '[VERBOSE]'
echo 'Suite: @SUITE@'
echo "Time: $(date '+%Y/%m/%d %H:%M:%S')"
for c in @CASES@; do
  echo "Test: ${c%%=*} (applet run)"
  echo "Result: ${c#*=}"
done
echo '[/VERBOSE]'
} > "$HANDSET_MODULE_DIR/@LOG@"
