"""The options that the program takes, found by running it."""

import string

# One line for each option: the first complaint of a run with it. Every run ends with one: "-?" is
# not an option, nor is "%" if the option has taken "-?" as its argument.
ASK = """
for letter; do
    for before in '' -eeo; do
        "$0" r ABC $before "-$letter" '-?' % 2>&1 >/dev/null | head -1 | grep . || echo other
    done
done
"""


def parser_options(machine):
    """Every option of one letter, mapped to whether it wants an argument.

    Those that are only understood after "-eeo" are called "-eeo -l" and so on.
    """
    letters = sorted(set(string.printable) - set(string.whitespace))
    answers = machine.run_in_shell(ASK, *letters).stdout.splitlines()
    assert len(answers) == 2 * len(letters)

    options = {}
    for letter, plain, extended in zip(letters, answers[::2], answers[1::2]):
        unknown = f"Invalid option: -{letter}"
        if plain != unknown:
            options[f"-{letter}"] = plain != "Invalid option: -?"
        elif extended != unknown:
            options[f"-eeo -{letter}"] = extended != "Invalid option: -?"
    return options
