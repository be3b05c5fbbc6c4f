# What the checks share. A check runs with `sh -eu` in a folder of its own, its output is shown when it
# fails; `figure: TEXT` on a line of its own is shown when it passes.

folder=$(mktemp -d)
cd "$folder"
surface= node= other= other_node=
trap 'ended $?' EXIT

ended() {
    [ "$1" -eq 0 ] || [ "$1" -eq 77 ] || tail -n 8 -v ./*.log status faults other-faults 2>/dev/null
    kill $(jobs -p) 2>/dev/null || true
}

fail() {
    echo "FAILED: $*"
    exit 1
}

seconds_up() { cut -d . -f 1 /proc/uptime; }

# wait_until WHAT COMMAND...: for at most 20 s. Each look costs the machine a millisecond or two, one that
# starts a program of ours tens of them, so wait for lines of a pipe where there is one.
wait_until() {
    local what=$1 end=$(($(seconds_up) + 20))
    shift
    until "$@"; do
        [ "$(seconds_up)" -le "$end" ] || fail "waited in vain: $what"
        usleep 20000
    done
}

has_line() { grep -q -- "$2" "$1" 2>/dev/null; }
has_lines() { [ "$(wc -l <"$1")" -ge "$2" ]; }
has_surface() { ls /dev/hidraw* >/dev/null 2>&1; }
has_input_thread() { grep -q '^vexa-input$' "/proc/$1"/task/*/comm 2>/dev/null; }
# The device's own descriptor comes first, the one that its input is read from second.
has_reader() { [ "$(ls -l "/proc/$1/fd" 2>/dev/null | grep -c '/dev/hidraw')" -ge 2 ]; }
is_gone() { ! kill -0 "$1" 2>/dev/null; }

# same WHAT EXPECTED FOUND: two files.
same() {
    diff -u "$2" "$3" >difference && return
    head -n 40 difference
    fail "$1 differ"
}

# tell COMMAND...: to the surface (see UhidSurface), and waits until it has answered with a line.
tell() {
    if [ -z "$surface" ]; then
        mkfifo commands answering
        UhidSurface <commands >answering 2>faults &
        surface=$!
        exec 7>commands 8<answering
    fi
    echo "$*" >&7
    read -r -t 30 answer <&8 || fail "$*: $(cat faults)"
    case $answer in node*) node=${answer#node } ;; esac
}

# A reader of the keys, whose lines go to "keys", has opened its device when this returns.
read_keys() {
    [ -e reading ] || mkfifo reading
    KeyReader 'Vexa Touch media keys' 2>reading >keys &
    reader=$!
    exec 9<reading
    read -r -t 30 line <&9 || fail "no reader of keys"
    case $line in reading*) ;; *) fail "$line" ;; esac
}

# kernel_tests FILTER: those tests of KernelTests, of which there is one at least.
kernel_tests() {
    KernelTests --gtest_filter="$1" --gtest_brief=1 >tests 2>&1 || {
        cat tests
        fail "the tests $1"
    }
    grep -q '^\[  PASSED  \] [1-9]' tests || fail "no test is called $1: $(cat tests)"
}

# another COMMAND...: as tell, to a second surface; its node goes to "other_node".
another() {
    if [ -z "$other" ]; then
        mkfifo other-commands other-answering
        UhidSurface <other-commands >other-answering 2>other-faults &
        other=$!
        exec 5>other-commands 6<other-answering
    fi
    echo "$*" >&5
    read -r -t 30 answer <&6 || fail "$*: $(cat other-faults)"
    case $answer in node*) other_node=${answer#node } ;; esac
}

# start_daemon [OPTION...]: on that bus; what it says goes to daemon.log. It has said that it is ready.
start_daemon() {
    vexatouch daemon "$@" 2>daemon.log &
    daemon=$!
    wait_until "the daemon" serves '^\['
}
serves() { vexatouch stats --json 2>/dev/null | grep -q -- "$1"; }
# is_running N, is_taken_down N: the daemon has said so of its surface N.
is_running() { has_line daemon.log "^surface $1, .*: running"; }
is_taken_down() { has_line daemon.log "^surface $1, .*: unplugged"; }

# The system bus, as Debian configures it, with the policies that are installed.
start_bus() {
    mkdir -p /run/dbus
    dbus-daemon --system --nopidfile
    export DBUS_SYSTEM_BUS_ADDRESS=unix:path=/run/dbus/system_bus_socket
}

# as USER COMMAND: by the user's own shell.
as() {
    local user=$1
    shift
    su -s /usr/bin/sh "$user" -c "$*"
}
