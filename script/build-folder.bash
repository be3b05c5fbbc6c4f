# Sourced by the scripts that build.
#
#   build_folder_usable NAME...  says what to do, and fails, where build/ or something in these folders of it
#                                is another user's: what was built with sudo belongs to root

build_folder_usable() {
    local name found=
    [ ! -e build ] || [ -w build ] || found=build
    for name; do
        [ -n "$found" ] || [ ! -e "build/$name" ] || found=$(find "build/$name" -maxdepth 2 ! -writable -print -quit)
    done
    [ -z "$found" ] || {
        echo "${0##*/}: $found belongs to $(stat -c %U "$found") and cannot be written; take the folder over:" \
            "sudo chown --recursive $(id -un) build" >&2
        return 1
    }
}
