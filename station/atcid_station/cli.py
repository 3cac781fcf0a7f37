"""atcid-station: talk to a phone (or the emulated phone) as a test station does.

    atcid-station tcp://127.0.0.1 AT+JVMODEL=0 AT+JVRAM=0     one-shot
    atcid-station /dev/ttyUSB0                                 interactive prompt
    atcid-station tcp://127.0.0.1 run checks.seq --junit report.xml
    atcid-station tcp://127.0.0.1 push firmware.bin fw.bin
    atcid-station run checks.seq tcp://127.0.0.1:6888 tcp://127.0.0.1:6889 --junit report.xml
    atcid-station run checks.seq --targets phones.txt          multi-up: all phones at once

Exit status: 0 when every answer's result word is OK (every step passed on every phone),
1 otherwise, 2 when a phone cannot be reached (or goes away) or the input is unusable.
"""

import argparse
import json
import os
import sys
import threading
from pathlib import Path

from . import multiup, sequence
from . import push as push_mod
from .api import connect
from .errors import StationError, TimedOut
from .link import DEFAULT_BAUD
from .station import DEFAULT_IDLE, DEFAULT_TIMEOUT

EXIT_OK, EXIT_FAILED, EXIT_UNREACHABLE = 0, 1, 2


def build_parser():
    parser = argparse.ArgumentParser(
        prog="atcid-station", description=__doc__,
        formatter_class=argparse.RawDescriptionHelpFormatter)
    parser.add_argument("target", help="tcp://HOST[:PORT] (port 6888 by default) or a serial "
                                       "device; or `run` for a multi-up run")
    parser.add_argument("words", nargs="*", metavar="COMMAND",
                        help="AT command lines, or: run SEQUENCE | push LOCAL NAME; after "
                             "`run`: SEQUENCE TARGET...")
    parser.add_argument("--baud", type=int, default=DEFAULT_BAUD, help="serial speed (115200)")
    parser.add_argument("--timeout", type=float, default=DEFAULT_TIMEOUT,
                        help="seconds to wait for each answer (%(default)s)")
    parser.add_argument("--idle", type=float, default=DEFAULT_IDLE,
                        help="quiet seconds that end a body-only or self-answering reply "
                             "(%(default)s)")
    parser.add_argument("--connect-timeout", type=float, default=10.0,
                        help="seconds to wait for a TCP connection (%(default)s)")
    out = parser.add_mutually_exclusive_group()
    out.add_argument("--raw", action="store_true", help="print the exact bytes received")
    out.add_argument("--json", action="store_true", help="one JSON object per answer")
    parser.add_argument("--upper", action="store_true",
                        help="interactive: send what is typed in upper case")
    parser.add_argument("--junit", metavar="FILE", help="run: write a JUnit XML report")
    parser.add_argument("--targets", metavar="FILE",
                        help="multi-up run: more targets, one URL or device a line")
    return parser


def show_answer(answer, args, out):
    if args.raw:
        out.flush()
        out.buffer.write(answer.raw)
        out.buffer.flush()
        return
    if args.json:
        out.write(json.dumps(answer_record(answer)) + "\n")
        return
    for line in answer.unsolicited:
        out.write(f"<< {line}\n")
    if answer.timed_out:
        word = "no answer (timed out)"
    elif answer.result is None:
        word = "no result word"
    else:
        word = answer.result or "(body only)"
    out.write(f"{answer.command} -> {word}  ({answer.elapsed * 1000:.0f} ms)\n")
    for line in answer.lines:
        out.write(f"   {line}\n")
    out.flush()


def answer_record(answer):
    return {
        "command": answer.command, "echo": answer.echo, "body": answer.body,
        "lines": answer.lines, "result": answer.result, "elapsed": round(answer.elapsed, 6),
        "timed_out": answer.timed_out, "unsolicited": answer.unsolicited,
        "raw": answer.raw.decode("latin-1"),
    }


def show_unsolicited(raw, lines, args, out):
    if args.raw:
        out.flush()
        out.buffer.write(raw)
        out.buffer.flush()
    elif args.json:
        for line in lines:
            out.write(json.dumps({"unsolicited": line}) + "\n")
    else:
        for line in lines:
            out.write(f"<< {line}\n")
    out.flush()


def one_shot(phone, commands, args):
    phone.station.on_unsolicited = (
        lambda raw, lines: show_unsolicited(raw, lines, args, sys.stdout))
    every_ok = True
    for command in commands:
        try:
            answer = phone.command(command)
        except TimedOut as e:
            answer = e.answer
        show_answer(answer, args, sys.stdout)
        every_ok &= answer.ok
    return EXIT_OK if every_ok else EXIT_FAILED


