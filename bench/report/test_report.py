"""The page is whole for a real run: python3 test_report.py RESULTS FOLDER. Exits 1 with what is missing."""

import os
import sys
import xml.etree.ElementTree as xml

import __main__ as main_module  # noqa: F401  (this file)
import page
from results import Run, exponent
from targets import TARGETS, between

sys.path.insert(0, os.path.dirname(os.path.abspath(__file__)))
