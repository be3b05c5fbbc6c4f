# vexa_sources(<variable> <folder>): every .cpp below the folder, which need not exist yet.
# Platform/Library is a target of its own and belongs to none of the folders above it.
function(vexa_sources variable folder)
    file(GLOB_RECURSE sources CONFIGURE_DEPENDS "${folder}/*.cpp")
    if(NOT folder MATCHES "/Library$")
        list(FILTER sources EXCLUDE REGEX "/Platform/Library/")
    endif()
    set(${variable} "${sources}" PARENT_SCOPE)
endfunction()

# vexa_add_library(<name> <folder> [DEPENDS <target>...] [EXCLUDE <file>...])
# A folder without sources (headers only) becomes an interface library.
function(vexa_add_library name folder)
    cmake_parse_arguments(PARSE_ARGV 2 arg "" "" "DEPENDS;EXCLUDE")
    vexa_sources(sources "${folder}")
    foreach(file IN LISTS arg_EXCLUDE)
        list(REMOVE_ITEM sources "${folder}/${file}")
    endforeach()
    if(sources)
        add_library(${name} STATIC ${sources})
        set(scope PUBLIC)
    else()
        add_library(${name} INTERFACE)
        set(scope INTERFACE)
    endif()
    target_include_directories(${name} ${scope} "${PROJECT_SOURCE_DIR}")
    target_link_libraries(${name} ${scope} ${arg_DEPENDS})
endfunction()

function(vexa_add_layer name)
    vexa_add_library(${name} "${PROJECT_SOURCE_DIR}/${name}" ${ARGN})
endfunction()

# vexa_layer_uses(<layer> <target>): for the layer's own sources only.
function(vexa_layer_uses layer)
    get_target_property(type ${layer} TYPE)
    if(NOT type STREQUAL "INTERFACE_LIBRARY")
        target_link_libraries(${layer} PRIVATE ${ARGN})
    endif()
endfunction()

# vexa_layer_includes(<layer> <folder>): for the layer and those who link it.
function(vexa_layer_includes layer)
    get_target_property(type ${layer} TYPE)
    if(type STREQUAL "INTERFACE_LIBRARY")
        target_include_directories(${layer} INTERFACE ${ARGN})
    else()
        target_include_directories(${layer} PUBLIC ${ARGN})
    endif()
endfunction()

# vexa_define(<target> <name> <value>): a macro with the text, for those of the target's sources that
# mention it. The others are compiled alike in every checkout, which the compiler cache makes use of.
function(vexa_define target name value)
    get_target_property(sources ${target} SOURCES)
    foreach(source IN LISTS sources)
        file(REAL_PATH "${source}" path BASE_DIRECTORY "${CMAKE_CURRENT_SOURCE_DIR}")
        file(STRINGS "${path}" mentions REGEX "${name}" LIMIT_COUNT 1)
        if(mentions)
            set_property(SOURCE "${source}" APPEND PROPERTY COMPILE_DEFINITIONS
                         "${name}=\"${value}\"")
        endif()
    endforeach()
endfunction()
