#!/usr/bin/env bash
# usage: finish-packages.bash FILE.deb...
#
# Gives packages that CPack has made what it cannot: the packages of the libraries that their programs
# and libraries need (another of these packages included), Multi-Arch, and the same time and order in
# every build. The packages are replaced. Fails when the library has other symbols than its list says.
#
# Variables: SOURCE_DATE_EPOCH  the time of all files
#            DEB_HOST_ARCH      the machine that the packages are for
#            STRIP              that machine's strip
#            MULTIARCH_SAME     the packages that may be installed for several machines
set -euo pipefail

export LC_ALL=C
work=$(mktemp -d)
trap 'rm -rf "$work"' EXIT
# dpkg's tools look for a source package.
mkdir "$work/debian"
printf 'Source: vexatouch\n' >"$work/debian/control"

folders=()
for file; do
    name=$(dpkg-deb --field "$file" Package)
    dpkg-deb --raw-extract "$file" "$work/$name"
    folders+=("$work/$name")
    printf '\nPackage: %s\nArchitecture: any\n' "$name" >>"$work/debian/control"
done

# is_dynamic FILE: a program or library that needs others.
is_dynamic() { readelf --dynamic "$1" 2>/dev/null | grep -q '(NEEDED)'; }

cd "$work"
for folder in "${folders[@]}"; do
    symbols=$folder/DEBIAN/symbols
    [ -f "$symbols" ] || continue
    version=$(sed -n 's/^Version: //p' "$folder/DEBIAN/control")
    # Level 4: a symbol more or less than in the list is an error.
    dpkg-gensymbols -c4 -p"${folder##*/}" -P"$folder" -v"$version" -I"$symbols" \
        -O"$work/symbols" >"$work/difference" || {
        cat "$work/difference"
        echo "finish-packages: the exported symbols are not those of data/debian/runtime/symbols:" \
            "what was added goes there with its version; what is gone breaks programs" >&2
        exit 1
    }
    cp "$work/symbols" "$symbols"
done

for folder in "${folders[@]}"; do
    name=${folder##*/}
    control=$folder/DEBIAN/control
    dynamic=()
    while IFS= read -r -d '' file; do
        if is_dynamic "$file"; then dynamic+=("$file"); fi
    done < <(find "$folder" -path "$folder/DEBIAN" -prune -o -type f -print0)
    if [ ${#dynamic[@]} -gt 0 ]; then
        # As debhelper does. The notes of the trace points have a section of another name and stay.
        "$STRIP" --strip-unneeded --remove-section=.comment --remove-section=.note "${dynamic[@]}"
        needed=$(dpkg-shlibdeps "${folders[@]/#/-S}" -x"$name" -O "${dynamic[@]/#/-e}")
        needed=${needed#shlibs:Depends=}
        if grep -q '^Depends: ' "$control"; then
            sed -i "s/^Depends: /&$needed, /" "$control"
        else
            sed -i "/^Architecture: /a Depends: $needed" "$control"
        fi
    fi
    if [[ " $MULTIARCH_SAME " == *" $name "* ]]; then
        sed -i '/^Architecture: /a Multi-Arch: same' "$control"
    fi
    (
        cd "$folder"
        find . -path ./DEBIAN -prune -o -type f -printf '%P\0' | sort -z | xargs -0 md5sum >DEBIAN/md5sums
    )
done

for file; do
    name=$(dpkg-deb --field "$file" Package)
    # What is older than the commit keeps its time otherwise.
    find "$work/$name" -exec touch --no-dereference --date="@$SOURCE_DATE_EPOCH" {} +
    dpkg-deb --root-owner-group -Zxz --build "$work/$name" "$file" >/dev/null
done
