"""The plot of the performance page: each kind of work on a line of its own, times as ratios to the floor."""
import matplotlib

matplotlib.use("svg")
matplotlib.rcParams["svg.hashsalt"] = "tav"  # the same figures give the same file

from matplotlib import pyplot, ticker  # noqa: E402  the backend has to be chosen first

LIBRARY, LAYER, PEER, NAME, MUST, AIM = "#c0392b", "#e08e45", "#9aa5b1", "#5c6773", "#2c3e50", "#27ae60"


def draw(works, beside, path):
    """`works`: pairs of a Work with a goal and its rows. Entries that end with `beside` are left out."""
    works = [(work, entries) for work, entries in works if entries]
    figure, axes = pyplot.subplots(figsize=(10, 0.8 * len(works) + 1.6))
    for line, (work, entries) in enumerate(reversed(works)):
        must, aim = work.goal
        axes.plot([1, 1], [line - 0.3, line + 0.3], color="black", linewidth=1)
        axes.plot([must, must], [line - 0.3, line + 0.3], color=MUST, linewidth=2)
        axes.plot([aim, aim], [line - 0.3, line + 0.3], color=AIM, linewidth=2)
        for row in entries:
            if row.kind == "floor" or not row.ratio or row.entry.endswith(beside):
                continue
            color = PEER if row.kind == "peer" else LAYER if row.entry.startswith("layer") else LIBRARY
            axes.plot(row.ratio, line, "o", color=color, markersize=5 if row.kind == "peer" else 8,
                      zorder=2 if row.kind == "peer" else 3)
        for place, row in enumerate(row for row in entries if row.kind == "peer" and row.ratio):
            # In turns above and below the line, as neighbours are close.
            axes.annotate(row.entry, (row.ratio, line), xytext=(0, 7 if place % 2 == 0 else -11), textcoords="offset points",
                          fontsize=5, color=NAME, ha="center")
    axes.set_xscale("log")
    axes.set_xlabel("time, as a ratio to the floor of the same run (1)")
    axes.set_yticks(range(len(works)), [f"{work.name} {work.title}" for work, _ in reversed(works)])
    axes.xaxis.set_major_formatter(ticker.FormatStrFormatter("%g"))
    axes.grid(axis="x", color="#e5e8eb")
    axes.set_axisbelow(True)
    shown = [("the library", LIBRARY, "o"), ("its C++ layer", LAYER, "o"), ("peers", PEER, "o"), ("must", MUST, "|"),
             ("aim", AIM, "|")]
    handles = [axes.plot([], [], mark, color=color, label=label)[0] for label, color, mark in shown]
    axes.legend(handles=handles, loc="upper center", bbox_to_anchor=(0.4, 1.12), ncol=5, frameon=False)
    figure.savefig(path, format="svg", bbox_inches="tight", metadata={"Date": None, "Creator": None})
