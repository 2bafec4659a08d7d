#!/usr/bin/env bash
# Prints what the hot paths (file open, file create, duration and map lookups) cost beside their
# floor, the system calls they cannot avoid: per case and log configuration, the median time of
# the case, of its floor, and their ratio. Fails when a case did not take the road it names.
#
# Usage: tools/benchmark.sh [--quick] [BENCHMARK ARGUMENTS...]
#   --quick (or DLP_BENCHMARK_QUICK=1): every case once and briefly, for CI.
set -euo pipefail
cd "$(dirname "$0")/.."

quick=${DLP_BENCHMARK_QUICK:-}
if [[ ${1:-} == --quick ]]; then
    quick=1
    shift
fi

tools/setup.sh
build=${DLP_BUILD_DIR:-build}
cmake -S . -B "$build" -DCMAKE_BUILD_TYPE=Release -DDLP_BUILD_BENCHMARKS=ON >/dev/null
cmake --build "$build" -j "$(nproc)" --target hot_paths_benchmark >/dev/null

if [[ -n $quick ]]; then
    timing=(--benchmark_min_time=0.01 --benchmark_repetitions=1)
else
    # Interleaved repetitions spread a case and its floor over the same stretch of the run, so a
    # burst of load elsewhere on the machine does not land on one of them alone.
    timing=(--benchmark_min_time=0.05 --benchmark_repetitions=9
        --benchmark_enable_random_interleaving=true --benchmark_display_aggregates_only=true)
fi
# It runs in the build tree, where its scratch files keep user attributes.
build_path=$(cd "$build" && pwd)
results=$build_path/hot_paths_benchmark.json
console=$build_path/hot_paths_benchmark.txt
echo "benchmark: running (console output in $console)"
status=0
# The default log configuration writes every message that passes to stderr.
tools/dlp-sandbox bash -c 'cd "$0" && exec "$@" 2>/dev/null' "$build_path" "$build_path/hot_paths_benchmark" \
    "${timing[@]}" --benchmark_out="$results" --benchmark_out_format=json "$@" >"$console" ||
    status=$?
if ((status != 0)); then
    tail -n 20 "$console" >&2
    echo "benchmark: exited with status $status" >&2
    exit "$status"
fi

python3 - "$results" <<'EOF'
import json
import sys

results = json.load(open(sys.argv[1]))
nanoseconds = {"ns": 1, "us": 1e3, "ms": 1e6, "s": 1e9}
runs, failures = {}, []
for run in sorted(results["benchmarks"], key=lambda run: run["family_index"]):
    if run.get("error_occurred"):
        failures.append(f"{run['run_name']}: {run['error_message']}")
    elif run["run_type"] == "aggregate" and run["aggregate_name"] == "median" or \
            run["run_type"] == "iteration" and run["repetitions"] == 1:
        runs[run["run_name"]] = run

def time_of(run):
    return run["cpu_time"] * nanoseconds[run["time_unit"]]

model = next((line.split(":", 1)[1].strip() for line in open("/proc/cpuinfo")
              if line.startswith("model name")), "unknown CPU")
print(f"{model}, load average {results['context']['load_avg'][0]:.2f}; "
      "medians of CPU time; the ratio is case / floor")
print(f"{'case':<24} {'log':<9} {'case ns':>10} {'floor ns':>10} {'ratio':>8}  floor")
for name, run in runs.items():
    row, _, configuration = name.rpartition("/")
    floor = runs.get(row + "/floor")
    if configuration == "floor" or floor is None:
        continue
    ratio = time_of(run) / time_of(floor)
    print(f"{row:<24} {configuration:<9} {time_of(run):>10.1f} {time_of(floor):>10.1f} "
          f"{ratio:>8.2f}  {floor.get('label', '')}")
heap = {name.split("/")[1]: run["heap_bytes_per_entry"] for name, run in runs.items()
        if "heap_bytes_per_entry" in run}
for pids, bytes_per_entry in heap.items():
    print(f"heap bytes per recorded entry at {pids} pids: {bytes_per_entry:.1f}")
for failure in dict.fromkeys(failures):
    print(f"wrong road: {failure}", file=sys.stderr)
sys.exit(1 if failures else 0)
EOF
