"""JUnit XML reports of sequence runs: one test suite per phone, one test case per step."""

from xml.etree import ElementTree


def suite(name, steps, outcomes, unreachable=None):
    """The suite of one phone. Steps that ran are cases with a failure (a wrong answer) or an
    error (the connection was lost); steps never run are skipped. `unreachable` is the reason
    the phone could not be reached: one `connect` case with that error, every step skipped."""
    errors = sum(o.lost for o in outcomes) + (unreachable is not None)
    failures = sum(not o.passed and not o.lost for o in outcomes)
    node = ElementTree.Element(
        "testsuite", name=name, tests=str(len(steps) + (unreachable is not None)),
        failures=str(failures), errors=str(errors), skipped=str(len(steps) - len(outcomes)),
        time=f"{sum(o.elapsed for o in outcomes):.3f}")
    if unreachable is not None:
        case = ElementTree.SubElement(node, "testcase", classname=name, name="connect", time="0")
        ElementTree.SubElement(case, "error", message=unreachable)
    for outcome in outcomes:
        case = ElementTree.SubElement(
            node, "testcase", classname=name,
            name=f"{outcome.step.line_no}: {outcome.command or outcome.step.name}",
            time=f"{outcome.elapsed:.3f}")
        if not outcome.passed:
            kind = "error" if outcome.lost else "failure"
            problem = ElementTree.SubElement(case, kind, message=outcome.message)
            if outcome.answer is not None:
                problem.text = outcome.answer.raw.replace(b"\0", b"").decode("latin-1")
    why = "the phone could not be reached" if unreachable is not None else "an earlier step failed"
    for step in steps[len(outcomes):]:
        case = ElementTree.SubElement(node, "testcase", classname=name,
                                      name=f"{step.line_no}: {step.name}", time="0")
        ElementTree.SubElement(case, "skipped", message=why)
    return node


def write(path, suites):
    tree = ElementTree.ElementTree(ElementTree.Element("testsuites"))
    tree.getroot().extend(suites)
    ElementTree.indent(tree)
    tree.write(path, encoding="utf-8", xml_declaration=True)
