#!/bin/sh
# The OAT framework applet: started as "applet 0x01010001 -dk MODE PROGRAM[,CASE...]",
# runs the suite script that the module providing PROGRAM installed.
mode=$4
layout=$5
program=${layout%%,*}
cases=
[ "$program" != "$layout" ] && cases=${layout#*,}
for dir in "$HANDSET_FS"/usermods/*/; do
  if [ -f "$dir/suite-$program.sh" ]; then
    exec sh "$dir/suite-$program.sh" "$mode" "$cases"
  fi
done
echo "OAT: no suite $program" >&2
exit 1
