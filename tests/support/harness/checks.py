"""Comparisons that show both sides in full when they fail."""

import difflib


def same_text(actual, expected, what="text"):
    """Compares two texts."""
    if actual == expected:
        return
    difference = "\n".join(
        difflib.unified_diff(
            expected.splitlines(), actual.splitlines(), "expected", "actual", lineterm="", n=2
        )
    )
    raise AssertionError(
        f"\n{what} expected:\n{expected}\n{what} found:\n{actual}\ndifference:\n{difference}\n"
    )


def same_lines(actual, expected, what="lines"):
    """Compares two lists of texts."""
    same_text(
        "".join(line + "\n" for line in actual), "".join(line + "\n" for line in expected), what
    )


def printed(outcome, expected, status=0, stderr=""):
    """Checks the output streams of a run, and its exit status."""
    same_text(outcome.stdout, expected, "standard output")
    same_text(outcome.stderr, stderr, "standard error")
    assert outcome.status == status, f"exit status expected: {status}, found: {outcome.status}"


def printed_lines(outcome, *lines):
    """Checks that the output holds `lines`, one right after the other."""
    block = "".join(line + "\n" for line in lines)
    if "\n" + block not in "\n" + outcome.stdout:
        raise AssertionError(
            f"\nlines expected somewhere:\n{block}\noutput found:\n{outcome.stdout}"
        )


def not_printed(outcome, text):
    """Checks that `text` occurs nowhere in the output."""
    if text in outcome.stdout:
        raise AssertionError(f"\ntext not expected:\n{text}\noutput found:\n{outcome.stdout}")


def same_tree(actual, expected):
    """Compares two trees of `Machine.tree`: names, kinds, modes and bytes."""
    if actual == expected:
        return
    lines = []
    for path in sorted(set(actual) | set(expected)):
        before, after = expected.get(path), actual.get(path)
        if before != after:
            lines.append(
                f"{path}\n    expected: {describe(before)}\n    found:    {describe(after)}\n"
            )
    raise AssertionError("\ntrees differ:\n" + "".join(lines))


def describe(node):
    return "nothing" if node is None else f"{node} {node.content!r}"
