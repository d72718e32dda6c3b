"""Runs zorctl, the companion tool, on a machine.

The environment variable ZORCTL names the binary under test. The schemas that the sources carry
validate all JSON that it prints.
"""

import json
import os

import jsonschema

from harness.machine import ROOT

BINARY = "/media/zorctl"
SCHEMAS = os.path.join(os.path.dirname(__file__), "../../../src/tools/zorctl/schema")


def zorctl(machine, *arguments, user=ROOT, environment=None, tool=(), everywhere=False):
    """The outcome of zorctl with `arguments`, run under the command `tool`."""
    if not machine.exists(BINARY):
        machine.plant(BINARY)
    binary = os.path.realpath(os.environ["ZORCTL"])
    return machine.execute(
        [*tool, BINARY, *arguments],
        user,
        0o022,
        environment,
        ("--ro-bind", binary, BINARY),
        everywhere,
    )


def schema(name):
    with open(os.path.join(SCHEMAS, name + ".json"), encoding="utf-8") as file:
        return json.load(file)


def closed(value):
    """The schema `value`, by which an object has no other members than those that it names."""
    if isinstance(value, list):
        return [closed(one) for one in value]
    if not isinstance(value, dict):
        return value
    copy = {name: closed(one) for name, one in value.items()}
    if isinstance(copy.get("properties"), dict):
        copy.setdefault("additionalProperties", False)
    return copy


def report(machine, command, *arguments, status=0, **options):
    """What `command` prints as JSON, checked against its schema, as an object."""
    outcome = zorctl(machine, command, "--json", *arguments, **options)
    assert outcome.status == status, (outcome.status, outcome.stdout, outcome.stderr)
    assert outcome.stderr == ""
    found = json.loads(outcome.stdout)
    jsonschema.Draft7Validator(closed(schema(command))).validate(found)
    return found