def interactive(phone, args):
    import readline  # noqa: F401  line editing and history for input()

    station = phone.station
    lock = threading.Lock()
    stop = threading.Event()

    def printer():
        # Stream lines that arrive while no command waits for its answer.
        while not stop.is_set():
            with station.link.cond:
                station.link.cond.wait(0.2)
            if lock.acquire(blocking=False):
                try:
                    station.drain()
                finally:
                    lock.release()

    station.on_unsolicited = lambda raw, lines: show_unsolicited(raw, lines, args, sys.stdout)
    thread = threading.Thread(target=printer, daemon=True)
    thread.start()
    print(f"connected to {station.link.name}; Ctrl-D or Ctrl-C leaves")
    try:
        while True:
            try:
                line = input("atcid> ").strip()
            except EOFError:
                print()
                break
            if not line:
                continue
            with lock:
                answer = station.ask(line.upper() if args.upper else line)
            show_answer(answer, args, sys.stdout)
    except KeyboardInterrupt:
        print()
    finally:
        stop.set()
        thread.join(timeout=1)
    return EXIT_OK


def run_sequence(phone, path, args):
    run = phone.run(path, junit_path=args.junit, report=print)
    failed = sum(not o.passed for o in run.outcomes)
    print(f"{len(run.outcomes) - failed} passed, {failed} failed, "
          f"{len(run.steps) - len(run.outcomes)} not run")
    if run.lost:
        return EXIT_UNREACHABLE
    return EXIT_OK if run.passed else EXIT_FAILED


def multi_up(words, args, options):
    """`run SEQUENCE TARGET...`: the sequence on every target at once."""
    if not words:
        raise ValueError("run takes a sequence file and targets")
    targets = words[1:] + (multiup.read_targets(args.targets) if args.targets else [])
    if not targets:
        raise ValueError("run: no target (give them after the sequence or with --targets)")
    steps = sequence.parse(Path(words[0]).read_text(), where=words[0])
    runs = multiup.run_all(targets, steps, options)
    if args.junit:
        multiup.write_junit(args.junit, runs, steps)
    print(multiup.summary(runs, len(steps)))
    return multiup.exit_status(runs, len(steps))


def push_file(phone, local, name, args):
    size = os.path.getsize(local)
    bar = push_mod.Progress(size)
    pushed = phone.push(local, name, progress=lambda done, total: bar.update(done, done == total))
    show_answer(pushed.sent, args, sys.stdout)
    if pushed.verified is None:
        print(f"push: the phone refused the file ({pushed.sent.result or 'no result word'})")
        return EXIT_FAILED
    show_answer(pushed.verified, args, sys.stdout)
    if pushed.ok:
        print(f"push: /data/{name.lower()} stored, {size} bytes, MD5 verified")
        return EXIT_OK
    print(f"push: MD5 check failed, the phone computed {pushed.verified.value or 'nothing'}")
    return EXIT_FAILED


def main(argv=None):
    args = build_parser().parse_intermixed_args(argv)
    options = dict(baud=args.baud, connect_timeout=args.connect_timeout, idle=args.idle,
                   timeout=args.timeout)
    words = args.words
    if args.target == "run":
        try:
            return multi_up(words, args, options)
        except (ValueError, OSError, sequence.SequenceError) as e:
            print(f"atcid-station: {e}", file=sys.stderr)
            return EXIT_UNREACHABLE
    action = words[0] if words and words[0] in ("run", "push") else None
    try:
        if action == "run" and len(words) != 2:
            raise ValueError("run takes one sequence file")
        if action == "push":
            if len(words) != 3:
                raise ValueError("push takes a local file and a name on the phone")
            push_mod.check_name(words[2])
            if not os.path.isfile(words[1]):
                raise ValueError(f"{words[1]}: no such file")
        steps_path = words[1] if action == "run" else None
        if steps_path:
            sequence.parse(Path(steps_path).read_text(), where=steps_path)
    except (ValueError, OSError, sequence.SequenceError) as e:
        print(f"atcid-station: {e}", file=sys.stderr)
        return EXIT_UNREACHABLE
    try:
        with connect(args.target, **options) as phone:
            if action == "run":
                return run_sequence(phone, words[1], args)
            if action == "push":
                return push_file(phone, words[1], words[2], args)
            if words:
                return one_shot(phone, words, args)
            return interactive(phone, args)
    except StationError as e:
        print(f"atcid-station: {e}", file=sys.stderr)
        return EXIT_UNREACHABLE
