#!/bin/sh
# Stand-in for the SDK resource compiler:
#   kestormc.exe -convert -infile SOURCE.ksx -outfile OUT.car   (copies the source)
#   kestormc.exe -compile -infile SOURCE -outfile OUT            (harness res compile)
action=; in=; out=
while [ $# -gt 0 ]; do
  case "$1" in
    -convert) action=convert ;;
    -compile) action=compile ;;
    -infile) in=$2; shift ;;
    -outfile) out=$2; shift ;;
  esac
  shift
done
case "$action" in
  convert) cp "$in" "$out" && echo "Successfully converted file $in" ;;
  compile) exec @HARNESS@ res compile "$in" "$out" ;;
  *) echo "kestormc: nothing to do"; exit 2 ;;
esac
