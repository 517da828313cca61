#!/bin/sh
# Renders the manual page PAGE without a warning: with mandoc, the stricter one, where it is installed, else with groff.
#   man_page.sh PAGE
set -u
page=$1
if command -v mandoc >/dev/null; then
  warnings=$(mandoc -T lint -W warning "$page" 2>&1)
elif command -v groff >/dev/null; then
  warnings=$(groff -ww -man -T utf8 -z "$page" 2>&1)
else
  echo "neither mandoc nor groff is installed (Debian: mandoc)" >&2
  exit 1
fi
status=$?
if [ $status -ne 0 ] || [ -n "$warnings" ]; then
  printf '%s\n' "$warnings" >&2
  exit 1
fi
