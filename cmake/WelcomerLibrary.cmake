# The shared library, from the objects of the archive `welcomer`.

# What compiling against the headers in the source tree takes, whichever of the two is linked.
add_library(welcomer-headers INTERFACE)
find_package(Threads REQUIRED)
target_link_libraries(welcomer-headers INTERFACE Threads::Threads ${CMAKE_DL_LIBS})
target_include_directories(welcomer-headers INTERFACE
    "${PROJECT_SOURCE_DIR}" "${PROJECT_BINARY_DIR}") # generated/
# Short-lived programs: what they call is bound in one go, and their relocations are few pages to read. The library is bound
# as it is called: of what all of it calls, the agent needs a part, and binding the rest is a tenth of its start.
include(CheckLinkerFlag)
check_linker_flag(CXX -Wl,-z,pack-relative-relocs WELCOMER_PACKS_RELOCATIONS)
target_link_options(welcomer-headers INTERFACE
    $<IF:$<STREQUAL:$<TARGET_PROPERTY:TYPE>,SHARED_LIBRARY>,-Wl$<COMMA>-z$<COMMA>lazy,-Wl$<COMMA>-z$<COMMA>now>
    $<$<BOOL:${WELCOMER_PACKS_RELOCATIONS}>:-Wl,-z,pack-relative-relocs>)

# The version script says what is exported; the compiler does not hide it. What the library calls of its own is bound when
# it is linked, so that nothing in a program takes its place, and no look-up is left for the loader.
set_target_properties(welcomer PROPERTIES CXX_VISIBILITY_PRESET default)
target_compile_options(welcomer PRIVATE -fno-semantic-interposition
    # Else each constant of a header is looked for in the whole process at every start.
    $<$<CXX_COMPILER_ID:GNU>:-fno-gnu-unique>)
set(WELCOMER_SOVERSION 0)
set(WELCOMER_VERSION_SCRIPT "${PROJECT_BINARY_DIR}/generated/welcomer.map")
configure_file("${CMAKE_CURRENT_LIST_DIR}/welcomer.map.in" "${WELCOMER_VERSION_SCRIPT}" @ONLY)

add_library(welcomer-shared SHARED $<TARGET_OBJECTS:welcomer>)
add_library(Welcomer::welcomer ALIAS welcomer-shared)
welcomer_configure_target(welcomer-shared)
target_link_libraries(welcomer-shared PUBLIC $<BUILD_INTERFACE:welcomer-headers>)
target_include_directories(welcomer-shared INTERFACE
    $<INSTALL_INTERFACE:${CMAKE_INSTALL_INCLUDEDIR}/welcomer/module>)
target_compile_features(welcomer-shared INTERFACE cxx_std_20)
target_link_options(welcomer-shared PRIVATE "-Wl,--version-script,${WELCOMER_VERSION_SCRIPT}" -Wl,-Bsymbolic -Wl,-O1)
set_target_properties(welcomer-shared PROPERTIES
    LINKER_LANGUAGE CXX OUTPUT_NAME welcomer EXPORT_NAME welcomer
    VERSION ${PROJECT_VERSION} SOVERSION ${WELCOMER_SOVERSION}
    LIBRARY_OUTPUT_DIRECTORY "${PROJECT_BINARY_DIR}/lib" LINK_DEPENDS "${WELCOMER_VERSION_SCRIPT}")

# Installed programs find the library from where they are, so that an installed tree can be moved; on the system's own
# prefix the loader finds it by itself.
set(CMAKE_INSTALL_RPATH "")
if(NOT CMAKE_INSTALL_PREFIX MATCHES "^/usr/?$")
    foreach(folder BINDIR LIBEXECDIR)
        file(RELATIVE_PATH path "${CMAKE_INSTALL_FULL_${folder}}" "${CMAKE_INSTALL_FULL_LIBDIR}")
        list(APPEND CMAKE_INSTALL_RPATH "$ORIGIN/${path}")
    endforeach()
    list(REMOVE_DUPLICATES CMAKE_INSTALL_RPATH)
endif()
