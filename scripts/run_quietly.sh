# For the other scripts to source.
#
# run_quietly COMMAND... runs a command or function. It prints the command's output only when the command fails, on
# standard error. While ninja builds, it prints the progress there. Returns the command's status.
run_quietly() {
    local log out in status=0
    log="$(mktemp)" || return
    exec {out}>"$log" {in}<"$log"
    rm "$log" # the descriptors keep it
    "$@" 2>&1 | show_progress >&"$out" || status=$?
    [[ $status -eq 0 ]] || cat <&"$in" >&2
    exec {out}>&- {in}<&-
    return "$status"
}

# Copies its input. At most every ten seconds, it also reports a line of ninja's, "[24/117] ...", to the user.
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
