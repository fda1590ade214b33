# What every target of the project is built with.

set(CMAKE_CXX_STANDARD 20)
set(CMAKE_CXX_STANDARD_REQUIRED ON)
set(CMAKE_CXX_EXTENSIONS OFF)
set(CMAKE_C_STANDARD 11)
set(CMAKE_C_EXTENSIONS OFF)
set(CMAKE_POSITION_INDEPENDENT_CODE ON)
set(CMAKE_CXX_VISIBILITY_PRESET hidden)
set(CMAKE_C_VISIBILITY_PRESET hidden)
set(CMAKE_VISIBILITY_INLINES_HIDDEN ON)
set(CMAKE_EXPORT_COMPILE_COMMANDS ON)
# Nothing built remembers where that was.
set(CMAKE_BUILD_RPATH_USE_ORIGIN ON)
set(CMAKE_RUNTIME_OUTPUT_DIRECTORY "${CMAKE_BINARY_DIR}/bin")

if(NOT CMAKE_BUILD_TYPE AND NOT CMAKE_CONFIGURATION_TYPES)
    set(CMAKE_BUILD_TYPE RelWithDebInfo CACHE STRING "" FORCE)
endif()

# What is built names its sources from its build folder, wherever that lies and whatever it is called. That is what ccache
# calls them, too, so that what is built with it and without is the same, and a second build in another folder costs little.
# The compiler takes the last map that fits.
add_compile_options("-ffile-prefix-map=${CMAKE_SOURCE_DIR}=.." "-ffile-prefix-map=${CMAKE_BINARY_DIR}=.")
find_program(WELCOMER_CCACHE ccache)
if(WELCOMER_CCACHE AND NOT CMAKE_CXX_COMPILER_LAUNCHER)
    # Precompiled headers are cached, too, once these are no reason against it.
    set(CMAKE_C_COMPILER_LAUNCHER env "CCACHE_BASEDIR=${CMAKE_SOURCE_DIR}" CCACHE_SLOPPINESS=pch_defines,time_macros
                                      "${WELCOMER_CCACHE}")
    set(CMAKE_CXX_COMPILER_LAUNCHER "${CMAKE_C_COMPILER_LAUNCHER}")
endif()

# PIE for programs, so that the libraries' position-independent code is worth its cost.
include(CheckPIESupported)
check_pie_supported(LANGUAGES CXX C)

function(welcomer_configure_target target)
    target_compile_options(${target} PRIVATE -Wall -Wextra -Wpedantic -Wconversion -Wshadow)
    if(WELCOMER_SANITIZE)
        target_compile_options(${target} PRIVATE -fsanitize=${WELCOMER_SANITIZE} -fno-omit-frame-pointer
                                                 -fno-sanitize-recover=all)
        target_link_options(${target} PUBLIC -fsanitize=${WELCOMER_SANITIZE})
        target_compile_definitions(${target} PRIVATE WELCOMER_FLUSH_AT_EXIT=1)
    endif()
endfunction()

# They have a compiler cache see through to what was precompiled.
if(CMAKE_CXX_COMPILER_ID STREQUAL GNU)
    set(WELCOMER_PRECOMPILED_OPTIONS -fpch-preprocess)
else()
    set(WELCOMER_PRECOMPILED_OPTIONS "SHELL:-Xclang -fno-pch-timestamp")
endif()

# welcomer_precompile(TARGET): what its sources include of the standard library is read once. Worth it for two dozen of them; a
# source includes what it uses all the same, which clang-tidy sees. Not for a build that keeps the debugger's variables, as
# packages do: each object would have those of everything that was precompiled.
function(welcomer_precompile target)
    target_compile_options(${target} PRIVATE ${WELCOMER_PRECOMPILED_OPTIONS})
    # g++ 12 takes the strings' own copying, once precompiled, for code that is to be warned about, and is wrong about it.
    target_compile_options(${target} PRIVATE
        "$<$<COMPILE_LANG_AND_ID:CXX,GNU>:-Wno-array-bounds;-Wno-stringop-overflow;-Wno-stringop-overread>")
    target_precompile_headers(${target} PRIVATE
        <algorithm> <chrono> <cstdint> <filesystem> <functional> <map> <memory> <mutex> <optional> <span> <string>
        <string_view> <utility> <variant> <vector>)
endfunction()
