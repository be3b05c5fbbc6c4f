# Words for checks on a whole system, beside those of library.sh.

unit=vexatouch.service

# property NAME: of the unit.
property() { systemctl show --property="$1" --value "$unit"; }
has_property() { [ "$(property "$1")" = "$2" ]; }
# told_since MARK: what the journal has of the unit since then, see `mark`.
mark() { journalctl --quiet --show-cursor --lines=0 | sed -n 's/^-- cursor: //p'; }
told_since() { journalctl --quiet --unit="$unit" --after-cursor="$1" "${2:---output=cat}"; }
has_told_since() { told_since "$1" | grep -q -- "$2"; }
serves() { vexatouch stats --json 2>/dev/null | grep -q -- "$1"; }

ended() {
    [ "$1" -eq 0 ] || [ "$1" -eq 77 ] || {
        tail -n 8 -v ./*.log status faults keys 2>/dev/null || true
        systemctl status --no-pager --full --lines=60 "$unit" || true
        vexatouch stats || true
    }
    kill $(jobs -p) 2>/dev/null || true
}

# plug_in [SERIAL]: and waits until the daemon serves it.
plug_in() {
    tell plug "$@"
    wait_until "the surface at $node" serves "\"$node\""
}

# Not by su: that would be a login, with a manager of services of its own. The shell has a setpriv built in,
# which can less.
as() {
    local user=$1
    shift
    /usr/bin/setpriv --reuid="$user" --regid="$user" --init-groups sh -c "$*"
}
