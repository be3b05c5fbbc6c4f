# The revision of the Debian packages, what comes after the program's own version and a hyphen.
#
# A version that the changelog calls unreleased is packaged many times, and apt takes two packages of one
# version for the same: the commit's time, then the number of commits before it, which tells those of one
# second apart, make each newer than the one before. The released one is newer than all of these. Built for
# Debian 12: what is built for a later one is newer.
#
# It has two dots at the most, and is short enough for the names of the files: lintian looks at both.
# On its own, `cmake -P cmake/DebianVersion.cmake` prints the one of the working folder.

# vexa_commit(<folder> <result> <argument>...): what git says about the folder's newest commit, empty where
# there is no git. The folder may be another user's, as with sudo.
function(vexa_commit folder result)
    execute_process(COMMAND "${CMAKE_COMMAND}" -E env TZ=UTC git -c "safe.directory=*" ${ARGN}
                    WORKING_DIRECTORY "${folder}"
                    OUTPUT_VARIABLE said OUTPUT_STRIP_TRAILING_WHITESPACE ERROR_QUIET)
    set(${result} "${said}" PARENT_SCOPE)
endfunction()

# vexa_debian_revision(<folder> <version> <result>)
function(vexa_debian_revision folder version result)
    file(STRINGS "${folder}/CHANGELOG.md" unreleased REGEX "^## ${version} \\(unreleased\\)")
    if(NOT unreleased)
        set(${result} "1+deb12" PARENT_SCOPE)
        return()
    endif()
    vexa_commit("${folder}" time log -1 --format=%cd --date=format-local:%Y%m%d%H%M%S)
    vexa_commit("${folder}" count rev-list --count HEAD)
    vexa_commit("${folder}" hash rev-parse --short=7 HEAD)
    if(time AND count AND hash)
        set(${result} "1~deb12+${time}.${count}.${hash}" PARENT_SCOPE)
    else()
        set(${result} "1~deb12" PARENT_SCOPE)
    endif()
endfunction()

if(CMAKE_SCRIPT_MODE_FILE STREQUAL CMAKE_CURRENT_LIST_FILE)
    file(STRINGS CMakeLists.txt project REGEX "^project\\(.* VERSION ")
    string(REGEX REPLACE ".* VERSION ([0-9.]+).*" "\\1" version "${project}")
    vexa_debian_revision("${CMAKE_CURRENT_SOURCE_DIR}" "${version}" revision)
    execute_process(COMMAND "${CMAKE_COMMAND}" -E echo "${version}-${revision}")
endif()
