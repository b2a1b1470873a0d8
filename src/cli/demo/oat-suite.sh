#!/bin/sh
# The @SUITE@ OAT suite: MODE [CASE,CASE...]; writes the .oat log. Its cases
# are NAME=STATUS words.
cases=",$2,"
log="$HANDSET_FS/shared/pek/log/@LOG@.oat"
mkdir -p "$(dirname "$log")"
run() { [ "$cases" = ",," ] || case "$cases" in *,$1,*) ;; *) return 1;; esac; }
{
echo '@@SUITE@'
echo 'ModuleVer: 1.2.0'
echo "TimeStamp: $(date '+%H:%M:%S %m-%d-%Y')"
for c in @CASES@; do
  name=${c%%=*}
  run "$name" && { echo "@Case:$name"; echo "Status: ${c#*=}"; }
done
echo 'RESULT: complete'
} > "$log"
