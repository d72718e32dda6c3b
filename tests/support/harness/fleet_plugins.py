"""The Python code of the collection, as modules that a test can call without Ansible."""

import sys
from importlib.machinery import SourceFileLoader
from types import ModuleType

from harness import REPOSITORY


def load(path):
    """The module at `path` below the plugins, newly made; load what it imports from there first."""
    source = REPOSITORY / "fleet/plugins" / path
    package = source.parent.name
    name = f"{package}.{source.stem}"
    module = ModuleType(name)
    module.__package__ = package
    sys.modules[name] = module
    SourceFileLoader(name, str(source)).exec_module(module)
    return module
