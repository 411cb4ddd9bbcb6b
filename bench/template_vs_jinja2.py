#!/usr/bin/python3
"""Renders the report-like benchmark template with Tessal's engine and with Python's jinja2 over the same
data, in the same run, and prints the times and their ratio.

    bench/template_vs_jinja2.py [BUILD_DIR]      (default: build-rel, the Release build with benchmarks)

BUILD_DIR must hold bench/tessal_bench (configure with -DCMAKE_BUILD_TYPE=Release -DTESSAL_BUILD_BENCHMARKS=ON).
Uses Debian's python3-jinja2 (run with /usr/bin/python3). Before timing, the first 50 items rendered by both
are compared: the two templates must write the same text.
"""
import datetime
import decimal
import json
import os
import subprocess
import sys
import tempfile
import time
import zoneinfo

import jinja2

ZONE = zoneinfo.ZoneInfo("Europe/Berlin")  # the zone TemplateBench.cpp sets
FIRST_DATE = 1704067200  # 2024-01-01 00:00:00 UTC; one item an hour from there
SIZES = (10000, 100000)
REPEATS = 5  # runs of each size on each side; the best counts

TEMPLATE = (
    '{% for item in items %}<tr><td>{{ item.date | date_format("%Y-%m-%d") }}</td>'
    "<td>{{ item.duration | digiclock }}</td>"
    '{% if item.kind == "time" %}<td>{{ item.name }}</td>{% else %}<td>{{ item.cost }}</td>{% endif %}</tr>\n'
    "{% endfor %}"
)


def two_digits(value):
    if value == 0:
        return "00"
    if value > 9:
        return str(value)
    return "0" + str(value)


def digiclock(minutes):
    # Truncating division, the remainder taking the sign of the minutes, as the engine's filter does.
    minutes = int(minutes)
    hours = int(minutes / 60)
    return two_digits(hours) + ":" + two_digits(minutes - hours * 60)


def items(count):
    return [
        {
            "name": "Item %d" % i,
            "date": datetime.datetime.fromtimestamp(FIRST_DATE + 3600 * i, tz=ZONE),
            "duration": i % 600,
            "cost": decimal.Decimal("%d.25" % i),
            "kind": "expense" if i % 3 == 0 else "time",
        }
        for i in range(count)
    ]


def jinja_template():
    environment = jinja2.Environment(autoescape=False)
    environment.filters["digiclock"] = digiclock
    environment.filters["date_format"] = lambda date, pattern: date.strftime(pattern)
    return environment.from_string(TEMPLATE)


def time_jinja(template, count, repeats):
    data = items(count)
    best = None
    for _ in range(repeats):
        start = time.perf_counter()
        template.render(items=data)
        elapsed = time.perf_counter() - start
        best = elapsed if best is None else min(best, elapsed)
    return best


def main():
    build = sys.argv[1] if len(sys.argv) > 1 else os.path.join(os.path.dirname(__file__), "..", "build-rel")
    binary = os.path.join(build, "bench", "tessal_bench")
    template = jinja_template()

    with tempfile.TemporaryDirectory() as scratch:
        dump = os.path.join(scratch, "sample.html")
        environment = dict(os.environ, TESSAL_TEMPLATE_BENCH_DUMP=dump)
        run = subprocess.run(
            [binary, "--benchmark_filter=BM_TemplateReport", "--benchmark_format=json",
             "--benchmark_repetitions=%d" % REPEATS],
            check=True, capture_output=True, text=True, env=environment)
        with open(dump, encoding="utf-8") as f:
            engine_sample = f.read()
    expected = template.render(items=items(50))
    if engine_sample != expected:
        print("The two renderings differ; the comparison would not be fair.", file=sys.stderr)
        sys.exit(1)

    # Best of the repetitions on both sides: on a shared machine the fastest run is the one least disturbed.
    engine_ms = {}
    for benchmark in json.loads(run.stdout)["benchmarks"]:
        if benchmark.get("run_type") == "iteration":
            size = int(benchmark["run_name"].split("/")[1])
            engine_ms[size] = min(engine_ms.get(size, float("inf")), benchmark["real_time"])  # milliseconds

    print("jinja2 %s (%s)" % (jinja2.__version__, os.path.dirname(jinja2.__file__)))
    print("%8s %12s %12s %8s" % ("items", "tessal ms", "jinja2 ms", "ratio"))
    for size in SIZES:
        jinja_ms = 1000.0 * time_jinja(template, size, REPEATS)
        print("%8d %12.1f %12.1f %7.2fx" % (size, engine_ms[size], jinja_ms, jinja_ms / engine_ms[size]))
    print("tessal growth 100k/10k: %.2f (linear is 10, the target at most 12)" % (engine_ms[100000] / engine_ms[10000]))


if __name__ == "__main__":
    main()
