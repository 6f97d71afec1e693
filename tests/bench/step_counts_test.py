#!/usr/bin/env python3
"""Holds instructions and allocations of a call's steps to the last row of the table in docs/performance.md.

Usage: step_counts_test.py TREE CALL_STEPS
Instructions may rise by MARGIN, for processors choose between versions of the C library's functions. Counts that fell by more
want a new row as well, so that what was won isn't lost again unseen.
"""
import pathlib
import re
import subprocess
import sys

MARGIN = 0.06
tree, program = pathlib.Path(sys.argv[1]), sys.argv[2]

page = (tree / "docs/performance.md").read_text()
table = re.search(r"^\| Release \|(.*)\|\n\|[-| :]+\|\n((?:\|.*\|\n)+)", page, re.M)
steps = [cell.strip() for cell in table[1].split("|")]
kept = dict(zip(steps, [cell.strip() for cell in table[2].splitlines()[-1].strip("|").split("|")][1:]))

output = subprocess.run([tree / "script/count-steps", program], check=True, capture_output=True, text=True).stdout
counted = {name: (int(instructions), int(blocks)) for name, _, instructions, blocks in map(str.split, output.splitlines()[1:])}
findings = [] if counted.keys() == kept.keys() else [f"the table has the steps {[*kept]}"]
for name, (instructions, blocks) in counted.items():
    kept_instructions, kept_blocks = (int(number.replace(",", "")) for number in kept.get(name, "0 / 0").split("/"))
    if abs(instructions - kept_instructions) > MARGIN * kept_instructions or blocks != kept_blocks:
        findings.append(f"{name}: {instructions:,} instructions / {blocks} allocations; kept: {kept.get(name)}")
print(output, *findings, sep="\n")
sys.exit("docs/performance.md: not as in the last row of the table" if findings else 0)
