# Debian packages, by `cpack` in a build folder of the presets package-*: one of each component of
# Install.cmake. script/package does the whole.
#
# CPack makes the packages but knows neither the dependencies of a library on another package of
# the same build, nor Multi-Arch, nor constant times: finish-packages.bash sees to these afterwards.
set(VEXA_DEBIAN "${PROJECT_SOURCE_DIR}/data/debian")
set(VEXA_DEBIAN_MADE "${PROJECT_BINARY_DIR}/debian")
include(DebianVersion)
vexa_debian_revision("${PROJECT_SOURCE_DIR}" "${PROJECT_VERSION}" VEXA_DEBIAN_REVISION)
set(VEXA_DEBIAN_VERSION "${PROJECT_VERSION}-${VEXA_DEBIAN_REVISION}")
set(VEXA_MAINTAINER "Vexa Touch maintainers <maintainers@vexatouch.org>")

# The time of everything in the packages: of the commit, so that the same commit gives the same bytes.
if(DEFINED ENV{SOURCE_DATE_EPOCH})
    set(VEXA_EPOCH "$ENV{SOURCE_DATE_EPOCH}")
else()
    vexa_commit("${PROJECT_SOURCE_DIR}" VEXA_EPOCH log -1 --format=%ct)
    if(NOT VEXA_EPOCH)
        file(TIMESTAMP "${PROJECT_SOURCE_DIR}/CHANGELOG.md" VEXA_EPOCH "%s" UTC)
    endif()
endif()
set(ENV{SOURCE_DATE_EPOCH} "${VEXA_EPOCH}")
string(TIMESTAMP VEXA_DEBIAN_DATE "%a, %d %b %Y %H:%M:%S +0000" UTC)

# vexa_compressed(<file> <made>)
function(vexa_compressed file made)
    execute_process(COMMAND gzip -9nc "${file}" OUTPUT_FILE "${made}" COMMAND_ERROR_IS_FATAL ANY)
    set_property(DIRECTORY APPEND PROPERTY CMAKE_CONFIGURE_DEPENDS "${file}")
endfunction()

# Debian's name of the machine that is built for.
if(CMAKE_SYSTEM_PROCESSOR MATCHES "aarch64|arm64")
    set(CPACK_DEBIAN_PACKAGE_ARCHITECTURE arm64)
elseif(CMAKE_SYSTEM_PROCESSOR STREQUAL "x86_64")
    set(CPACK_DEBIAN_PACKAGE_ARCHITECTURE amd64)
endif()

# vexa_package(<component> <package> SECTION <section> SUMMARY <line> ABOUT <text>
#              [MACHINE all] [DEPENDS <dependencies>] [RECOMMENDS <dependencies>] [CONTROL <file>...]
#              [OVERRIDES <file>])
# Sets CPack's variables of the component, and installs what each package has to have. The text is
# without semicolons, which CPack takes for the end of an item.
macro(vexa_package component name)
    cmake_parse_arguments(arg "" "SECTION;SUMMARY;ABOUT;MACHINE;DEPENDS;RECOMMENDS;OVERRIDES" "CONTROL" ${ARGN})
    string(TOUPPER "${component}" upper)
    list(APPEND CPACK_COMPONENTS_ALL ${component})
    set(CPACK_DEBIAN_${upper}_PACKAGE_NAME "${name}")
    set(CPACK_DEBIAN_${upper}_PACKAGE_SECTION "${arg_SECTION}")
    set(CPACK_DEBIAN_${upper}_PACKAGE_DEPENDS "${arg_DEPENDS}")
    set(CPACK_DEBIAN_${upper}_PACKAGE_RECOMMENDS "${arg_RECOMMENDS}")
    set(CPACK_DEBIAN_${upper}_DESCRIPTION "${arg_SUMMARY}\n${arg_ABOUT}")
    if(arg_CONTROL)
        set(CPACK_DEBIAN_${upper}_PACKAGE_CONTROL_EXTRA "${arg_CONTROL}")
    endif()
    if(arg_MACHINE)
        set(CPACK_DEBIAN_${upper}_PACKAGE_ARCHITECTURE "${arg_MACHINE}")
    endif()
    install(FILES "${VEXA_DEBIAN}/copyright" "${VEXA_DEBIAN_MADE}/changelog.Debian.gz"
                  "${VEXA_DEBIAN_MADE}/changelog.gz"
            DESTINATION "${CMAKE_INSTALL_DATADIR}/doc/${name}" COMPONENT ${component}
            EXCLUDE_FROM_ALL)
    if(arg_OVERRIDES)
        install(FILES "${arg_OVERRIDES}" RENAME "${name}" COMPONENT ${component} EXCLUDE_FROM_ALL
                DESTINATION "${CMAKE_INSTALL_DATADIR}/lintian/overrides")
    endif()
endmacro()

configure_file("${VEXA_DEBIAN}/changelog.in" "${VEXA_DEBIAN_MADE}/changelog" @ONLY)
configure_file("${VEXA_DEBIAN}/shlibs.in" "${VEXA_DEBIAN_MADE}/shlibs" @ONLY)
vexa_compressed("${VEXA_DEBIAN_MADE}/changelog" "${VEXA_DEBIAN_MADE}/changelog.Debian.gz")
vexa_compressed("${PROJECT_SOURCE_DIR}/CHANGELOG.md" "${VEXA_DEBIAN_MADE}/changelog.gz")

