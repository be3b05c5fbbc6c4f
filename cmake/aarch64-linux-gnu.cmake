# 64-bit Arm by Debian's cross compiler; what it builds runs here under user-mode emulation, with the
# C and C++ libraries of Debian's arm64 packages. Libraries of ours to be linked come from there too,
# through vexa_machine_library(); nothing else is looked for outside of the compiler's own folder.
# A machine of that kind builds with its own compiler.
if(CMAKE_HOST_SYSTEM_PROCESSOR STREQUAL "aarch64")
    return()
endif()
set(CMAKE_SYSTEM_NAME Linux)
set(CMAKE_SYSTEM_PROCESSOR aarch64)
set(CMAKE_C_COMPILER aarch64-linux-gnu-gcc)
set(CMAKE_CXX_COMPILER aarch64-linux-gnu-g++)
set(CMAKE_CROSSCOMPILING_EMULATOR qemu-aarch64)
set(CMAKE_FIND_ROOT_PATH /usr/aarch64-linux-gnu)
set(CMAKE_FIND_ROOT_PATH_MODE_PROGRAM NEVER)
set(CMAKE_FIND_ROOT_PATH_MODE_LIBRARY ONLY)
set(CMAKE_FIND_ROOT_PATH_MODE_INCLUDE ONLY)
set(CMAKE_FIND_ROOT_PATH_MODE_PACKAGE ONLY)
