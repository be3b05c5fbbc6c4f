set(CMAKE_CXX_STANDARD 20)
set(CMAKE_CXX_STANDARD_REQUIRED ON)
set(CMAKE_CXX_EXTENSIONS OFF)

if(NOT DEFINED CMAKE_CXX_COMPILER_LAUNCHER)
    find_program(VEXA_CCACHE ccache)
    if(VEXA_CCACHE)
        # Without the folders in the key, presets with equal flags share what they compile, and so
        # do checkouts.
        set(CMAKE_CXX_COMPILER_LAUNCHER "${CMAKE_COMMAND}" -E env CCACHE_NOHASHDIR=1
                                        "CCACHE_BASEDIR=${PROJECT_SOURCE_DIR}" "${VEXA_CCACHE}")
        set(CMAKE_C_COMPILER_LAUNCHER ${CMAKE_CXX_COMPILER_LAUNCHER})
    endif()
endif()

# Results are exact to the bit on every compiler and machine: each float operation is rounded on its
# own, so nothing may be fused.
add_compile_options(-ffp-contract=off)

# Everything may end up in a shared library, and nothing leaves one but what says so.
set(CMAKE_POSITION_INDEPENDENT_CODE ON)
set(CMAKE_CXX_VISIBILITY_PRESET hidden)
set(CMAKE_C_VISIBILITY_PRESET hidden)
set(CMAKE_VISIBILITY_INLINES_HIDDEN ON)
set(CMAKE_C_STANDARD 11)
set(CMAKE_C_STANDARD_REQUIRED ON)
set(CMAKE_C_EXTENSIONS OFF)

add_compile_options(-Wall -Wextra -Wpedantic -Wshadow -Wconversion)
if(CMAKE_CXX_COMPILER_ID MATCHES "Clang")
    add_compile_options(-Wthread-safety)
endif()
if(CMAKE_CXX_COMPILER_ID STREQUAL "GNU" AND CMAKE_CXX_COMPILER_VERSION VERSION_LESS 13)
    # g++ 12 sees overlaps and overruns inside its own library's inlined string and vector code
    # (GCC bugs 105329 and 105651). clang and the address sanitizer look at the same code.
    add_compile_options(-Wno-restrict -Wno-array-bounds -Wno-stringop-overflow
                        -Wno-stringop-overread)
endif()
if(VEXA_WERROR)
    add_compile_options(-Werror)
endif()

if(CMAKE_BUILD_TYPE STREQUAL "Release")
    # As Debian hardens its programs. What is measured and tested is what is packaged.
    add_compile_options(-fstack-protector-strong -fstack-clash-protection)
    add_compile_definitions(_FORTIFY_SOURCE=2)
    add_link_options(-Wl,-z,relro,-z,now)
endif()

if(VEXA_SANITIZE)
    add_compile_options(-fsanitize=${VEXA_SANITIZE} -fno-sanitize-recover=all
                        -fno-omit-frame-pointer)
    add_link_options(-fsanitize=${VEXA_SANITIZE})
endif()

if(VEXA_FUZZ AND NOT VEXA_SANITIZE MATCHES "fuzzer-no-link")
    message(FATAL_ERROR "VEXA_FUZZ needs clang and instrumented layers (use the preset `fuzz`)")
endif()

if(VEXA_COVERAGE)
    add_compile_options(--coverage -fno-inline -fprofile-update=atomic)
    add_link_options(--coverage)
endif()
