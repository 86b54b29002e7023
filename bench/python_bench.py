#!/usr/bin/env python3
"""Times kestcalmorph.read against the C++ read of the same file, getting every NUMERIC value as
numpy arrays, and lxml parsing the file when lxml is installed. Fastest of N runs each.

    bench/python_bench.py BUILD_DIR [ITEMS] [N]     (BUILD_DIR: a release build with the bench)
"""

import os
import subprocess
import sys
import time


def best(function, n):
    times = []
    for _ in range(n):
        start = time.perf_counter()
        function()
        times.append((time.perf_counter() - start) * 1000)
    return min(times)


def main():
    build = os.path.abspath(sys.argv[1])
    items = int(sys.argv[2]) if len(sys.argv) > 2 else 60000
    n = int(sys.argv[3]) if len(sys.argv) > 3 else 3
    sys.path.insert(0, os.path.join(build, "python"))
    import kestcalmorph as k
    import numpy as np

    path = os.path.join(build, f"python_bench_{items}.cdf")
    if not os.path.exists(path):
        subprocess.run([os.path.join(build, "bench", "cdfgen"), "--items", str(items), path],
                       check=True)
    size_mb = os.path.getsize(path) / 1e6
    cpp = float(subprocess.run([os.path.join(build, "bench", "read_time"), path, str(n)],
                               check=True, capture_output=True, text=True).stdout)
    py = best(lambda: k.read(path, offline=True), n)
    data = k.read(path, offline=True)

    def all_values():
        out = []
        for cal_list in data.lists:
            for item in cal_list.items:
                if item.format == "NUMERIC":
                    out.append(item.values)
        return out

    arrays = all_values()
    values = best(all_values, n)
    print(f"file: {items} items, {size_mb:.1f} MB, {sum(np.size(a) for a in arrays)} numbers")
    print(f"C++ read (KestCalmorph, validated)      {cpp:9.1f} ms")
    print(f"kestcalmorph.read (validated)           {py:9.1f} ms   {py / cpp:.2f}x the C++ read")
    print(f"every NUMERIC value as numpy arrays     {values:9.1f} ms   "
          f"+{values / cpp:.2f}x the C++ read")
    try:
        from lxml import etree
        lx = best(lambda: etree.parse(path), n)
        print(f"lxml etree.parse (not validated)        {lx:9.1f} ms   {lx / cpp:.2f}x the C++ read")
    except ImportError:
        print("lxml: not installed (python3-lxml)")


if __name__ == "__main__":
    main()
