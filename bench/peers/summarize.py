#!/usr/bin/python3
"""Reads the runs of bench/compare.sh, checks that the answers agree and prints the table.

    summarize.py RUNS.tsv OUT.md

RUNS.tsv has one line per row of the table, tab-separated:
    id  workload  tool  threads  cores  units  result  time-file[,time-file...]  note
`units` is the number of rows (W-FIT-1) or cases (W-SIM-1) the run processed, `result` the
file the tool wrote (mcsim fit: its --fit-stats XML and, after a comma, the text it printed;
the peers and mcsim simulate: JSON), and
the time files are /usr/bin/time -v reports, one per repetition (TIME_DIR/ID.N, with the
result of that repetition copied to TIME_DIR/../log/ID.N.result). A row whose time-file field
is "-" was not run; its note says why.

Times are wall clock from process start to exit (start-up and reading the input included),
the median over the repetitions; CPU is user + system time of that run; peak memory is the
largest maximum resident set size of any repetition.

Agreement checks (a failed check makes the exit status 1):
  W-FIT-1  every candidate that both mcsim and a peer estimate by maximum likelihood
           (Normal, Lognormal, Gamma, Weibull, Beta, Exponential, Uniform, Poisson, the
           negative binomial's prob, the categorical proportions) has each parameter within
           a relative 1e-3 of the peer's; the negative binomial's thresh r within 5% (its
           likelihood is nearly flat in r when the counts are close to Poisson, and mcsim
           rounds r to a whole number); the best candidate of every field is the same.
           Triangular is listed but not checked: mcsim takes its mode from the moments
           (3 mean - min - max), the peers by maximum likelihood.
  W-SIM-1  the target mean of every run lies inside every other run's 95% confidence
           interval of the mean.
"""
import json
import os
import re
import statistics
import sys
import xml.etree.ElementTree as ET

FIT_REL_TOL = 1e-3
NEGBIN_R_REL_TOL = 0.05
ML_FAMILIES = {"Normal", "Lognormal", "Gamma", "Weibull", "Beta", "Exponential", "Uniform",
               "Poisson", "Negbinomial", "Categorical"}


def read_time_file(path):
    text = open(path, encoding="utf-8").read()

    def field(label):
        m = re.search(re.escape(label) + r":\s*(\S+)", text)
        return m.group(1) if m else None

    wall = field("Elapsed (wall clock) time (h:mm:ss or m:ss)")
    seconds = 0.0
    for part in wall.split(":"):
        seconds = seconds * 60.0 + float(part)
    status = field("Exit status")
    return {"wall": seconds,
            "cpu": float(field("User time (seconds)")) + float(field("System time (seconds)")),
            "rss_kb": int(field("Maximum resident set size (kbytes)")),
            "status": int(status) if status is not None else 0}


