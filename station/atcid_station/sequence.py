"""Scripted test sequences: a plain text file, one step a line.

    # comment
    AT+JVMODEL=0   expect=OK  body~='"QM\\d+"'  save=model
    AT+JVRAM=0     timeout=5
    wait 1.5
    AT+JVPROP=1,persist.test,${model}  continue

A step is a command line followed by options, split as a shell would (quotes group):
  expect=WORD   the result word: OK (the default), ERROR, "Not Implement", UNKNOWN, empty
                (`expect=` for a body-only answer) or none (no result word at all)
  body=TEXT     the body's lines joined by newlines must equal TEXT
  body~=REGEX   the body (lines joined by newlines) must match REGEX (re.search)
  timeout=SEC   how long to wait for the answer (default: the tool's --timeout)
  idle=SEC      the quiet time that ends a body-only or self-answering reply
  save=NAME     remember the answer's value (the quoted text, else the first line); with
                save=NAME:REGEX remember REGEX's first group in the body instead
  continue      a failure of this step does not stop the sequence
`wait SEC` pauses. `${NAME}` in a command or an expected text is replaced by a saved value.
"""

import re
import shlex
import time
from dataclasses import dataclass

from .errors import ConnectionLost, TimedOut

_WORDS = {"ok": "OK", "error": "ERROR", "not implement": "Not Implement",
          "unknown": "UNKNOWN", "": "", "none": None}


class SequenceError(Exception):
    pass


@dataclass
class Step:
    line_no: int
    command: str = ""
    wait: float | None = None
    expect: str | None = "OK"
    body: str | None = None
    body_regex: str | None = None
    timeout: float | None = None
    idle: float | None = None
    save: tuple | None = None
    go_on: bool = False

    @property
    def name(self):
        return f"wait {self.wait:g}" if self.wait is not None else self.command


@dataclass
class Outcome:
    step: Step
    passed: bool
    elapsed: float
    message: str = ""
    answer: object = None
    command: str = ""
    lost: bool = False  # the connection ended: the phone went away during this step

    def __str__(self):
        verdict = "PASS" if self.passed else "FAIL"
        line = f"{verdict}  {self.command or self.step.name}  ({self.elapsed * 1000:.0f} ms)"
        return line + (f"  {self.message}" if self.message else "")


def parse(source, where="<sequence>"):
    steps = []
    for number, line in enumerate(source.splitlines(), 1):
        if not line.strip() or line.lstrip().startswith("#"):
            continue
        try:
            words = shlex.split(line, comments=True)
        except ValueError as e:
            raise SequenceError(f"{where}:{number}: {e}") from None
        if not words:
            continue
        steps.append(_step(words, number, where))
    return steps


def _step(words, number, where):
    def fail(text):
        raise SequenceError(f"{where}:{number}: {text}")

    step = Step(number)
    if words[0].lower() == "wait":
        if len(words) != 2:
            fail("wait takes one number of seconds")
        step.wait = _seconds(words[1], fail)
        return step
    if not words[0].upper().startswith("AT"):
        fail(f"a step is a command beginning with AT or 'wait', not {words[0]!r}")
    step.command = words[0]
    for word in words[1:]:
        key, eq, value = word.partition("=")
        if word == "continue":
            step.go_on = True
        elif key == "expect" and eq:
            if value.lower() not in _WORDS:
                fail(f"unknown result word {value!r}")
            step.expect = _WORDS[value.lower()]
        elif key == "body" and eq:
            step.body = value
        elif key == "body~" and eq:
            _compile(value, fail)
            step.body_regex = value
        elif key in ("timeout", "idle") and eq:
            setattr(step, key, _seconds(value, fail))
        elif key == "save" and eq:
            name, _, pattern = value.partition(":")
            if not name.isidentifier():
                fail(f"bad name to save {name!r}")
            if pattern:
                _compile(pattern, fail)
            step.save = (name, pattern or None)
        else:
            fail(f"unknown option {word!r}")
    return step


def _seconds(value, fail):
    try:
        seconds = float(value)
    except ValueError:
        seconds = -1.0
    if not seconds >= 0:
        fail(f"not a number of seconds: {value!r}")
    return seconds


def _compile(pattern, fail):
    try:
        return re.compile(pattern)
    except re.error as e:
        fail(f"bad regular expression {pattern!r}: {e}")


def _substitute(text, values, step):
    def one(match):
        name = match.group(1)
        if name not in values:
            raise SequenceError(f"line {step.line_no}: ${{{name}}} was never saved")
        return values[name]

    return re.sub(r"\$\{([A-Za-z_][A-Za-z0-9_]*)\}", one, text)


def run(phone, steps, report=print):
    """Runs the steps on `phone` (an api.Phone) in order and hands each Outcome to `report` as
    it is made (printed, it reads PASS or FAIL, the command, time and problem); returns the
    outcomes of the steps that ran. A lost connection ends the run with an outcome marked
    `lost`."""
    values, outcomes = {}, []
    for step in steps:
        started = time.monotonic()
        if step.wait is not None:
            time.sleep(step.wait)
            outcome = Outcome(step, True, time.monotonic() - started)
        else:
            outcome = _run_command(phone, step, values)
        outcomes.append(outcome)
        report(outcome)
        if outcome.lost or (not outcome.passed and not step.go_on):
            break
    return outcomes


def _run_command(phone, step, values):
    try:
        command = _substitute(step.command, values, step)
    except SequenceError as e:
        return Outcome(step, False, 0.0, str(e), command=step.command)
    started = time.monotonic()
    try:
        answer = phone.command(command, timeout=step.timeout, idle=step.idle)
    except TimedOut as e:
        return Outcome(step, False, e.answer.elapsed, str(e), e.answer, command)
    except ConnectionLost as e:
        return Outcome(step, False, time.monotonic() - started, str(e), None, command, lost=True)
    body = "\n".join(answer.lines)
    problems = []
    if answer.result != step.expect:
        problems.append(f"result {_show(answer.result)}, expected {_show(step.expect)}")
    if step.body is not None and body != _substitute(step.body, values, step):
        problems.append(f"body {body!r} differs from {step.body!r}")
    if step.body_regex is not None and not re.search(step.body_regex, body):
        problems.append(f"body {body!r} does not match {step.body_regex!r}")
    if step.save and not problems:
        name, pattern = step.save
        if pattern:
            match = re.search(pattern, body)
            if match is None:
                problems.append(f"nothing to save: {pattern!r} does not match")
            else:
                values[name] = match.group(1) if match.groups() else match.group(0)
        else:
            values[name] = answer.value
    return Outcome(step, not problems, answer.elapsed, "; ".join(problems), answer, command)


def _show(word):
    return "none" if word is None else repr(word)
