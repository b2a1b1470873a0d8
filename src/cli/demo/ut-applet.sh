#!/bin/sh
# The @SUITE@ unit test applet: writes a text and an XML log. Its cases are
# NAME=RESULT words.
dir="$HANDSET_MODULE_DIR/log"
mkdir -p "$dir"
{
echo 'Kesto unit test run'
echo "SuiteName: @SUITE@ $(LC_ALL=C date '+%H:%M:%S %d-%b-%Y')"
echo '---------------------------------------------'
ms=7
for c in @CASES@; do
  echo "${c%%=*} ${c#*=} $ms ms"
  ms=$((ms + 11))
done
echo '---------------------------------------------'
echo 'Elapsed Time: 0.2 s'
} > "$dir/@LOG@.txt"
{
echo '<TestRunLog suite="@SUITE@">'
for c in @CASES@; do
  echo " <test name=\"${c%%=*}\" result=\"$(echo "${c#*=}" | tr '[:upper:]' '[:lower:]')\"/>"
done
echo '</TestRunLog>'
} > "$dir/@LOG@.xml"
