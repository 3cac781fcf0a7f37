"""Multi-up: one sequence on many phones at once, one thread per phone, one live status line
per phone, a summary table and one JUnit report with a suite per phone (named by its target)."""

import sys
import threading
import time
from dataclasses import dataclass, field

from . import junit, sequence
from .api import connect
from .errors import StationError

EXIT_OK, EXIT_FAILED, EXIT_UNREACHABLE = 0, 1, 2


@dataclass
class PhoneRun:
    target: str
    outcomes: list = field(default_factory=list)
    unreachable: str | None = None  # why the phone could not be reached
    elapsed: float = 0.0

    @property
    def passed(self):
        return sum(o.passed for o in self.outcomes)

    @property
    def failed(self):
        return sum(not o.passed for o in self.outcomes)

    def verdict(self, total):
        if self.unreachable is not None:
            return "unreachable"
        if any(o.lost for o in self.outcomes):
            return "lost"
        return "passed" if self.passed == total else "failed"


def read_targets(path):
    """One URL or device per line; blank lines and `#` comments are skipped."""
    with open(path) as source:
        return [line for line in (raw.split("#", 1)[0].strip() for raw in source) if line]


class StatusBoard:
    """One line per phone. On a terminal the lines are rewritten in place as steps finish;
    elsewhere each phone's line is printed once, when it is done."""

    def __init__(self, targets, out=None):
        self.out = out or sys.stdout
        self.live = self.out.isatty()
        self.width = max(len(t) for t in targets)
        self.lines = [f"{t:<{self.width}}  connecting" for t in targets]
        self.lock = threading.Lock()
        if self.live:
            self.out.write("\n".join(self.lines) + "\n")
            self.out.flush()

    def show(self, index, text, done=False):
        with self.lock:
            self.lines[index] = line = f"{self.lines[index][:self.width]}  {text}"
            if self.live:
                up = len(self.lines) - index
                self.out.write(f"\x1b[{up}A\r\x1b[2K{line}\x1b[{up}B\r")
            elif done:
                self.out.write(line + "\n")
            self.out.flush()


def run_one(target, steps, options, board, index):
    """Runs the steps on one phone and returns its PhoneRun; never raises."""
    run = PhoneRun(target)
    started = time.monotonic()

    def report(outcome):
        run.outcomes.append(outcome)
        board.show(index, f"step {len(run.outcomes)}/{len(steps)}  {run.passed} passed  "
                          f"{run.failed} failed  {outcome.command or outcome.step.name}")

    try:
        with connect(target, **options) as phone:
            sequence.run(phone, steps, report=report)
    except StationError as e:
        run.unreachable = str(e)
    run.elapsed = time.monotonic() - started
    detail = f"  {run.unreachable}" if run.unreachable else ""
    board.show(index, f"{run.verdict(len(steps)).upper()}  {run.passed}/{len(steps)} passed  "
                      f"{run.elapsed:.1f} s{detail}", done=True)
    return run


def run_all(targets, steps, options, out=None):
    """Runs `steps` on every target at once; returns one PhoneRun per target, in order."""
    board = StatusBoard(targets, out)
    runs = [None] * len(targets)

    def one(index, target):
        runs[index] = run_one(target, steps, options, board, index)

    threads = [threading.Thread(target=one, args=(i, t), name=f"phone {t}", daemon=True)
               for i, t in enumerate(targets)]
    for thread in threads:
        thread.start()
    for thread in threads:
        thread.join()
    return runs


def summary(runs, total):
    """The table printed at the end: phone, passed and failed steps, time, verdict."""
    width = max(len("phone"), *(len(r.target) for r in runs))
    rows = [f"{'phone':<{width}}  passed  failed  not run    time  result"]
    for run in runs:
        rows.append(f"{run.target:<{width}}  {run.passed:>6}  {run.failed:>6}  "
                    f"{total - len(run.outcomes):>7}  {run.elapsed:>5.1f} s  "
                    f"{run.verdict(total)}")
    return "\n".join(rows)


def exit_status(runs, total):
    """2 when any phone could not be reached (or went away), else 1 when any failed, else 0."""
    verdicts = {run.verdict(total) for run in runs}
    if verdicts & {"unreachable", "lost"}:
        return EXIT_UNREACHABLE
    return EXIT_OK if verdicts == {"passed"} else EXIT_FAILED


def write_junit(path, runs, steps):
    junit.write(path, [junit.suite(run.target, steps, run.outcomes, run.unreachable)
                       for run in runs])
