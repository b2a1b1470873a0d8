#!/bin/sh
# The @SUITE@ CTF test program: writes the CTF log. Its cases are NAME=RESULT
# words; the result HELPER is PASS when the Helper secondary module is
# installed, else FAIL.
log="$HANDSET_FS/usermods/CTF/CTF.log"
mkdir -p "$(dirname "$log")"
helper=FAIL
[ -e "$HANDSET_FS/usermods/Helper/helper.dat" ] && helper=PASS
{
echo '[VERBOSE]'
echo 'Suite: @SUITE@'
echo "Time: $(date '+%Y/%m/%d %H:%M:%S')"
for c in @CASES@; do
  result=${c#*=}
  [ "$result" = HELPER ] && result=$helper
  echo "Test: ${c%%=*}"
  echo "Result: $result"
done
echo '[/VERBOSE]'
} > "$log"
