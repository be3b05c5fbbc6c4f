# What is used from Debian (installed by script/bootstrap):
#   HeaderOnlyBoost, HeaderOnlyCli, HeaderOnlySpdlog, HeaderOnlyFmt,
#   HeaderOnlySystemd, HeaderOnlySdt              header-only, so they serve a cross build as well
#   LibEvent, LibUdev, LibEvdev, LibSystemd
#                                    to be linked, of the machine that is built for
#   VexaGoogleTest                   gtest and gmock with their main
#   rapidcheck, benchmark::benchmark_main
find_package(Threads REQUIRED)

# vexa_header_only(<target> <folder> [<header>]): the header-only library in /usr/include/<folder>, or
# the one header /usr/include/<folder>. A cross compiler must not see the rest of /usr/include (the
# host's C library), so it gets a link to the one library.
function(vexa_header_only target folder)
    add_library(${target} INTERFACE)
    set(header "/usr/include/${folder}")
    if(ARGC GREATER 2)
        string(APPEND header "/${ARGV2}")
    endif()
    if(NOT EXISTS "${header}")
        message(FATAL_ERROR "${header} is missing: run script/bootstrap first")
    endif()
    if(CMAKE_CROSSCOMPILING)
        set(link "${PROJECT_BINARY_DIR}/header-only/${folder}")
        get_filename_component(parent "${link}" DIRECTORY)
        file(MAKE_DIRECTORY "${parent}")
        file(REMOVE_RECURSE "${link}")
        file(CREATE_LINK "/usr/include/${folder}" "${link}" SYMBOLIC)
        target_include_directories(${target} SYSTEM INTERFACE "${PROJECT_BINARY_DIR}/header-only")
    endif()
endfunction()

# vexa_machine_library(<target> <file> <folder> [<header>]): a library to link, by the file name under
# which programs ask for it (its soname), of the machine that is built for, with headers as above. The
# headers come from the -dev package of the machine that builds; of the machine that is built for the
# package with the library itself is enough (PACKAGE:arm64 in script/bootstrap), since many -dev
# packages cannot be installed for two machines.
function(vexa_machine_library target file)
    vexa_header_only(${target} ${ARGN})
    find_library(${target}_FILE NAMES "${file}"
                 PATHS "/usr/lib/${CMAKE_LIBRARY_ARCHITECTURE}" NO_DEFAULT_PATH
                 NO_CMAKE_FIND_ROOT_PATH)
    if(NOT ${target}_FILE)
        message(FATAL_ERROR "/usr/lib/${CMAKE_LIBRARY_ARCHITECTURE}/${file} is missing: run "
                            "script/bootstrap first")
    endif()
    target_link_libraries(${target} INTERFACE "${${target}_FILE}")
endfunction()

vexa_header_only(HeaderOnlyBoost boost json.hpp)
vexa_header_only(HeaderOnlyCli CLI CLI.hpp)
vexa_header_only(HeaderOnlySpdlog spdlog spdlog.h)
vexa_header_only(HeaderOnlyFmt fmt format.h)
vexa_header_only(HeaderOnlySystemd systemd sd-journal.h)

vexa_machine_library(LibEvent libevent_core-2.1.so.7 event2 event.h)
vexa_machine_library(LibSystemd libsystemd.so.0 systemd sd-bus.h)
vexa_machine_library(LibUdev libudev.so.1 libudev.h)
vexa_machine_library(LibEvdev libevdev.so.2 libevdev-1.0 libevdev/libevdev.h)
# Its headers include each other without the folder of the version.
if(CMAKE_CROSSCOMPILING)
    target_include_directories(LibEvdev SYSTEM INTERFACE
                               "${PROJECT_BINARY_DIR}/header-only/libevdev-1.0")
else()
    target_include_directories(LibEvdev SYSTEM INTERFACE /usr/include/libevdev-1.0)
endif()

# Trace points are one header that serves every machine; Debian keeps it with the host's own.
find_file(VEXA_SDT_HEADER sys/sdt.h PATHS /usr/include
          PATH_SUFFIXES "${CMAKE_HOST_SYSTEM_PROCESSOR}-linux-gnu" NO_CMAKE_FIND_ROOT_PATH REQUIRED)
add_library(HeaderOnlySdt INTERFACE)
if(CMAKE_CROSSCOMPILING)
    get_filename_component(sdt_folder "${VEXA_SDT_HEADER}" DIRECTORY)
    file(COPY "${VEXA_SDT_HEADER}" "${sdt_folder}/sdt-config.h"
         DESTINATION "${PROJECT_BINARY_DIR}/header-only-sdt/sys")
    target_include_directories(HeaderOnlySdt SYSTEM INTERFACE
                               "${PROJECT_BINARY_DIR}/header-only-sdt")
endif()

if(VEXA_TESTS)
    add_library(VexaGoogleTest INTERFACE)
    if(CMAKE_CROSSCOMPILING)
        # Debian has no library for the target machine, but it ships the sources.
        set(INSTALL_GTEST OFF)
        set(CMAKE_POLICY_DEFAULT_CMP0077 NEW)
        set(CMAKE_CXX_STANDARD 20)
        add_subdirectory(/usr/src/googletest "${PROJECT_BINARY_DIR}/googletest" EXCLUDE_FROM_ALL
                         SYSTEM)
        foreach(target gtest gmock gmock_main)
            target_compile_options(${target} PRIVATE -w)
        endforeach()
        target_link_libraries(VexaGoogleTest INTERFACE gmock_main gmock gtest)
    else()
        find_package(GTest REQUIRED)
        target_link_libraries(VexaGoogleTest INTERFACE GTest::gmock_main GTest::gmock GTest::gtest)
    endif()
    target_link_libraries(VexaGoogleTest INTERFACE Threads::Threads)
    include(GoogleTest)
    if(VEXA_PROPERTY_TESTS)
        find_package(rapidcheck REQUIRED)
        find_package(nlohmann_json REQUIRED)
    endif()
endif()
if(VEXA_BENCHMARKS)
    find_package(benchmark REQUIRED)
endif()
