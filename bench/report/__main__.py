"""Writes the page of measurements: python3 bench/report [--explanations FILE] RESULTS... FOLDER

RESULTS are files of JSON lines from qxbench; what a later one measured again takes the place of the earlier. The page
and its plots go to FOLDER: performance.md, performance-<family>.svg."""

import argparse
import os
import sys

import document
import reasons
from results import Run


def main():
    parser = argparse.ArgumentParser(description=__doc__, formatter_class=argparse.RawDescriptionHelpFormatter)
    here = os.path.dirname(os.path.abspath(__file__))
    parser.add_argument("--explanations", default=os.path.join(here, "explanations.txt"))
    parser.add_argument("results", nargs="+")
    parser.add_argument("folder")
    options = parser.parse_args()
    run = Run(options.results)
    if not run.machines:
        sys.exit("no results: the files describe no machine")
    os.makedirs(options.folder, exist_ok=True)
    document.write(run, reasons.read(options.explanations), options.folder)


if __name__ == "__main__":
    main()
