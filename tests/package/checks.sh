# check DESCRIPTION COMMAND...: runs COMMAND, prints "ok" or "FAILED" with DESCRIPTION (and, on a
# failure, the last lines COMMAND printed), and counts the failures; finish ends the script with
# status 1 when any check failed.
failures=0
check() {
    local what=$1 output
    shift
    if output=$("$@" 2>&1); then
        echo "ok      $what"
    else
        echo "FAILED  $what"
        [[ -z "$output" ]] || tail -n 20 <<<"$output" | sed 's/^/        | /'
        failures=$((failures + 1))
    fi
}
finish() {
    if ((failures)); then
        echo "$failures check(s) failed"
        exit 1
    fi
    echo "all checks hold"
    exit 0
}
