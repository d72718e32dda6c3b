"""Turns the results of a benchmark into tables: ratios and their goals.

A ratio is the median of the installer over the median of its opponent in the same contest. A goal
for times holds for wall and for CPU time. The pairs of goals are for the 64-bit and the 32-bit
build.
"""

TIME_GOALS = {
    ("install", "typical"): {"unzip": (0.60, 0.62), "7zz": (0.85, 0.85), "bsdtar": (1.00, 1.05),
                             "floor": (1.10, 1.10)},
    ("install", "large"): {"unzip": (0.52, 0.52), "7zz": (0.75, 0.75), "bsdtar": (1.00, 1.00),
                           "floor in pieces": (1.12, 1.12)},
    ("install", "stored"): {"unzip": (0.20, 0.20), "7zz": (0.85, 0.85), "bsdtar": (0.85, 0.85),
                            "floor": (1.10, 1.10)},
    ("install", "many"): {"unzip": (0.60, 0.60), "7zz": (0.62, 0.62), "bsdtar": (0.70, 0.70),
                          "floor": (1.20, 1.20)},
    ("install", "many100k"): {"unzip": (0.62, 0.62), "7zz": (0.60, 0.60), "bsdtar": (0.60, 0.60),
                              "floor": (1.40, 1.40)},
    ("upgrade", "typical"): {"unzip": (0.65, 0.65), "bsdtar": (1.08, 1.08)},
    ("upgrade", "many"): {"unzip": (0.90, 0.90), "bsdtar": (1.00, 1.00)},
    ("removal", "typical"): {"rm -rf": (2.50, 2.50)},
    ("removal", "many"): {"rm -rf": (1.25, 1.25)},
}
# Peak memory: no more than this opponent's; many100k has its own limit, in KiB.
MEMORY_GOALS = {"typical": "unzip", "large": "unzip", "stored": "unzip", "many": "bsdtar"}
MEMORY_LIMITS = {"many100k": 36 * 1024}
FIXED_COST_GOAL = 1.5
INSTRUCTIONS_GOAL = 1.05
FILE_GROWTH_GOAL = 1.15
MEGABYTE_GROWTH_GOAL = 1.10

BITS = {"release": 64, "release-i686": 32}


def ratio(contest, measure):
    return contest["ours"][measure]["median"] / contest["theirs"][measure]["median"]


def verdict(ok):
    return "met" if ok else "MISSED"


def judge(contest):
    """Adds ratios, and goals with their verdicts, to `contest`."""
    contest["ratios"] = {measure: ratio(contest, measure) for measure in ("wall", "cpu", "memory")}
    contest["goals"] = goals = {}
    kind, package, opponent = contest["kind"], contest["package"], contest["opponent"]

    times = TIME_GOALS.get((kind, package), {}).get(opponent)
    if times:
        goals["wall"] = goals["cpu"] = times[0 if BITS[contest["preset"]] == 64 else 1]
    if kind == "fixed cost, commands aside":
        goals["wall"] = FIXED_COST_GOAL
    if kind == "install" and MEMORY_GOALS.get(package) == opponent:
        goals["memory"] = 1.0
    contest["verdicts"] = {measure: contest["ratios"][measure] <= goal
                           for measure, goal in goals.items()}
    if kind == "install" and package in MEMORY_LIMITS:
        goals["memory_limit"] = MEMORY_LIMITS[package]
        contest["verdicts"]["memory_limit"] = (contest["ours"]["memory"]["median"]
                                               <= MEMORY_LIMITS[package])


def table(head, rows):
    """A Markdown table with aligned columns."""
    texts = [head] + [[str(cell) for cell in row] for row in rows]
    widths = [max(len(row[column]) for row in texts) for column in range(len(head))]
    lines = ["| " + " | ".join(cell.ljust(width) for cell, width in zip(row, widths)) + " |"
             for row in texts]
    lines.insert(1, "|" + "|".join("-" * (width + 2) for width in widths) + "|")
    return "\n".join(lines)


