#!/usr/bin/env python3
"""Compares two JSON documents numerically.

usage: compare_json.py A.json B.json [--rtol R] [--atol A] [--ignore KEY ...]

Numbers agree when |a - b| <= atol + rtol * max(|a|, |b|); everything else
(structure, keys, strings, array lengths, nulls) must be equal. Members named
with --ignore (file paths, say) are skipped. Prints the largest relative
difference met, and every disagreement; exits 1 on any.
"""
import argparse
import json
import math
import sys


def compare(a, b, path, opts, problems, worst):
    if isinstance(a, bool) or isinstance(b, bool) or a is None or b is None:
        if a != b:
            problems.append(f"{path}: {a!r} != {b!r}")
    elif isinstance(a, (int, float)) and isinstance(b, (int, float)):
        if math.isnan(a) or math.isnan(b) or math.isinf(a) or math.isinf(b):
            if not (a == b or (math.isnan(a) and math.isnan(b))):
                problems.append(f"{path}: {a!r} != {b!r}")
            return
        diff = abs(a - b)
        scale = max(abs(a), abs(b))
        if diff > opts.atol + opts.rtol * scale:
            problems.append(f"{path}: {a!r} vs {b!r} (difference {diff:.3g})")
        if diff > 0:
            rel = diff / scale
            if rel > worst[0]:
                worst[0], worst[1] = rel, path
    elif isinstance(a, dict) and isinstance(b, dict):
        if sorted(a) != sorted(b):
            problems.append(f"{path}: members {sorted(a)} != {sorted(b)}")
            return
        for key in a:
            if key not in opts.ignore:
                compare(a[key], b[key], f"{path}.{key}", opts, problems, worst)
    elif isinstance(a, list) and isinstance(b, list):
        if len(a) != len(b):
            problems.append(f"{path}: length {len(a)} != {len(b)}")
            return
        for i, (x, y) in enumerate(zip(a, b)):
            compare(x, y, f"{path}[{i}]", opts, problems, worst)
    elif type(a) is not type(b) or a != b:
        problems.append(f"{path}: {a!r} != {b!r}")


def main():
    parser = argparse.ArgumentParser(description=__doc__.splitlines()[0])
    parser.add_argument("a")
    parser.add_argument("b")
    parser.add_argument("--rtol", type=float, default=1e-9)
    parser.add_argument("--atol", type=float, default=1e-12)
    parser.add_argument("--ignore", nargs="*", default=[])
    opts = parser.parse_args()
    docs = []
    for name in (opts.a, opts.b):
        with open(name, encoding="utf-8") as f:
            docs.append(json.load(f))
    problems, worst = [], [0.0, None]
    compare(docs[0], docs[1], "$", opts, problems, worst)
    print(f"largest relative difference {worst[0]:.3g}" + (f" at {worst[1]}" if worst[1] else ""))
    for p in problems[:40]:
        print("  " + p)
    if len(problems) > 40:
        print(f"  ... and {len(problems) - 40} more")
    return 1 if problems else 0


if __name__ == "__main__":
    sys.exit(main())
