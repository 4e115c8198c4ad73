"""A station that does nothing but record: ``URL DIRECTORY NAME COUNT``, a process.

It says ``recorded N`` when N records are on the disk, and ends when all are delivered.
"""

from __future__ import annotations

import sys
from pathlib import Path

from store_bench import record, step, until

from amt_line.run.record import Document, document_text
from amt_line.run.record_file import RecordFile, file_name
from amt_line.store import Delivery

RUNNING: Document = {"state": "running", "verdict": None, "exit_status": None, "ended": None,
                     "seconds": None, "steps": []}


def main(url: str, directory: str, name: str, count: str) -> None:
    """Record, hand on, and wait until the store has it all."""
    folder = Path(directory)
    delivery = Delivery(url, folder, pauses=(0.05, 0.2))
    for number in range(int(count)):
        document = record(number, station=name, dut=f"{name}-{number}",
                          steps=[step(1), step(2), step(3)])
        file = RecordFile(folder, file_name(document["dut"], document["began"], document["run"]),
                          document_text({**document, **RUNNING}))
        file.put(document_text(document))
        file.close()
        delivery.recorded(file.path)
        print("recorded", number + 1, flush=True)
    until(lambda: delivery.state == "ok" and delivery.standing.behind == 0)
    delivery.close()
    print(*delivery.lines(), "done", flush=True)


if __name__ == "__main__":
    main(*sys.argv[1:])
