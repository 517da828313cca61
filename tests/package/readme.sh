#!/bin/sh
# The README's line that builds its example, as it stands there but for the folder of the installed tree.
#   readme.sh PREFIX LIBDIR SOURCE WORK CC [FLAGS...]
set -eu
prefix=$1 libdir=$2 source=$3 work=$4
shift 4
unset LD_LIBRARY_PATH
mkdir -p "$work"
cp "$source/docs/examples/fit.c" "$work"
cd "$work"
line=$(sed -n 's/^    cc fit\.c /fit.c /p' "$source/README.md" |
  sed -e "s|~/qxesm/lib|$prefix/$libdir|g" -e "s|\$HOME/qxesm/lib|$prefix/$libdir|g")
case $line in *"$prefix/$libdir/pkgconfig "*) ;; *) echo "no such line in README.md" >&2; exit 1 ;; esac
eval "$* $line"
./fit