def read_runs(path):
    rows = []
    for line in open(path, encoding="utf-8"):
        if not line.strip():
            continue
        parts = line.rstrip("\n").split("\t")
        rid, workload, tool, threads, cores, units, result, times, note = parts
        row = {"id": rid, "workload": workload, "tool": tool, "threads": threads,
               "cores": cores, "units": int(units), "result": result, "note": note,
               "ran": times != "-"}
        if row["ran"]:
            reps = [read_time_file(t) for t in times.split(",")]
            row["failed"] = any(r["status"] != 0 for r in reps)
            for r, t in zip(reps, times.split(",")):
                r["result"] = os.path.join(os.path.dirname(os.path.dirname(t)), "log",
                                           os.path.basename(t) + ".result")
            walls = sorted(reps, key=lambda r: r["wall"])
            median = walls[(len(walls) - 1) // 2]
            row.update(wall=median["wall"], cpu=median["cpu"], median_result=median["result"],
                       rss_mb=max(r["rss_kb"] for r in reps) / 1024.0, reps=len(reps),
                       walls=[r["wall"] for r in reps])
        rows.append(row)
    return rows


# ---------------------------------------------------------------------------------------------
# W-FIT-1


def read_mcsim_fit(path):
    """{field: {"candidates": {family: {param: value}}}} from mcsim's --fit-stats document."""
    fields = {}
    for field in ET.parse(path).getroot().iter("SimulatedField"):
        cands = {}
        for dist in field:
            if dist.tag == "Empirical":
                continue
            params = dist.find("Parameters")
            if params is not None:
                cands[dist.tag] = {k: float(v) for k, v in params.attrib.items()}
            elif dist.tag == "Categorical":
                cands[dist.tag] = {
                    c.get("value"): float(c.find("Probability").get("value"))
                    for c in dist.iter("Category")}
        fields[field.get("name")] = {"candidates": cands}
    return fields


def read_mcsim_best(fit_log):
    """{field: best family} from the text mcsim fit prints ("  best fit   Gamma  ...")."""
    best = {}
    field = None
    for line in open(fit_log, encoding="utf-8"):
        m = re.match(r"^(\S+)  \(", line)
        if m:
            field = m.group(1)
            continue
        m = re.match(r"^  best fit   (\S+)", line)
        if m and field:
            best[field] = m.group(1)
    return best


def rel_diff(a, b):
    if a == b:
        return 0.0
    return abs(a - b) / max(abs(a), abs(b))


def check_fit(mcsim_fields, mcsim_best, peer, peer_name, lines):
    ok = True
    worst = 0.0
    compared = 0
    for name, field in peer["fields"].items():
        mine = mcsim_fields.get(name, {"candidates": {}})["candidates"]
        theirs = field["candidates"]
        for family in sorted(set(mine) | set(theirs)):
            if family not in ML_FAMILIES:
                continue
            if family not in mine or family not in theirs:
                lines.append(f"- FAIL {peer_name} {name}: {family} fitted by "
                             f"{'mcsim' if family in mine else peer_name} only")
                ok = False
                continue
            for param, value in theirs[family]["params"].items():
                if param not in mine[family]:
                    continue
                d = rel_diff(mine[family][param], value)
                tol = NEGBIN_R_REL_TOL if (family, param) == ("Negbinomial", "thresh") \
                    else FIT_REL_TOL
                compared += 1
                if tol == FIT_REL_TOL:
                    worst = max(worst, d)
                if d > tol:
                    ok = False
                    lines.append(f"- FAIL {peer_name} {name} {family} {param}: mcsim "
                                 f"{mine[family][param]:.9g}, {peer_name} {value:.9g} "
                                 f"(relative {d:.2e} > {tol:g})")
        if name in mcsim_best and mcsim_best[name] != field["best"]:
            ok = False
            lines.append(f"- FAIL {peer_name} {name}: best fit {field['best']}, "
                         f"mcsim {mcsim_best[name]}")
    verdict = "best fit of every field the same" if ok else "disagreements listed above"
    lines.append(f"- {'ok  ' if ok else 'FAIL'} {peer_name}: {compared} maximum-likelihood "
                 f"parameters compared, largest relative difference {worst:.1e} "
                 f"(tolerance {FIT_REL_TOL:g}; NegBin r {NEGBIN_R_REL_TOL:g}); {verdict}")
    return ok


# ---------------------------------------------------------------------------------------------
# W-SIM-1


def find_target(doc, name="target"):
    """The statistics of continuous target `name` in a JSON document of unknown layout:
    the first object that names it (or is keyed by it) and holds a mean."""
    stack = [doc]
    while stack:
        node = stack.pop()
        if isinstance(node, dict):
            if node.get("name") == name and "mean" in node:
                return node
            if isinstance(node.get(name), dict) and "mean" in node[name]:
                return node[name]
            stack.extend(node.values())
        elif isinstance(node, list):
            stack.extend(node)
    return None


def sim_stats(path):
    doc = json.load(open(path, encoding="utf-8"))
    node = doc if "mean" in doc else find_target(doc)
    if node is None:
        return None
    sd = next((node[k] for k in ("sd", "stddev", "std_dev", "standard_deviation", "stdDev")
               if k in node), None)
    ci = None
    for k in ("ci95", "ci", "confidence_interval", "mean_ci"):
        if k in node:
            v = node[k]
            ci = [v["lower"], v["upper"]] if isinstance(v, dict) else list(v)
    if ci is None:
        lower = next((node[k] for k in ("ci_lower", "ciLower", "lower") if k in node), None)
        upper = next((node[k] for k in ("ci_upper", "ciUpper", "upper") if k in node), None)
        if lower is not None and upper is not None:
            ci = [lower, upper]
    return {"mean": node["mean"], "sd": sd, "ci": ci}


def check_sim(rows, lines):
    runs = []
    for row in rows:
        if row["workload"] != "W-SIM-1" or not row["ran"] or row["failed"]:
            continue
        s = sim_stats(row["result"])
        if s is None or s["ci"] is None:
            lines.append(f"- FAIL {row['tool']} ({row['threads']} thr): no target mean and "
                         f"confidence interval found in {row['result']}")
            return False
        runs.append((f"{row['tool']} ({row['threads']} thr, {row['cores']} core"
                     f"{'s' if row['cores'] != '1' else ''})", s))
    ok = True
    for label, s in runs:
        sd = "—" if s["sd"] is None else f"{s['sd']:.4f}"
        lines.append(f"- {label}: mean {s['mean']:.4f}, 95% CI [{s['ci'][0]:.4f}, "
                     f"{s['ci'][1]:.4f}], sd {sd}")
    for i, (la, a) in enumerate(runs):
        for lb, b in runs[i + 1:]:
            inside = b["ci"][0] <= a["mean"] <= b["ci"][1] and a["ci"][0] <= b["mean"] <= a["ci"][1]
            if not inside:
                ok = False
                lines.append(f"- FAIL the means of {la} and {lb} are not inside each other's "
                             f"confidence intervals")
    if len(runs) > 1:
        lines.append(f"- {'ok  ' if ok else 'FAIL'} W-SIM-1: each of the {len(runs)} means lies "
                     f"inside every other run's 95% confidence interval"
                     + ("" if ok else " — see above"))
    return ok


# ---------------------------------------------------------------------------------------------
# The table


def fmt_rate(x):
    if x >= 1e6:
        return f"{x / 1e6:.2f} M"
    if x >= 1e3:
        return f"{x / 1e3:.1f} k"
    return f"{x:.0f}"


def work_seconds(row):
    """The seconds the peer reports for the work itself, in the run of median wall time."""
    if not row["ran"] or row["tool"].startswith("mcsim"):
        return None
    try:
        return json.load(open(row["median_result"], encoding="utf-8")).get("seconds")
    except (OSError, ValueError):
        return None


def table(rows):
    out = ["| Workload | Tool | Threads | Cores | Wall s | CPU s | Work s | Throughput (wall) "
           "| Peak MB | Wall ÷ mcsim | CPU ÷ mcsim |",
           "|---|---|---:|---:|---:|---:|---:|---:|---:|---:|---:|"]
    base = {}
    for row in rows:
        if row["ran"] and not row["failed"] and row["tool"] == "mcsim" \
                and row["threads"] == "1" and row["workload"] not in base:
            base[row["workload"]] = row
    for row in rows:
        head = f"| {row['workload']} | {row['tool']} | {row['threads']} | {row['cores']} | "
        if not row["ran"]:
            out.append(head + f"— | — | — | — | — | {row['note']} | — |")
            continue
        if row["failed"]:
            out.append(head + "failed | — | — | — | — | see the log | — |")
            continue
        unit = "rows/s" if row["workload"] == "W-FIT-1" else "cases/s"
        work = work_seconds(row)
        mine = base.get(row["workload"])
        wall_ratio = f"{row['wall'] / mine['wall']:.1f}" if mine else "—"
        cpu_ratio = f"{row['cpu'] / mine['cpu']:.1f}" if mine else "—"
        out.append(head + f"{row['wall']:.2f} | {row['cpu']:.2f} | "
                   f"{'—' if work is None else f'{work:.2f}'} | "
                   f"{fmt_rate(row['units'] / row['wall'])} {unit} | {row['rss_mb']:.0f} | "
                   f"{wall_ratio} | {cpu_ratio} |")
    return out


def component_lines(path):
    """W-SIM-1 inside the component: the median cases per second of simulation_bench's runs on
    one and on two threads (a list of "THREADS JSON" lines in `path`), against the targets."""
    rates = {}
    try:
        listing = open(path, encoding="utf-8").read().split("\n")
    except OSError:
        return []
    for line in listing:
        if not line.strip():
            continue
        threads, json_path = line.split(" ", 1)
        try:
            doc = json.load(open(json_path, encoding="utf-8"))
        except (OSError, ValueError):
            continue
        per_run = sorted(b["items_per_second"] for b in doc.get("benchmarks", [])
                         if b.get("run_type") == "iteration" and "items_per_second" in b)
        if per_run:
            rates[int(threads)] = per_run[len(per_run) // 2]
    if 1 not in rates:
        return ["", "W-SIM-1 in the component: simulation_bench did not run (see the log)"]
    one = rates[1]
    out = ["", "W-SIM-1 in the component (bench/simulation_bench.cpp, the linear target compiled, "
               "median of the repetitions):",
           f"- one core: {fmt_rate(one)} cases/s (target 5 M: "
           f"{'met' if one >= 5e6 else 'not met'})"]
    if 2 in rates:
        ratio = rates[2] / one
        out.append(f"- two threads on two cores: {fmt_rate(rates[2])} cases/s, {ratio:.2f} times "
                   f"one core (target 1.8: {'met' if ratio >= 1.8 else 'not met'})")
    return out


def main():
    if len(sys.argv) not in (3, 4):
        sys.exit("usage: summarize.py RUNS.tsv OUT.md [COMPONENT.txt]")
    rows = read_runs(sys.argv[1])
    lines = table(rows)
    checks = ["", "Agreement:"]
    ok = True
    fit_rows = {r["tool"]: r for r in rows
                if r["workload"] == "W-FIT-1" and r["ran"] and not r["failed"]}
    mcsim = fit_rows.get("mcsim")
    if mcsim:
        stats_xml, printed = mcsim["result"].split(",")
        mine = read_mcsim_fit(stats_xml)
        best = read_mcsim_best(printed)
        for tool, row in fit_rows.items():
            if tool != "mcsim":
                peer = json.load(open(row["result"], encoding="utf-8"))
                ok = check_fit(mine, best, peer, tool, checks) and ok
    ok = check_sim(rows, checks) and ok
    speed = []
    if mcsim:
        for tool, need in (("SciPy", 20.0), ("fitdistrplus", 40.0)):
            row = fit_rows.get(tool)
            if row:
                r = row["wall"] / mcsim["wall"]
                c = row["cpu"] / mcsim["cpu"]
                speed.append(f"- mcsim fit is {r:.1f} times as fast as {tool} by wall clock, "
                             f"{c:.1f} times by CPU time (target {need:.0f}: "
                             f"{'met' if min(r, c) >= need else 'not met'})")
    component = component_lines(sys.argv[3]) if len(sys.argv) == 4 else []
    text = "\n".join(lines + checks + ([""] + speed if speed else []) + component) + "\n"
    sys.stdout.write(text)
    with open(sys.argv[2], "w", encoding="utf-8") as f:
        f.write(text)
    sys.exit(0 if ok else 1)


if __name__ == "__main__":
    main()
