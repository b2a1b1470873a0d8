#!/bin/sh
# Stand-in for the older SDK resource compiler: kestorc.exe -nh -o OUT SOURCE
[ "$1" = -nh ] && shift
[ "$1" = -o ] || { echo "kestorc: expected -o OUT SOURCE"; exit 2; }
exec @HARNESS@ res compile "$3" "$2"
