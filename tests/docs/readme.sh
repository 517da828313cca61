#!/usr/bin/env bash
# readme.sh SOURCE PROGRAM: the first C block of the README is the example, and the block behind it what PROGRAM prints.
set -euo pipefail
blocks() { awk -v want="$1" '/^```/ { if (inside) { inside = 0 } else { inside = 1; ++n }; next } inside && n == want' "$2"; }
number=$(awk '/^```/ { if (!inside) ++n; inside = !inside } /^```c$/ { print n; exit }' "$1/README.md")
diff <(blocks "$number" "$1/README.md") "$1/docs/examples/fit.c"
diff <(blocks $((number + 1)) "$1/README.md") <("$2")
echo "the README shows docs/examples/fit.c and its output"
