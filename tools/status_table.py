#!/usr/bin/env python3
"""Renders the status table of include/qdm_status.h as a Markdown page.

The header's QDM_STATUS_TABLE is the one list of codes and texts: the library's
qdm_status_text() is compiled from it and the reference's status page is made
from it here, so the two cannot drift apart.

    tools/status_table.py include/qdm_status.h > status.md
"""
import re
import sys


def entries(header_text):
    body = header_text.split("#define QDM_STATUS_TABLE(X)", 1)[1]
    body = body.split("#define QDM_STATUS_ENUM_ENTRY", 1)[0].replace("\\\n", " ")
    for m in re.finditer(r'X\(\s*(\w+)\s*,\s*(-?\d+)\s*,((?:\s*"(?:[^"\\]|\\.)*")+)\s*\)', body):
        text = "".join(re.findall(r'"((?:[^"\\]|\\.)*)"', m.group(3)))
        yield m.group(1), int(m.group(2)), text


def main():
    rows = list(entries(open(sys.argv[1]).read()))
    if not rows:
        sys.exit("no status entries found")
    print("# Status codes\n")
    print("Every status a qdm function returns. 0 is success, 20001 and 20002 warnings")
    print("(plain C API only: complete results, NaN errors for the modes 20002 names),")
    print("negative codes errors. The host face")
    print("also returns -42400 - e when the host's `NumericArrayResize` fails with e.\n")
    print("| name | code | meaning |")
    print("|---|---:|---|")
    for name, code, text in rows:
        print(f"| `{name}` | {code} | {text} |")


if __name__ == "__main__":
    main()
