#!/usr/bin/env bash
# readme_fit.sh SOURCE QXSM: the first block of the README is a call of "qxsm lmm" and what it prints; the last digits of
# the score at the optimum are rounding, which differs between machines.
set -euo pipefail
cd "$1"
block=$(awk '/^```/ { if (inside) exit; inside = 1; next } inside' README.md)
call=$(head -n 1 <<<"$block")
case $call in "$ qxsm lmm "*" --plot build/demo") ;; *) echo "the first block begins with: $call" >&2; exit 1 ;; esac
arguments=${call#"$ qxsm "}
eval "set -- \"$2\" ${arguments%" --plot build/demo"}"
shown() { sed -E 's/[0-9]+ iterations, largest scaled score [0-9.e+-]+/N iterations, largest scaled score S/'; }
diff <(tail -n +2 <<<"$block" | shown) <("$@" | shown)
echo "the README shows what the fit prints"
