# For the other scripts to source.
#
# run_quietly COMMAND... runs a command or function and keeps its output back, which it shows on standard error when the
# command fails. While ninja builds, it says there how far it is. The status is the command's.
run_quietly() {
    local log out in status=0
    log="$(mktemp)"
    exec {out}>"$log" {in}<"$log"
    rm "$log" # the descriptors keep it
    "$@" 2>&1 | show_progress >&"$out" || status=$?
    [[ $status -eq 0 ]] || cat <&"$in" >&2
    exec {out}>&- {in}<&-
    return "$status"
}

# Copies its input; every ten seconds at most, a line of ninja's, "[24/117] ...", becomes one for the user.
show_progress() {
    local line next=0
    while IFS= read -r line; do
        printf '%s\n' "$line"
        if [[ "$line" =~ ^\[([1-9][0-9]*)/([0-9]+)\]\  && $SECONDS -ge $next ]]; then
            echo "Building, step ${BASH_REMATCH[1]} of ${BASH_REMATCH[2]}" >&2
            next=$((SECONDS + 10))
        fi
    done
}
