# What the checks share. A check runs with `sh -eu` in a folder of its own, its output is shown when it
# fails; `figure: TEXT` on a line of its own is shown when it passes.

folder=$(mktemp -d)
cd "$folder"
surface=
trap 'kill $(jobs -p) 2>/dev/null || true' EXIT

fail() {
    echo "FAILED: $*"
    exit 1
}

# wait_until WHAT COMMAND...: for at most 20 s.
wait_until() {
    local what=$1 left=4000
    shift
    until "$@"; do
        left=$((left - 1))
        [ "$left" -gt 0 ] || fail "waited in vain: $what"
        usleep 5000
    done
}

has_line() { grep -q -- "$2" "$1" 2>/dev/null; }
has_lines() { [ "$(wc -l <"$1")" -ge "$2" ]; }
has_surface() { ls /dev/hidraw* >/dev/null 2>&1; }
has_input_thread() { grep -q '^vexa-input$' "/proc/$1"/task/*/comm 2>/dev/null; }
is_gone() { ! kill -0 "$1" 2>/dev/null; }

# same WHAT EXPECTED FOUND: two files.
same() {
    diff -u "$2" "$3" >difference && return
    head -n 40 difference
    fail "$1 differ"
}

# tell COMMAND...: to the surface (see UhidSurface), and waits until it is done.
tell() {
    if [ -z "$surface" ]; then
        mkfifo commands
        : >answers
        UhidSurface <commands >>answers 2>&1 &
        surface=$!
        exec 7>commands
        answers=0
    fi
    echo "$*" >&7
    answers=$((answers + 1))
    wait_until "$*" _surface_answered
}

_surface_answered() {
    if is_gone "$surface"; then
        cat answers
        fail "the surface is gone"
    fi
    [ "$(wc -l <answers)" -ge "$answers" ]
}

# The node of the surface that was plugged in last.
node() { sed -n 's/^node //p' answers | tail -n 1; }
