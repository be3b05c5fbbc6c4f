# Sourced by the scripts that run in stages: a line for each, so that a person sees where time goes.
#
#   stage NAME COMMAND...        runs the command into a log, which is shown only when it fails
#   stage_shown NAME COMMAND...  the same, its output shown as it comes
#   stages_done                  the summary; fails unless every stage passed
#   run_ctest PRESET...          what a test stage runs
#
# A command that exits with 77 could not run: its last line says why, the stage counts as skipped.

stage_logs=${stage_logs:-build/logs}
stage_lines=()
stages_passed=0
stages_failed=0
stages_skipped=0

_stage_end() {
    local name=$1 status=$2 seconds=$3 log=$4 line
    case $status in
        0)
            stages_passed=$((stages_passed + 1))
            printf -v line 'stage  %-20s %5d s' "$name" "$seconds"
            ;;
        77)
            stages_skipped=$((stages_skipped + 1))
            printf -v line 'stage  %-20s %5d s  skipped: %s' "$name" "$seconds" "$(tail -n 1 "$log")"
            ;;
        *)
            stages_failed=$((stages_failed + 1))
            printf -v line 'stage  %-20s %5d s  FAILED (exit %d), log: %s' "$name" "$seconds" \
                "$status" "$log"
            ;;
    esac
    stage_lines+=("$line")
    printf '%s\n' "$line"
}

stage() {
    local name=$1 start=$SECONDS status=0
    local log="$stage_logs/${name//[^A-Za-z0-9]/-}.log"
    shift
    mkdir -p "$stage_logs"
    "$@" >"$log" 2>&1 </dev/null || status=$?
    if [ "$status" -ne 0 ] && [ "$status" -ne 77 ]; then
        tail -n 60 "$log"
    fi
    _stage_end "$name" "$status" $((SECONDS - start)) "$log"
    return "$status"
}

stage_shown() {
    local name=$1 start=$SECONDS status=0
    local log="$stage_logs/${name//[^A-Za-z0-9]/-}.log"
    shift
    mkdir -p "$stage_logs"
    "$@" </dev/null 2>&1 | tee "$log" || status=$?
    _stage_end "$name" "$status" $((SECONDS - start)) "$log"
    return "$status"
}

# run_ctest PRESET [CTEST-OPTION...]: every test of the preset; a test that was skipped is a failure.
run_ctest() {
    local preset=$1 output
    shift
    output=$(mktemp)
    local status=0
    ctest --preset "$preset" --parallel "$(nproc)" "$@" 2>&1 | tee "$output" || status=1
    if grep -E '\*\*\*(Skipped|Not Run)|Not Run \(Disabled\)' "$output"; then
        echo "tests were skipped"
        status=1
    fi
    rm -f "$output"
    return "$status"
}

stages_done() {
    printf '\n'
    printf '%s\n' "${stage_lines[@]}"
    printf 'stage  %-20s %5d s\n\n' total "$SECONDS"
    printf '%d passed, %d failed, %d skipped\n' "$stages_passed" "$stages_failed" "$stages_skipped"
    [ "$stages_failed" -eq 0 ] && [ "$stages_skipped" -eq 0 ] && [ "$stages_passed" -gt 0 ]
}
