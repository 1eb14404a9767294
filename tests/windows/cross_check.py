#!/usr/bin/env python3
"""Compares the cross-check reports of the plugin on Linux and under Wine.

    cross_check.py LINUX_REPORT WINE_REPORT

Every line must be the same, except the Lab results, which are compared as numbers.
The plugin reads a COLOR_Lab word as ICC version 2 16-bit Lab (L 0xFF00 = 100,
a and b 0x8000 = 0), as the stand-in layer writes it; Wine's colour management writes
version 4 16-bit Lab (L 0xFFFF = 100, a and b 0x8080 = 0). The Wine figures are turned
back into their words and decoded as version 4 before the comparison, which allows one
step of each encoding. Exit 0 when the reports agree, 1 when not, 2 on bad usage.
"""
import re
import sys

STEP_L = 100 / 0xFF00 + 100 / 0xFFFF
STEP_AB = 1 / 256 + 1 / 257
LAB = re.compile(r"^lab (\S+ \S+ \S+) -> (\S+) (\S+) (\S+) error (-?\d+)$")


def v4_from_plugin_reading(L, a, b):
    """The Lab a plugin reading of Wine's words stands for: the words are recovered from
    the version 2 reading, then decoded as version 4."""
    wl, wa, wb = round(L * 652.8), round((a + 128) * 256), round((b + 128) * 256)
    return wl / 655.35, wa / 257 - 128, wb / 257 - 128


def compare(linux_lines, wine_lines):
    problems = []
    if len(linux_lines) != len(wine_lines):
        problems.append("%d lines on Linux, %d under Wine" % (len(linux_lines), len(wine_lines)))
    for n, (ours, wine) in enumerate(zip(linux_lines, wine_lines), 1):
        m1, m2 = LAB.match(ours), LAB.match(wine)
        if m1 and m2 and m1.group(1) == m2.group(1) and m1.group(5) == m2.group(5):
            expected = [float(x) for x in m1.group(2, 3, 4)]
            got = v4_from_plugin_reading(*(float(x) for x in m2.group(2, 3, 4)))
            steps = (STEP_L, STEP_AB, STEP_AB)
            if all(abs(e - g) <= s for e, g, s in zip(expected, got, steps)):
                continue
            wine = "%s (as version 4 Lab: %.4f %.4f %.4f)" % (wine, *got)
        elif ours == wine:
            continue
        problems.append("line %d: Linux '%s', Wine '%s'" % (n, ours, wine))
    return problems


def main(argv):
    if len(argv) == 2 and argv[1] in ("-h", "--help"):
        sys.stdout.write(__doc__)
        return 0
    if len(argv) != 3:
        sys.stderr.write(__doc__)
        return 2
    reports = []
    for path in argv[1:]:
        try:
            with open(path, newline=None) as f:
                reports.append([line.rstrip("\r\n") for line in f])
        except OSError as e:
            print("cross check: %s" % e, file=sys.stderr)
            return 2
    problems = compare(*reports)
    for p in problems:
        print("cross check: " + p, file=sys.stderr)
    if problems:
        return 1
    labs = sum(1 for line in reports[0] if LAB.match(line))
    print("cross check: %d lines agree (%d Lab results within one step of each encoding)" %
          (len(reports[0]), labs))
    return 0


if __name__ == "__main__":
    sys.exit(main(sys.argv))
