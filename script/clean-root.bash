# Sourced by scripts that need a Debian 12 with nothing in it but what they ask for.
#
#   clean_root_possible            says "skipped" and returns 77 where no such system can be made
#   clean_root_unshared SCRIPT...  runs the script again where its mounts and processes are its own: they
#                                  are gone when it ends, however it ends
#   clean_root_end                 ends that, and forgets what is half made; for a trap of EXIT
#   clean_root_made PACKAGE...     makes the smallest Debian 12 with these packages, unless it is there, and
#                                  names its archive
#   clean_root FOLDER PACKAGE...   unpacks it into the folder
#   clean_root_mount FOLDER        gives it processes, devices and the name service (only unshared)
#   clean_root_install FOLDER PACKAGE...  installs packages there, by name or as /PATH/FILE.deb
#   in_root FOLDER COMMAND...      runs a command there, with an environment of its own
#
# A system is made once for each set of packages and kept in build/clean-root, as are packages that are
# downloaded, so a second run needs no network. Remove the folder to have newer packages.
# Variables: DEBIAN_MIRROR (that of this machine)

clean_root_suite=bookworm
clean_root_store=${clean_root_store:-$PWD/build/clean-root}

# The mirror that this machine has Debian from.
clean_root_mirror() {
    # shellcheck disable=SC2016
    apt-get indextargets --format '$(REPO_URI)' "Codename: $clean_root_suite" 2>/dev/null |
        grep -E '^https?://' | grep -v -- -security | head -n 1
}

clean_root_possible() {
    if [ "$(id -u)" -ne 0 ]; then
        echo "skipped: a clean system needs root"
        return 77
    fi
    local program
    for program in mmdebstrap unshare tar; do
        command -v "$program" >/dev/null || {
            echo "skipped: $program is missing (script/bootstrap installs it)"
            return 77
        }
    done
    if ! unshare --mount --pid --fork --kill-child --propagation private \
        sh -c 'mount -t tmpfs none /mnt' 2>/dev/null; then
        echo "skipped: this machine lets nobody mount (a container without the right to?)"
        return 77
    fi
}

clean_root_unshared() {
    # Not in the foreground, where a signal would wait for its end.
    unshare --mount --pid --fork --kill-child --mount-proc --propagation private "$@" <&0 &
    clean_root_inner=$!
    wait "$clean_root_inner"
}

clean_root_end() {
    if [ -n "${clean_root_inner:-}" ]; then
        kill -KILL "$clean_root_inner" 2>/dev/null || true
    fi
    if [ -n "${clean_root_making:-}" ]; then
        rm -rf --one-file-system "$clean_root_making"
    fi
}

in_root() {
    local root=$1
    shift
    env -i PATH=/usr/local/sbin:/usr/local/bin:/usr/sbin:/usr/bin:/sbin:/bin LANG=C.UTF-8 HOME=/root \
        DEBIAN_FRONTEND=noninteractive ${http_proxy:+"http_proxy=$http_proxy"} \
        chroot "$root" "$@"
}

clean_root_mount() {
    local root=$1 node
    mount -t proc none "$root/proc"
    # Not the machine's own /dev: what is installed here must find none of its devices.
    mount -t tmpfs -o mode=0755 none "$root/dev"
    for node in null zero full random urandom tty; do
        [ -e "/dev/$node" ] || continue
        touch "$root/dev/$node"
        mount --bind "/dev/$node" "$root/dev/$node"
    done
    ln -s /proc/self/fd "$root/dev/fd"
    ln -s /proc/self/fd/0 "$root/dev/stdin"
    ln -s /proc/self/fd/1 "$root/dev/stdout"
    ln -s /proc/self/fd/2 "$root/dev/stderr"
    mkdir "$root/dev/shm" "$root/dev/pts"
    mount -t tmpfs -o mode=1777 none "$root/dev/shm"
    mount -t tmpfs -o mode=0755 none "$root/run"
    mkdir -p "$clean_root_store/archives/partial" "$root/var/cache/apt/archives"
    mount --bind "$clean_root_store/archives" "$root/var/cache/apt/archives"
    # What is downloaded stays, and no service is started: there is no init.
    printf 'Binary::apt-get::APT::Keep-Downloaded-Packages "true";\nAPT::Sandbox::User "root";\n' \
        >"$root/etc/apt/apt.conf.d/00clean-root"
    printf '#!/bin/sh\nexit 101\n' >"$root/usr/sbin/policy-rc.d"
    chmod 755 "$root/usr/sbin/policy-rc.d"
    rm -f "$root/etc/resolv.conf"
    cp -L /etc/resolv.conf "$root/etc/resolv.conf" || true
}

clean_root_install() {
    local root=$1
    shift
    local install=(apt-get install -y -qq --no-install-recommends -o Dpkg::Use-Pty=0
        -o Dpkg::Options::=--force-unsafe-io)
    in_root "$root" "${install[@]}" "$@" || {
        # What the lists name may be gone from the mirror since they were fetched.
        in_root "$root" apt-get update -qq
        in_root "$root" "${install[@]}" "$@"
    }
}

clean_root_made() {
    local kept work base=$clean_root_store/$clean_root_suite.tar
    mkdir -p "$clean_root_store"
    if [ ! -f "$base" ]; then
        local mirror=${DEBIAN_MIRROR:-$(clean_root_mirror || true)}
        # The lists of packages stay, so that apt there knows what can be had.
        mmdebstrap --quiet --format=tar --variant=minbase --skip=cleanup/apt/lists \
            "$clean_root_suite" "$base.new" ${mirror:+"$mirror"} >&2 || return 1
        mv "$base.new" "$base"
    fi
    kept=$base
    if [ $# -gt 0 ]; then
        kept=$clean_root_store/$clean_root_suite-$(printf '%s\n' "$@" | sort | sha256sum | cut -c1-16).tar
    fi
    if [ ! -f "$kept" ]; then
        work=$(mktemp -d "$clean_root_store/making.XXXXXX")
        clean_root_making=$work
        # shellcheck disable=SC2016
        tar -C "$work" -xpf "$base" &&
            clean_root_unshared bash -euo pipefail -c 'source "$1"; shift; root=$1; shift
                clean_root_mount "$root"; clean_root_install "$root" "$@"' clean_root \
                "$(realpath "${BASH_SOURCE[0]}")" "$work" "$@" >&2 &&
            rm -f "$work/usr/sbin/policy-rc.d" "$work/etc/apt/apt.conf.d/00clean-root" \
                "$work/etc/resolv.conf" &&
            tar -C "$work" --numeric-owner -cf "$kept.new" . &&
            mv "$kept.new" "$kept"
        rm -rf --one-file-system "$work"
        [ -f "$kept" ] || return 1
    fi
    echo "$kept"
}

clean_root() {
    local folder=$1 archive
    shift
    archive=$(clean_root_made "$@") || return 1
    mkdir -p "$folder"
    tar -C "$folder" -xpf "$archive"
}
