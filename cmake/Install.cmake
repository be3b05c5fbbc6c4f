# What is installed, and where. Each part is a component, of which Packages.cmake makes a package:
# runtime (the library), development, plugin, tools, daemon.
set(VEXA_UNIT_DIR "lib/systemd/system" CACHE PATH "Where the daemon's unit goes")
set(VEXA_UDEV_DIR "lib/udev" CACHE PATH "Where the rules of udev go, without rules.d")

# vexa_install_library(<target> HEADERS <folder>): the shared library; for those who build on it its
# headers and what finds it, for CMake (find_package(VexaPlatform)) and for pkg-config.
function(vexa_install_library target)
    cmake_parse_arguments(PARSE_ARGV 1 arg "" "HEADERS" "")
    install(TARGETS ${target} EXPORT VexaPlatform
            LIBRARY COMPONENT runtime NAMELINK_COMPONENT development)
    install(DIRECTORY ${arg_HEADERS} TYPE INCLUDE COMPONENT development)

    include(CMakePackageConfigHelpers)
    set(folder "${CMAKE_INSTALL_LIBDIR}/cmake/VexaPlatform")
    install(EXPORT VexaPlatform FILE VexaPlatformConfig.cmake NAMESPACE VexaPlatform::
            DESTINATION "${folder}" COMPONENT development)
    write_basic_package_version_file("${PROJECT_BINARY_DIR}/VexaPlatformConfigVersion.cmake"
                                     COMPATIBILITY SameMajorVersion)
    install(FILES "${PROJECT_BINARY_DIR}/VexaPlatformConfigVersion.cmake"
            DESTINATION "${folder}" COMPONENT development)

    vexa_install_configured("${PROJECT_SOURCE_DIR}/data/pkgconfig/vexaplatform.pc.in"
                            "${CMAKE_INSTALL_LIBDIR}/pkgconfig/vexaplatform.pc" development)
endfunction()

# vexa_install_program(<target>): the program with its man pages and completion, which it makes from
# its own table of commands. One for another machine is run by the emulator of that machine.
function(vexa_install_program target)
    install(TARGETS ${target} COMPONENT tools)
    if(CMAKE_CROSSCOMPILING AND NOT CMAKE_CROSSCOMPILING_EMULATOR)
        return()
    endif()
    add_custom_command(TARGET ${target} POST_BUILD
                       COMMAND ${CMAKE_COMMAND} -E rm -rf "${PROJECT_BINARY_DIR}/man"
                       COMMAND ${target} --generate-man "${PROJECT_BINARY_DIR}/man"
                       COMMAND gzip -9nr "${PROJECT_BINARY_DIR}/man"
                       COMMAND ${target} --generate-completion
                               > "${PROJECT_BINARY_DIR}/vexatouch.bash")
    install(DIRECTORY "${PROJECT_BINARY_DIR}/man/" COMPONENT tools
            DESTINATION "${CMAKE_INSTALL_MANDIR}/man1" FILES_MATCHING PATTERN "*.1.gz")
    install(FILES "${PROJECT_BINARY_DIR}/vexatouch.bash" RENAME vexatouch COMPONENT tools
            DESTINATION "${CMAKE_INSTALL_DATADIR}/bash-completion/completions")
endfunction()

# vexa_install_system_files(<folder>): what the system must know of the daemon: unit, user, bus policy,
# interfaces, device nodes.
function(vexa_install_system_files folder)
    string(PREPEND folder "${PROJECT_SOURCE_DIR}/")
    # The unit as it will be, for the tests.
    set(VEXA_BINDIR "${CMAKE_INSTALL_FULL_BINDIR}")
    configure_file("${folder}/systemd/vexatouch.service.in" data/vexatouch.service @ONLY)

    vexa_install_configured("${folder}/systemd/vexatouch.service.in"
                            "${VEXA_UNIT_DIR}/vexatouch.service" daemon)
    vexa_install_configured("${folder}/udev/72-vexatouch.rules.in"
                            "${VEXA_UDEV_DIR}/rules.d/72-vexatouch.rules" daemon)
    install(FILES "${folder}/systemd/vexatouch.sysusers" RENAME vexatouch.conf
            DESTINATION lib/sysusers.d COMPONENT daemon)
    install(FILES "${folder}/systemd/vexatouch.modules-load" RENAME vexatouch.conf
            DESTINATION lib/modules-load.d COMPONENT daemon)
    install(FILES "${folder}/dbus/org.vexatouch.Touch1.conf"
            DESTINATION "${CMAKE_INSTALL_DATADIR}/dbus-1/system.d" COMPONENT daemon)
    install(FILES "${folder}/dbus/org.vexatouch.Touch1.xml"
            DESTINATION "${CMAKE_INSTALL_DATADIR}/dbus-1/interfaces" COMPONENT daemon)
endfunction()

# vexa_install_configured(<template> <destination> <component>): a file that names folders of the
# installation. It is made when it is installed, since `cmake --install --prefix` may change them:
# @VEXA_PREFIX@, @VEXA_BINDIR@, and relative to the prefix @CMAKE_INSTALL_LIBDIR@ and
# @CMAKE_INSTALL_INCLUDEDIR@.
function(vexa_install_configured template destination component)
    get_filename_component(folder "${destination}" DIRECTORY)
    get_filename_component(name "${destination}" NAME)
    set(made "${PROJECT_BINARY_DIR}/installed/${name}")
    set(script "
        set(VEXA_PREFIX \"\${CMAKE_INSTALL_PREFIX}\")
        set(VEXA_BINDIR \"\${CMAKE_INSTALL_PREFIX}/${CMAKE_INSTALL_BINDIR}\")
    ")
    foreach(variable PROJECT_VERSION PROJECT_DESCRIPTION CMAKE_INSTALL_LIBDIR
                     CMAKE_INSTALL_INCLUDEDIR)
        string(APPEND script "set(${variable} \"${${variable}}\")\n")
    endforeach()
    string(APPEND script "configure_file(\"${template}\" \"${made}\" @ONLY)")
    install(CODE "${script}" COMPONENT ${component})
    install(FILES "${made}" DESTINATION "${folder}" COMPONENT ${component})
endfunction()
