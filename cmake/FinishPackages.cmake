# Run by cpack when the packages are made.
list(JOIN CPACK_VEXA_MULTIARCH_SAME " " same)
execute_process(
    COMMAND ${CMAKE_COMMAND} -E env "SOURCE_DATE_EPOCH=${CPACK_VEXA_EPOCH}"
            "MULTIARCH_SAME=${same}" "STRIP=${CPACK_VEXA_STRIP}"
            "DEB_HOST_ARCH=${CPACK_DEBIAN_PACKAGE_ARCHITECTURE}"
            bash "${CPACK_VEXA_FINISH}" ${CPACK_PACKAGE_FILES}
    COMMAND_ERROR_IS_FATAL ANY)