def beside_goal(contest, measure):
    """The ratio, followed by the goal and whether it is met."""
    text = f"{contest['ratios'][measure]:.2f}"
    if measure in contest["goals"]:
        text += f" <= {contest['goals'][measure]:.2f} {verdict(contest['verdicts'][measure])}"
    if measure == "memory" and "memory_limit" in contest["goals"]:
        text += (f", {contest['ours']['memory']['median'] / 1024:.1f} MiB <= "
                 f"{contest['goals']['memory_limit'] // 1024} MiB "
                 f"{verdict(contest['verdicts']['memory_limit'])}")
    return text


def contest_table(contests):
    rows = []
    for contest in contests:
        ours, theirs = contest["ours"], contest["theirs"]
        rows.append((contest["package"], contest["kind"], BITS[contest["preset"]],
                     contest["opponent"],
                     f"{ours['wall']['median']:.2f} / {theirs['wall']['median']:.2f}",
                     beside_goal(contest, "wall"), beside_goal(contest, "cpu"),
                     f"{ours['memory']['median']:.0f} / {theirs['memory']['median']:.0f}",
                     beside_goal(contest, "memory")))
    return table(("package", "run", "bits", "beside", "wall, ms", "ratio wall", "ratio CPU",
                  "peak, KiB", "ratio peak"), rows)


def growth_table(results):
    """Time a file, or a megabyte, above the fixed cost of a run."""
    fixed = {measure: min((contest["ours"][measure]["median"] for contest in results["contests"]
                           if contest["kind"] == "fixed cost, whole"
                           and contest["preset"] == "release"), default=0)
             for measure in ("wall", "cpu")}
    rows = []
    first = {}
    for row in results["growth"]:
        package = results["packages"][row["package"]]
        by_size = "megabytes" in row["package"] or row["package"] == "large"
        count = package["size"] / 1e6 if by_size else package["files"]
        goal = MEGABYTE_GROWTH_GOAL if by_size else FILE_GROWTH_GOAL
        each = {measure: (row[measure]["median"] - fixed[measure]) / count * 1000
                for measure in ("wall", "cpu")}
        base = first.setdefault((row["kind"], by_size), each)
        row["growth"] = {measure: each[measure] / base[measure] for measure in each}
        judged = [f"{row['growth'][measure]:.2f}" for measure in ("wall", "cpu")]
        if base is not each:
            judged = [f"{text} <= {goal:.2f} {verdict(row['growth'][measure] <= goal)}"
                      for text, measure in zip(judged, ("wall", "cpu"))]
        rows.append((row["package"], row["kind"], f"{count:.0f}", "MB" if by_size else "files",
                     f"{each['wall']:.2f}", judged[0], f"{each['cpu']:.2f}", judged[1]))
    return table(("package", "run", "size", "of", "wall each, us", "times the first",
                  "CPU each, us", "times the first"), rows)


def instruction_table(rows):
    cells = []
    for row in rows:
        row["ratio"] = row["ours"] / row["floor"]
        cells.append((row["package"], BITS[row["preset"]], f"{row['ours']:,}", f"{row['floor']:,}",
                      f"{row['ratio']:.3f} <= {INSTRUCTIONS_GOAL} "
                      f"{verdict(row['ratio'] <= INSTRUCTIONS_GOAL)}"))
    return table(("package", "bits", "instructions", "floor's", "ratio"), cells)


def call_table(rows):
    cells = []
    for row in rows:
        names = sorted(set(row["ours"]) | set(row["floor"]),
                       key=lambda name, row=row: -row["ours"].get(name, 0))
        cells += [(row["package"], name, row["ours"].get(name, 0), row["floor"].get(name, 0))
                  for name in names]
    return table(("package", "system call", "wzorinst", "floor"), cells)


def report(results):
    """Judges `results` in place and returns them as Markdown."""
    for contest in results["contests"]:
        judge(contest)
    parts = ["## Contests", contest_table(results["contests"])]
    if results["growth"]:
        parts += ["## Growth", growth_table(results)]
    if results["instructions"]:
        parts += ["## Instructions", instruction_table(results["instructions"])]
    if results["system_calls"]:
        parts += ["## System calls", call_table(results["system_calls"])]
    return "\n\n".join(parts)
