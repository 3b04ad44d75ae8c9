"""What rates.py has found, as a table, and as the data of the plot beside it.

usage: rates_table.py FILE
"""

import json
import pathlib
import statistics
import sys


def main():
    file = pathlib.Path(sys.argv[1])
    found = json.loads(file.read_text())
    callers = list(next(iter(found.values()))["rates"])
    heads = "".join(f" {number} caller{'s' if number != '1' else ''} |" for number in callers)
    print(f"| Requests a second |{heads} Processor, a request | Peak memory |")
    print("|---" * (len(callers) + 3) + "|")
    data = [["way", *callers]]
    for way, known in found.items():
        medians = [statistics.median(known["rates"][number]) for number in callers]
        print(f"| {way} |{''.join(f' {rate:.0f} |' for rate in medians)} "
              f"{statistics.median(known['processor_ms']):.2f} ms | "
              f"{known['peak_kib'] / 1024:.1f} MiB |")
        data.append([way, *(f"{rate:.1f}" for rate in medians)])
    # A column a way, a row a number of callers.
    rows = ("\t".join(row) for row in zip(*data))
    file.with_suffix(".csv").write_text("\n".join(rows) + "\n")


if __name__ == "__main__":
    main()
