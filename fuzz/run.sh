#!/usr/bin/env bash
# Runs each libFuzzer target for a while, starting from its seed corpus and its
# regression inputs, under the sanitizers it was built with (the fuzz preset).
# Usage: fuzz/run.sh BUILD_DIR SECONDS TARGET...
#
# New inputs the fuzzer finds go to BUILD_DIR/corpus/TARGET, never into the checked-in
# seed corpus. A failing input is written to BUILD_DIR/artifacts/TARGET/; once the bug
# is fixed, copy it into fuzz/regressions/TARGET/ so the test suite replays it.
set -euo pipefail

if [ $# -lt 3 ]; then
    echo "usage: $0 BUILD_DIR SECONDS TARGET..." >&2
    exit 2
fi
build=$1
seconds=$2
shift 2
source_dir=$(cd "$(dirname "$0")" && pwd)

status=0
for target in "$@"; do
    corpus=$build/corpus/$target
    artifacts=$build/artifacts/$target
    log=$build/logs/$target.log
    mkdir -p "$corpus" "$artifacts" "$(dirname "$log")"
    inputs=("$corpus" "$source_dir/corpus/$target")
    [ -d "$source_dir/regressions/$target" ] && inputs+=("$source_dir/regressions/$target")

    echo "== fuzzing $target for ${seconds}s (log: $log)"
    if "$build/fuzz/$target" -max_total_time="$seconds" -timeout=10 -rss_limit_mb=2048 \
        -dict="$source_dir/zarl.dict" -artifact_prefix="$artifacts/" -print_final_stats=1 \
        "${inputs[@]}" >"$log" 2>&1; then
        grep -E '^(#[0-9]+[[:space:]]+DONE|Done [0-9]+ runs|stat::number_of_executed_units|stat::peak_rss_mb)' "$log" || true
        echo "$target: no failure; corpus of $(find "$corpus" -type f | wc -l) inputs in $corpus"
    else
        status=1
        tail -n 60 "$log"
        echo "$target: FAILED; the failing input is in $artifacts/"
    fi
done
exit $status
