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
from dataclasses import dataclass, field
from xml.etree import ElementTree

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


def run(station, steps, report=print):
    """Runs the steps in order; returns the outcomes of those that ran."""
    values, outcomes = {}, []
    for step in steps:
        started = time.monotonic()
        if step.wait is not None:
            time.sleep(step.wait)
            outcome = Outcome(step, True, time.monotonic() - started)
        else:
            outcome = _run_command(station, step, values)
        outcomes.append(outcome)
        report(_describe(outcome))
        if not outcome.passed and not step.go_on:
            break
    return outcomes


def _run_command(station, step, values):
    try:
        command = _substitute(step.command, values, step)
    except SequenceError as e:
        return Outcome(step, False, 0.0, str(e), command=step.command)
    answer = station.ask(command, timeout=step.timeout, idle=step.idle)
    body = "\n".join(answer.lines)
    problems = []
    if answer.timed_out:
        problems.append("no answer before the time-out")
    elif answer.result != step.expect:
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
            values[name] = answer.value()
    return Outcome(step, not problems, answer.elapsed, "; ".join(problems), answer, command)


def _show(word):
    return "none" if word is None else repr(word)


def _describe(outcome):
    verdict = "PASS" if outcome.passed else "FAIL"
    name = outcome.command or outcome.step.name
    line = f"{verdict}  {name}  ({outcome.elapsed * 1000:.0f} ms)"
    return line + (f"  {outcome.message}" if outcome.message else "")


def junit(outcomes, total_steps, suite_name):
    """A JUnit XML report: one test case per step; steps never run are reported skipped."""
    failures = sum(not o.passed for o in outcomes)
    skipped = total_steps - len(outcomes)
    suite = ElementTree.Element("testsuite", name=suite_name, tests=str(total_steps),
                                failures=str(failures), errors="0", skipped=str(skipped),
                                time=f"{sum(o.elapsed for o in outcomes):.3f}")
    for outcome in outcomes:
        case = ElementTree.SubElement(
            suite, "testcase", classname=suite_name,
            name=f"{outcome.step.line_no}: {outcome.command or outcome.step.name}",
            time=f"{outcome.elapsed:.3f}")
        if not outcome.passed:
            failure = ElementTree.SubElement(case, "failure", message=outcome.message)
            if outcome.answer is not None:
                failure.text = outcome.answer.raw.replace(b"\0", b"").decode("latin-1")
    return suite


def junit_steps_skipped(suite, steps, ran):
    for step in steps[ran:]:
        case = ElementTree.SubElement(suite, "testcase", classname=suite.get("name"),
                                      name=f"{step.line_no}: {step.name}", time="0")
        ElementTree.SubElement(case, "skipped", message="an earlier step failed")
    return suite


def write_junit(path, outcomes, steps, suite_name):
    suite = junit_steps_skipped(junit(outcomes, len(steps), suite_name), steps, len(outcomes))
    tree = ElementTree.ElementTree(ElementTree.Element("testsuites"))
    tree.getroot().append(suite)
    ElementTree.indent(tree)
    tree.write(path, encoding="utf-8", xml_declaration=True)
