"""Turns the results of a benchmark into tables: ratios, compared with their goals.

A ratio is the median of the installer over the median of another contestant of the same race. It
comes twice, for wall and for CPU time, and a goal holds for both unless said otherwise. Where a
goal is missed, the ratio is bold. The pairs of goals are for the 64-bit and the 32-bit build.
"""

GOALS = {
    ("install", "typical"): {
        "unzip": (0.30, 0.33),
        "7zz": (0.38, 0.44),
        "bsdtar": (0.47, 0.54),
        "dpkg": (0.33, 0.33),
        "libdeflate floor": (1.12, 1.18),
    },
    ("install", "large"): {
        "unzip": (0.27, 0.31),
        "7zz": (0.37, 0.41),
        "bsdtar": (0.48, 0.53),
        "dpkg": (0.35, 0.35),
        "libdeflate floor": (1.05, 1.15),
    },
    ("install", "stored"): {
        "unzip": (0.12, 0.12),
        "7zz": (0.60, 0.60),
        "bsdtar": (0.62, 0.62),
        "dpkg": (0.35, 0.35),
    },
    ("install, no commands", "stored"): {"libdeflate floor": (1.10, 1.10)},
    ("install", "many"): {
        "unzip": (0.40, 0.43),
        "7zz": (0.44, 0.47),
        "bsdtar": (0.50, 0.54),
        "dpkg": (0.36, 0.36),
        "libdeflate floor": (1.12, 1.15),
    },
    ("install on disk", "many"): {"dpkg": (0.48, 0.48)},
    ("install", "many100k"): {
        "unzip": (0.43, 0.43),
        "7zz": (0.44, 0.44),
        "bsdtar": (0.46, 0.46),
        "dpkg": (0.38, 0.38),
        "libdeflate floor": (1.15, 1.15),
    },
    ("upgrade", "typical"): {
        "unzip": (0.38, 0.38),
        "bsdtar": (0.58, 0.58),
        "dpkg": (0.45, 0.45),
    },
    ("upgrade", "many"): {"unzip": (0.72, 0.72), "bsdtar": (0.78, 0.78), "dpkg": (0.45, 0.45)},
    ("removal", "typical"): {"rm -rf": (2.50, 2.50)},
    ("removal", "many"): {"rm -rf": (1.25, 1.25)},
    ("fixed cost, no commands", "tiny"): {"line": (1.75, 1.75)},
    **{
        ("install", package): {"zlib floor": (1.10, 1.10)}
        for package in ("one-block", "tiny-blocks", "flushed-blocks", "stored-blocks")
    },
}
WALL_ONLY = ("dpkg",)  # the time that it takes to synchronise is what counts
PEAK_GOALS = {"typical": 8, "large": 16, "stored": 3, "many": 9, "many100k": 28, "one-entry": 8}
FILE_GROWTH_GOAL = 1.15
MEGABYTE_GROWTH_GOAL = 1.10
MINOR_CALLS = 10

COLUMNS = (
    "unzip",
    "7zz",
    "bsdtar",
    "dpkg",
    "rpm",
    "rpm, flushed",
    "zlib floor",
    "libdeflate floor",
    "line",
    "rm -rf",
)
OURS = {"wzorinst": "", "wzorinst, no commands": ", no commands"}
FILE_GROWTH = ("files1k", "files10k", "many100k")
MEGABYTE_GROWTH = ("megabytes10", "megabytes100", "large")


def report(results):
    """The whole report as Markdown."""
    tables = {
        "Times, on tmpfs and on disk": time_table(results),
        "Growth": growth_table(results),
        "System calls": call_table(results["tmpfs"]["system_calls"]),
    }
    return "\n\n".join(f"## {head}\n\n{rows}" for head, rows in tables.items() if rows)


def time_table(results):
    rows = [
        row
        for place, suffix in (("tmpfs", ""), ("disk", " on disk"))
        if place in results
        for race in results[place]["races"]
        if len(race["contestants"]) > 1
        for row in race_rows(race, suffix)
    ]
    return table(("package", "run", "bits", "ms", *COLUMNS, "peak, MiB"), rows)


def race_rows(race, suffix):
    """A line for each build of the installer in the race, and one for its goals."""
    contestants, package = race["contestants"], race["package"]
    for program, aside in OURS.items():
        job = race["job"] + aside + suffix
        goals = GOALS.get((job, package), {})
        widths = [bits for bits in (64, 32) if f"{program} {bits}" in contestants]
        for bits in widths:
            ours = contestants[f"{program} {bits}"]
            yield [
                package,
                job,
                bits,
                f"{median(ours, 'wall'):.1f}",
                *(
                    cell(ours, opponent(contestants, column, bits), column, goals, bits)
                    for column in COLUMNS
                ),
                peak_cell(ours, package, job),
            ]
        if widths and goals:
            peak = f"<= {PEAK_GOALS[package]}" if judged_peak(package, job) else ""
            yield [
                package,
                job,
                "goal",
                "",
                *(goal_cell(goals.get(name)) for name in COLUMNS),
                peak,
            ]


