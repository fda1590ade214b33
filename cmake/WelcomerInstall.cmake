# What `cmake --install` puts where: the programs, the library with its headers for setup applications, and the SDK for
# plug-in authors, each found by find_package(Welcomer) and by pkg-config.

include(CMakePackageConfigHelpers)

set(WELCOMER_CMAKE_DIR "${CMAKE_INSTALL_LIBDIR}/cmake/Welcomer")
set(WELCOMER_MODULE_INCLUDE_DIR "${CMAKE_INSTALL_INCLUDEDIR}/welcomer/module")

install(TARGETS welcomer welcomer-sdk EXPORT WelcomerTargets ARCHIVE DESTINATION "${CMAKE_INSTALL_LIBDIR}")
install(EXPORT WelcomerTargets NAMESPACE Welcomer:: DESTINATION "${WELCOMER_CMAKE_DIR}")

# Every folder of the module by its own name, so that an installed header includes its neighbours as in the source tree.
foreach(room IN LISTS WELCOMER_ROOMS)
    install(DIRECTORY "${PROJECT_SOURCE_DIR}/${room}" DESTINATION "${WELCOMER_MODULE_INCLUDE_DIR}"
            FILES_MATCHING PATTERN "*.h"
            # The SDK has a place of its own, and the host's side of the C ABI is nothing for a setup application.
            PATTERN sdk EXCLUDE PATTERN AbiDelegatePlugin.h EXCLUDE PATTERN CompletionHandlers.h EXCLUDE
            PATTERN PropertyListHandles.h EXCLUDE)
endforeach()
install(FILES "${PROJECT_SOURCE_DIR}/backends/Backends.h" DESTINATION "${WELCOMER_MODULE_INCLUDE_DIR}/backends")
install(DIRECTORY "${PROJECT_SOURCE_DIR}/sdk/welcomer" DESTINATION "${CMAKE_INSTALL_INCLUDEDIR}"
        FILES_MATCHING PATTERN "*.h" PATTERN "*.hpp")

configure_package_config_file("${CMAKE_CURRENT_LIST_DIR}/WelcomerConfig.cmake.in"
    "${PROJECT_BINARY_DIR}/WelcomerConfig.cmake" INSTALL_DESTINATION "${WELCOMER_CMAKE_DIR}")
write_basic_package_version_file("${PROJECT_BINARY_DIR}/WelcomerConfigVersion.cmake" COMPATIBILITY SameMinorVersion)
install(FILES "${PROJECT_BINARY_DIR}/WelcomerConfig.cmake" "${PROJECT_BINARY_DIR}/WelcomerConfigVersion.cmake"
        DESTINATION "${WELCOMER_CMAKE_DIR}")

# pkg-config's files name the prefix relative to themselves, so that an installed tree can be moved.
file(RELATIVE_PATH WELCOMER_PC_TO_PREFIX "/prefix/${CMAKE_INSTALL_LIBDIR}/pkgconfig" "/prefix")
foreach(package welcomer welcomer-sdk)
    configure_file("${CMAKE_CURRENT_LIST_DIR}/${package}.pc.in" "${PROJECT_BINARY_DIR}/${package}.pc" @ONLY)
    install(FILES "${PROJECT_BINARY_DIR}/${package}.pc" DESTINATION "${CMAKE_INSTALL_LIBDIR}/pkgconfig")
endforeach()
