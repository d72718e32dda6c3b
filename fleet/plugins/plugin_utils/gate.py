"""Whether a roll-out goes on after a batch.

Every host of a batch that did not prove its health counts as failed, whatever kept it from that: a
failed task, no connection, or no answer at all. Ansible's own limits leave unreachable hosts out.
"""

HEALTHY, FAILED, WAITING = "healthy", "failed", "waiting"


def outcome_of(variables, rollback=False):
    """What became of one host of the batch that just ended: its state, and details.

    `variables` are the host's own: the results of the installation and of the check of its health.
    In a rollback, a host that keeps a newer version failed.
    """
    installed = variables.get("zor_rollout_installed") or {}
    health = variables.get("zor_rollout_health") or {}
    state = installed.get("after") or installed.get("before") or {}
    details = {
        "version": state.get("version"),
        "build_date": state.get("build_date"),
        "reason": installed.get("reason"),
        "operation": installed.get("operation"),
        "changed": bool(installed.get("changed")),
        "message": None,
    }
    message = message_of(installed)
    if not message and rollback and was_refused(installed):
        message = "a newer version is installed, and an older one cannot replace it"
    if not message and not health.get("skipped"):
        message = message_of(health)
    return dict(details, state=FAILED if message else HEALTHY, message=message)


def was_refused(installed):
    """True if the host keeps a version that is newer than the programs."""
    return installed.get("reason") == "newer-installed" or (
        installed.get("operation") == "registration"
    )


def message_of(result):
    """Why a result is a failure; None if it is not."""
    if not result:
        return "did not report back"
    if result.get("unreachable"):
        return "unreachable: " + first_line(result.get("msg"))
    if result.get("failed"):
        texts = [first_line(result.get(key)) for key in ("stdout", "stderr", "msg")]
        return next(filter(None, texts), "failed")
    return None


def first_line(text):
    lines = [line.strip() for line in str(text or "").splitlines() if line.strip()]
    return lines[0] if lines else ""


def closes(outcomes, is_canary, limit):
    """Whether a batch with these outcomes ends the roll-out.

    A canary must not fail at all; of another batch, `limit` percent may.
    """
    failed = sum(1 for outcome in outcomes.values() if outcome["state"] == FAILED)
    if is_canary:
        return failed > 0
    return failed * 100 > limit * len(outcomes)
