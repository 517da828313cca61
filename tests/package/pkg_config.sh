#!/bin/sh
# Builds and runs the consumer's programs with nothing but compiler and pkg-config, and each public header by itself.
#   pkg_config.sh PREFIX LIBDIR SOURCES WORK CC CXX [FLAGS...]
set -eu
prefix=$1 libdir=$2 sources=$3 work=$4 cc=$5 cxx=$6
shift 6
strict="-Wall -Wextra -Wpedantic -Werror $*"
unset LD_LIBRARY_PATH
export PKG_CONFIG_PATH="$prefix/$libdir/pkgconfig"
mkdir -p "$work"

flags_of() { pkg-config --cflags --libs "$@"; }
# The search path of the libraries is the program's affair; this is where they were moved to.
rpath="-Wl,-rpath,$(pkg-config --variable=libdir qxhost)"

# shellcheck disable=SC2046,SC2086  # flags are lists of words
{
  $cc -std=c11 $strict "$sources/fit.c" $(flags_of qxhost) $rpath -lm -o "$work/fit_c"
  $cxx -std=c++20 $strict "$sources/fit.cpp" $(flags_of qxhost qxesm) $rpath -o "$work/fit_cpp"
  $cc -std=c11 $strict "$sources/first_unit.c" "$sources/second_unit.c" $(flags_of qxesm) $rpath -o "$work/two_units"
}
for program in fit_c fit_cpp two_units; do
  "$work/$program"
done

# Every header by itself; an .hpp is C++ only.
include=$(pkg-config --variable=includedir qxesm)
headers=0
for header in "$include"/qxesm/*.h "$include"/qxhost/*.h "$include"/qxhost/*.hpp; do
  line="#include <${header#"$include/"}>"
  # shellcheck disable=SC2046,SC2086
  {
    case $header in
      *.h) echo "$line" | $cc -std=c11 $strict $(pkg-config --cflags qxhost) -fsyntax-only -x c - ;;
    esac
    echo "$line" | $cxx -std=c++20 $strict $(pkg-config --cflags qxhost) -fsyntax-only -x c++ -
  }
  headers=$((headers + 1))
done
echo "$headers headers stand by themselves"