def opponent(contestants, column, bits):
    """The contestant of a column, of the same width if it comes in both; None if it has not run."""
    for name in (column, f"{column} {bits}", f"{column} in pieces {bits}"):
        if name in contestants:
            return contestants[name]
    return None


def cell(ours, theirs, column, goals, bits):
    if theirs is None:
        return ""
    ratios = {
        measure: median(ours, measure) / median(theirs, measure) for measure in ("wall", "cpu")
    }
    goal = goals[column][0 if bits == 64 else 1] if column in goals else None

    def text(measure):
        judged = goal is not None and (measure == "wall" or column not in WALL_ONLY)
        return mark(f"{ratios[measure]:.2f}", judged and round(ratios[measure], 2) > goal)

    return f"{text('wall')} / {text('cpu')}"


def goal_cell(goal):
    if goal is None:
        return ""
    return f"<= {goal[0]:.2f}" + (f" ({goal[1]:.2f})" if goal[0] != goal[1] else "")


def judged_peak(package, job):
    return job == "install" and package in PEAK_GOALS


def peak_cell(ours, package, job):
    mebibytes = median(ours, "memory") / 1024
    return mark(f"{mebibytes:.1f}", judged_peak(package, job) and mebibytes > PEAK_GOALS[package])


def mark(text, missed):
    return f"**{text}**" if missed else text


def median(contestant, measure):
    return contestant[measure]["median"]


def growth_table(results):
    """The time of a file, or a megabyte, above the fixed cost of a run."""
    found = {
        (race["job"], race["package"]): race["contestants"]["wzorinst 64"]
        for race in results["tmpfs"]["races"]
        if "wzorinst 64" in race["contestants"]
    }
    fixed = found.get(("fixed cost", "tiny"))
    rows = []
    for job, packages, goal in (
        ("install", FILE_GROWTH, FILE_GROWTH_GOAL),
        ("upgrade", FILE_GROWTH, FILE_GROWTH_GOAL),
        ("removal", FILE_GROWTH, FILE_GROWTH_GOAL),
        ("install", MEGABYTE_GROWTH, MEGABYTE_GROWTH_GOAL),
    ):
        if fixed is None or any((job, package) not in found for package in packages):
            continue
        first = None
        for package in packages:
            facts = results["packages"][package]
            by_size = packages is MEGABYTE_GROWTH
            count = facts["size"] / 1e6 if by_size else facts["files"]
            each = [
                (median(found[job, package], measure) - median(fixed, measure)) / count * 1000
                for measure in ("wall", "cpu")
            ]
            first = first or each
            growth = [
                mark(f"{now / then:.2f}", now / then > goal) for now, then in zip(each, first)
            ]
            rows.append(
                [
                    package,
                    job,
                    f"{count:.0f} {'MB' if by_size else 'files'}",
                    *(f"{value:.1f}" for value in each),
                    " / ".join(growth),
                    f"<= {goal}",
                ]
            )
    return table(
        ("package", "run", "of", "wall each, us", "CPU each, us", "times the first", "goal"), rows
    )


def call_table(packages):
    rows = []
    for package in packages:
        ours, floor = package["ours"], package["floor"]
        names = sorted(set(ours) | set(floor), key=lambda name, ours=ours: -ours.get(name, 0))
        rows += [
            (package["package"], name, ours.get(name, 0), floor.get(name, 0))
            for name in names
            if max(ours.get(name, 0), floor.get(name, 0)) >= MINOR_CALLS
        ]
    return table(("package", "system call", "wzorinst", "libdeflate floor"), rows)


def table(head, rows):
    """A Markdown table with aligned columns; columns without a text are left out."""
    if not rows:
        return ""
    texts = [[str(text) for text in row] for row in rows]
    used = [column for column in range(len(head)) if any(row[column] for row in texts)]
    lines = [[row[column] for column in used] for row in [list(head), *texts]]
    widths = [max(len(line[column]) for line in lines) for column in range(len(used))]
    out = [
        "| " + " | ".join(text.ljust(width) for text, width in zip(line, widths)) + " |"
        for line in lines
    ]
    out.insert(1, "|" + "|".join("-" * (width + 2) for width in widths) + "|")
    return "\n".join(out)