vexa_package(runtime libvexaplatform1
    SECTION libs
    SUMMARY "platform library of touch surfaces"
    ABOUT "The objects that a host and a HID service plug-in have in common, behind a
C interface: values, events, queues, run loops, devices, the log and trace
points. One copy serves the whole process.
"
    # Loaded by dlopen, for the journal.
    RECOMMENDS "libsystemd0"
    CONTROL "${VEXA_DEBIAN}/runtime/triggers" "${VEXA_DEBIAN}/runtime/symbols"
            "${VEXA_DEBIAN_MADE}/shlibs")
vexa_package(development libvexaplatform-dev
    SECTION libdevel
    SUMMARY "platform library of touch surfaces (development files)"
    ABOUT "The objects that a host and a HID service plug-in have in common, behind a
C interface: values, events, queues, run loops, devices, the log and trace
points.

This package has what is needed to build a host or a plug-in: the headers,
the interface between the two (vexa/plugin.h) among them, and what CMake and
pkg-config ask for.
"
    DEPENDS "libvexaplatform1 (= ${VEXA_DEBIAN_VERSION})")
vexa_package(plugin vexatouch-plugin
    SECTION libs
    SUMMARY "gestures from a capacitive touch surface (HID service plug-in)"
    ABOUT "Makes taps, holds and slides of the raw touch images of a surface of fifteen
pixels and three buttons, at most one a frame, and always the same for the
same input. Every input is recorded.

This package has the plug-in alone, to be loaded by a host.
")
vexa_package(tools vexatouch
    SECTION utils
    SUMMARY "gestures from a capacitive touch surface (program)"
    ABOUT "Runs the touch service live on a surface that is plugged in, a simulated
one or a recording, and sends its gestures as media keys. It records what a
surface sends, replays, shows, compares and converts recordings, measures
latency, and holds any plug-in to the interface between host and plug-in.
"
    DEPENDS "vexatouch-plugin (= ${VEXA_DEBIAN_VERSION})")
vexa_package(daemon vexatouch-daemon
    SECTION admin
    MACHINE all
    SUMMARY "gestures from a capacitive touch surface (system service)"
    ABOUT "Serves every touch surface as soon as it is plugged in: its gestures become
media keys, and programs watch and tune it on the system message bus as
org.vexatouch.Touch1.

Users at the machine may watch. Changing settings and seeing raw touches takes
root or the group vexatouch.
"
    DEPENDS "vexatouch (= ${VEXA_DEBIAN_VERSION}), default-dbus-system-bus | dbus-system-bus, \
dbus-bin, udev, systemd | systemd-standalone-sysusers | systemd-sysusers"
    CONTROL "${VEXA_DEBIAN}/daemon/postinst" "${VEXA_DEBIAN}/daemon/prerm"
            "${VEXA_DEBIAN}/daemon/postrm"
    OVERRIDES "${VEXA_DEBIAN}/daemon/lintian-overrides")

set(CPACK_GENERATOR DEB)
set(CPACK_PACKAGE_NAME vexatouch)
set(CPACK_PACKAGE_VENDOR "Vexa Touch")
set(CPACK_PACKAGE_CONTACT "${VEXA_MAINTAINER}")
set(CPACK_PACKAGE_VERSION "${PROJECT_VERSION}")
# The first line of each package's own description is its summary.
set(CPACK_PACKAGE_DESCRIPTION_SUMMARY "")
set(CPACK_PACKAGE_DIRECTORY "${PROJECT_BINARY_DIR}/packages")
# Units and rules of udev lie outside of the prefix.
set(CPACK_SET_DESTDIR ON)
set(CPACK_INSTALL_PREFIX "${CMAKE_INSTALL_PREFIX}")
set(CPACK_INSTALL_DEFAULT_DIRECTORY_PERMISSIONS OWNER_READ OWNER_WRITE OWNER_EXECUTE
    GROUP_READ GROUP_EXECUTE WORLD_READ WORLD_EXECUTE)
set(CPACK_DEB_COMPONENT_INSTALL ON)
set(CPACK_COMPONENTS_GROUPING IGNORE)
set(CPACK_DEBIAN_FILE_NAME DEB-DEFAULT)
set(CPACK_DEBIAN_PACKAGE_RELEASE "${VEXA_DEBIAN_REVISION}")
set(CPACK_DEBIAN_PACKAGE_SOURCE vexatouch)
set(CPACK_DEBIAN_PACKAGE_PRIORITY optional)
set(CPACK_DEBIAN_PACKAGE_CONTROL_STRICT_PERMISSION ON)
set(CPACK_POST_BUILD_SCRIPTS "${PROJECT_SOURCE_DIR}/cmake/FinishPackages.cmake")
set(CPACK_VEXA_FINISH "${PROJECT_SOURCE_DIR}/cmake/finish-packages.bash")
set(CPACK_VEXA_EPOCH "${VEXA_EPOCH}")
set(CPACK_VEXA_STRIP "${CMAKE_STRIP}")
set(CPACK_VEXA_MULTIARCH_SAME libvexaplatform1 libvexaplatform-dev vexatouch-plugin)
include(CPack)
