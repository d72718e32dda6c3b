#!/usr/bin/python3
"""Packs a toolkit's tree into an SPB: scripts/pack_toolkit.py DIR -o FILE [--stored]

This is `spb pack` of this repository; everything is told there ("tools/spb pack --help").
"""

import os
import sys

SPB = os.path.join(os.path.dirname(os.path.abspath(__file__)), "..", "tools", "spb")

os.execv(SPB, [SPB, "pack", *sys.argv[1:]])
