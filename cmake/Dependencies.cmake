# What is used from Debian (installed by script/bootstrap):
#   HeaderOnlyBoost, HeaderOnlyCli, HeaderOnlySpdlog, HeaderOnlyFmt,
#   HeaderOnlySystemd, HeaderOnlySdt              header-only, so they serve a cross build as well
#   VexaUdev                         libudev
#   Libevdev                         to be linked; a cross build needs the target machine's
#   VexaGoogleTest                   gtest and gmock with their main
#   rapidcheck, benchmark::benchmark_main
find_package(Threads REQUIRED)

# vexa_header_only(<target> <folder> <header>): the header-only library in /usr/include/<folder>. A
# cross compiler must not see the rest of that folder (the host's C library), so it gets a link to
# the one library.
function(vexa_header_only target folder header)
    add_library(${target} INTERFACE)
    if(NOT EXISTS "/usr/include/${folder}/${header}")
        message(FATAL_ERROR
                "/usr/include/${folder}/${header} is missing: run script/bootstrap first")
    endif()
    if(CMAKE_CROSSCOMPILING)
        file(MAKE_DIRECTORY "${PROJECT_BINARY_DIR}/header-only/${folder}")
        file(REMOVE_RECURSE "${PROJECT_BINARY_DIR}/header-only/${folder}")
        file(CREATE_LINK "/usr/include/${folder}" "${PROJECT_BINARY_DIR}/header-only/${folder}"
             SYMBOLIC)
        target_include_directories(${target} SYSTEM INTERFACE "${PROJECT_BINARY_DIR}/header-only")
    endif()
endfunction()

vexa_header_only(HeaderOnlyBoost boost json.hpp)
vexa_header_only(HeaderOnlyCli CLI CLI.hpp)
vexa_header_only(HeaderOnlySpdlog spdlog spdlog.h)
vexa_header_only(HeaderOnlyFmt fmt format.h)
vexa_header_only(HeaderOnlySystemd systemd sd-journal.h)

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

# A library to be linked. A cross build that has none for its machine compiles all the same; what
# uses it cannot be linked then.
add_library(VexaUdev INTERFACE)
if(NOT EXISTS /usr/include/libudev.h)
    message(FATAL_ERROR "/usr/include/libudev.h is missing: run script/bootstrap first")
endif()
find_library(VEXA_UDEV_LIBRARY udev)
if(VEXA_UDEV_LIBRARY)
    target_link_libraries(VexaUdev INTERFACE "${VEXA_UDEV_LIBRARY}")
elseif(NOT CMAKE_CROSSCOMPILING)
    message(FATAL_ERROR "libudev is missing: run script/bootstrap first")
endif()
if(CMAKE_CROSSCOMPILING)
    file(COPY /usr/include/libudev.h DESTINATION "${PROJECT_BINARY_DIR}/header-only-udev")
    target_include_directories(VexaUdev SYSTEM INTERFACE "${PROJECT_BINARY_DIR}/header-only-udev")
endif()

# The header stands in a folder of its own. A cross build finds the target machine's library where
# Debian puts it; without one it still builds whatever has no keyboard.
find_path(VEXA_LIBEVDEV_HEADERS libevdev/libevdev.h PATHS /usr/include PATH_SUFFIXES libevdev-1.0
          NO_CMAKE_FIND_ROOT_PATH)
if(NOT VEXA_LIBEVDEV_HEADERS)
    message(FATAL_ERROR "libevdev/libevdev.h is missing: run script/bootstrap first")
endif()
find_library(VEXA_LIBEVDEV evdev
             PATHS "/usr/lib/${CMAKE_SYSTEM_PROCESSOR}-linux-gnu" NO_CMAKE_FIND_ROOT_PATH
             NO_DEFAULT_PATH)
if(NOT VEXA_LIBEVDEV)
    set(VEXA_LIBEVDEV evdev)
endif()
add_library(Libevdev INTERFACE)
target_include_directories(Libevdev SYSTEM INTERFACE "${VEXA_LIBEVDEV_HEADERS}")
target_link_libraries(Libevdev INTERFACE "${VEXA_LIBEVDEV}")

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
