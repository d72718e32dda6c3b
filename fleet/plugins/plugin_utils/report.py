"""The report of a roll-out: report.json, the page report.html, and a list of unfinished hosts.

Written after every batch, so that a roll-out that was interrupted has one as well. Each file
appears whole. A roll-out of the same package continues the report that it finds.
"""

import collections
import html
import json
import os

# pylint: disable-next=relative-beyond-top-level
from .gate import FAILED, HEALTHY, WAITING

SCHEMA = 1
UNKNOWN = {
    "state": WAITING,
    "version": None,
    "build_date": None,
    "reason": None,
    "operation": None,
    "changed": False,
    "message": None,
}
STYLE = """
body { font-family: sans-serif; margin: 2em auto; max-width: 60em; padding: 0 1em; color: #222 }
table { border-collapse: collapse; width: 100%; margin-bottom: 2em }
th, td { text-align: left; padding: .3em .6em; border-bottom: 1px solid #ccc; vertical-align: top }
.healthy { color: #060 } .failed { color: #a00 } .waiting { color: #555 }
.bar { display: flex; height: 1.2em; margin-bottom: 2em; background: #ddd }
.bar .healthy { background: #4a4 } .bar .failed { background: #c33 }
"""


def load(directory):
    """The report that is there; empty if there is none."""
    try:
        with open(os.path.join(directory, "report.json"), encoding="utf-8") as file:
            found = json.load(file)
    except FileNotFoundError:
        return {}
    return found if found["schema"] == SCHEMA else {}


def hosts_before(earlier, package, everyone):
    """What is known of all hosts before the first batch.

    A roll-out of the same package goes on where the last one ended. Of another one, the versions
    are what counts.
    """
    hosts = {name: dict(UNKNOWN) for name in everyone}
    for name, host in earlier.get("hosts", {}).items():
        if earlier["package"] == package:
            hosts[name] = host
        elif name in hosts:
            hosts[name].update(version=host["version"], build_date=host["build_date"])
    return hosts


def merge(hosts, outcomes):
    """Adds what became of a batch. A host that could not be asked keeps its version."""
    for name, outcome in outcomes.items():
        if outcome["version"] is None and outcome["state"] == FAILED:
            known = hosts.get(name, UNKNOWN)
            outcome = dict(outcome, version=known["version"], build_date=known["build_date"])
        hosts[name] = outcome


def write(directory, report):
    """Writes the three files for `report`: package, stopped, reason, started, updated, hosts."""
    os.makedirs(directory, exist_ok=True)
    report = {"schema": SCHEMA, **report, "hosts": dict(sorted(report["hosts"].items()))}
    replace(directory, "report.json", json.dumps(report, indent=2) + "\n")
    replace(directory, "report.html", page(report))
    left = [name for name, host in report["hosts"].items() if host["state"] != HEALTHY]
    replace(directory, "unfinished", "".join(name + "\n" for name in left))


def replace(directory, name, text):
    path = os.path.join(directory, name)
    with open(path + ".new", "w", encoding="utf-8") as file:
        file.write(text)
    os.replace(path + ".new", path)


def page(report):
    """The report as one HTML page that needs nothing else."""
    hosts = report["hosts"]
    states = collections.Counter(host["state"] for host in hosts.values())
    total = len(hosts)
    counts = ", ".join(f"{states[state]} {state}" for state in (HEALTHY, FAILED, WAITING))
    end = "Complete." if states[HEALTHY] == total else "Not complete."
    if report["stopped"]:
        end = f"Stopped: {report['reason']}."
    shares = "".join(
        f'<div class="{state}" style="width: {100 * states[state] / total:.1f}%"></div>'
        for state in (HEALTHY, FAILED)
        if states[state]
    )
    versions = collections.Counter(version_of(host) for host in hosts.values())
    failed = {name: host for name, host in hosts.items() if host["state"] == FAILED}
    return f"""<!DOCTYPE html>
<html lang="en">
<head>
<meta charset="utf-8">
<title>Roll-out of {text(report["package"]["name"])}</title>
<style>{STYLE}</style>
</head>
<body>
<h1>Roll-out of {text(report["package"]["name"])}</h1>
<p>SHA-256 {text(report["package"]["sha256"])}<br>
Started {text(report["started"])}, last change {text(report["updated"])}</p>
<p><strong>{total} hosts: {counts}.</strong> {text(end)}</p>
<div class="bar">{shares}</div>
<h2>Failures</h2>
{table(("Host", "Message"), [(name, host["message"]) for name, host in failed.items()])}
<h2>Hosts by version</h2>
{table(("Version", "Hosts"), sorted(versions.items()))}
<h2>All hosts</h2>
{table(("Host", "State", "Version", "What was done"), [row(*item) for item in hosts.items()])}
</body>
</html>
"""


def version_of(host):
    return f"{host['version']} of {host['build_date']}" if host["version"] else "unknown"


def row(name, host):
    if host["state"] == WAITING:
        done = "nothing yet"
    elif host["operation"] in (None, "none"):
        done = host["reason"] or host["state"]
    else:
        done = f"{host['operation']}: {host['reason']}"
    return name, host["state"], version_of(host), done


def table(titles, rows):
    if not rows:
        return "<p>None.</p>"
    head = "".join(f"<th>{title}</th>" for title in titles)
    body = "".join("<tr>" + "".join(cell(value) for value in values) + "</tr>\n" for values in rows)
    return f"<table>\n<tr>{head}</tr>\n{body}</table>"


def cell(value):
    state = f' class="{value}"' if value in (HEALTHY, FAILED, WAITING) else ""
    return f"<td{state}>{text(value)}</td>"


def text(value):
    return html.escape(str(value))
