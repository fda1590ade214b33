# What `cmake --install` puts where, beside the programs: the library with its headers for setup applications, and the SDK
# for plug-in authors, each found by find_package(Welcomer) and by pkg-config.
#
# Components: `welcomer` the programs and what they need, `desktop` the modules, `library`, `dev` for setup applications,
# `plugin-dev` for plug-in authors (nothing of it depends on the architecture), `resolver-sync`, `account-server`.

include(CMakePackageConfigHelpers)

set(WELCOMER_CMAKE_DIR "${CMAKE_INSTALL_LIBDIR}/cmake/Welcomer")
set(WELCOMER_SDK_CMAKE_DIR "${CMAKE_INSTALL_DATADIR}/cmake/WelcomerSdk")
set(WELCOMER_MODULE_INCLUDE_DIR "${CMAKE_INSTALL_INCLUDEDIR}/welcomer/module")

install(TARGETS welcomer-shared EXPORT WelcomerTargets
        LIBRARY DESTINATION "${CMAKE_INSTALL_LIBDIR}" COMPONENT library NAMELINK_COMPONENT dev)
install(EXPORT WelcomerTargets NAMESPACE Welcomer:: DESTINATION "${WELCOMER_CMAKE_DIR}" COMPONENT dev)
install(TARGETS welcomer-sdk EXPORT WelcomerSdkTargets)
install(EXPORT WelcomerSdkTargets NAMESPACE Welcomer:: DESTINATION "${WELCOMER_SDK_CMAKE_DIR}" COMPONENT plugin-dev)

# Every folder of the module by its own name, so that an installed header includes its neighbours as in the source tree.
foreach(room IN LISTS WELCOMER_ROOMS)
    install(DIRECTORY "${PROJECT_SOURCE_DIR}/${room}" DESTINATION "${WELCOMER_MODULE_INCLUDE_DIR}" COMPONENT dev
            FILES_MATCHING PATTERN "*.h"
            # The SDK has a place of its own, and the host's side of the C ABI is nothing for a setup application.
            PATTERN sdk EXCLUDE PATTERN Resources EXCLUDE PATTERN AbiDelegatePlugin.h EXCLUDE
            PATTERN CompletionHandlers.h EXCLUDE PATTERN HostExtensions.h EXCLUDE PATTERN PluginInstances.h EXCLUDE
            PATTERN PropertyListHandles.h EXCLUDE)
endforeach()
install(FILES "${PROJECT_SOURCE_DIR}/backends/Backends.h" DESTINATION "${WELCOMER_MODULE_INCLUDE_DIR}/backends"
        COMPONENT dev)
install(DIRECTORY "${PROJECT_SOURCE_DIR}/sdk/welcomer" DESTINATION "${CMAKE_INSTALL_INCLUDEDIR}" COMPONENT plugin-dev
        FILES_MATCHING PATTERN "*.h" PATTERN "*.hpp")

# welcomer_install_package(NAME DIRECTORY COMPONENT [options of the version file...])
function(welcomer_install_package name directory component)
    configure_package_config_file("${PROJECT_SOURCE_DIR}/cmake/${name}Config.cmake.in"
        "${PROJECT_BINARY_DIR}/${name}Config.cmake" INSTALL_DESTINATION "${directory}")
    write_basic_package_version_file("${PROJECT_BINARY_DIR}/${name}ConfigVersion.cmake"
        COMPATIBILITY SameMinorVersion ${ARGN})
    install(FILES "${PROJECT_BINARY_DIR}/${name}Config.cmake" "${PROJECT_BINARY_DIR}/${name}ConfigVersion.cmake"
            DESTINATION "${directory}" COMPONENT ${component})
endfunction()
welcomer_install_package(Welcomer "${WELCOMER_CMAKE_DIR}" dev)
welcomer_install_package(WelcomerSdk "${WELCOMER_SDK_CMAKE_DIR}" plugin-dev ARCH_INDEPENDENT)

# pkg-config's files name the prefix relative to themselves, so that an installed tree can be moved.
function(welcomer_install_pc name directory component)
    file(RELATIVE_PATH WELCOMER_PC_TO_PREFIX "/prefix/${directory}/pkgconfig" "/prefix")
    configure_file("${PROJECT_SOURCE_DIR}/cmake/${name}.pc.in" "${PROJECT_BINARY_DIR}/${name}.pc" @ONLY)
    install(FILES "${PROJECT_BINARY_DIR}/${name}.pc" DESTINATION "${directory}/pkgconfig" COMPONENT ${component})
endfunction()
welcomer_install_pc(welcomer "${CMAKE_INSTALL_LIBDIR}" dev)
welcomer_install_pc(welcomer-sdk "${CMAKE_INSTALL_DATADIR}" plugin-dev)

# Where packages put their plug-ins.
install(DIRECTORY DESTINATION "${CMAKE_INSTALL_LIBDIR}/welcomer/plugins")
