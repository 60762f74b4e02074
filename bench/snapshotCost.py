#!/usr/bin/env python3
"""What a series of snapshots costs: the processor's time of 30 snapshots, a second apart, in percent of one processor.

    bench/snapshotCost.py [PROGRAM] [COUNT]        default: build/release/tools/tav, 30
"""
import pathlib
import resource
import subprocess
import sys
import tempfile
import time


def main():
    program = sys.argv[1] if len(sys.argv) > 1 else "build/release/tools/tav"
    count = sys.argv[2] if len(sys.argv) > 2 else "30"
    processes = sum(1 for entry in pathlib.Path("/proc").iterdir() if entry.name.isdigit())
    with tempfile.TemporaryDirectory() as folder:
        path = pathlib.Path(folder, "series.tav")
        begin = time.monotonic()
        subprocess.run([program, "snapshot", "--append", "--every", "1s", "--count", count, "-o", path], check=True)
        whole = time.monotonic() - begin
        size = path.stat().st_size
    used = resource.getrusage(resource.RUSAGE_CHILDREN)
    busy = used.ru_utime + used.ru_stime
    print(f"{count} snapshots in {whole:.1f} s, {processes} processes: {busy * 1000:.0f} ms of a processor, "
          f"{busy * 1000 / int(count):.2f} ms each, {busy * 100 / whole:.2f} %; {size / int(count):.0f} bytes each")


if __name__ == "__main__":
    main()
