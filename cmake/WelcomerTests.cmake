# How tests are declared. ctest runs each test case in a process of its own, so process-wide state needs no resetting.

if(WELCOMER_BUILD_TESTS)
    find_package(GTest REQUIRED)
    include(GoogleTest)
endif()

# What most tests begin with, read by the compiler once: it is the greater part of compiling a test. An owner of its own,
# since a library would be compiled for another kind of position-independent code.
function(welcomer_precompile_tests)
    file(WRITE "${CMAKE_CURRENT_BINARY_DIR}/precompiled.cpp" "int main() { return 0; }\n")
    add_executable(test-beginnings EXCLUDE_FROM_ALL "${CMAKE_CURRENT_BINARY_DIR}/precompiled.cpp")
    welcomer_configure_target(test-beginnings)
    set_target_properties(test-beginnings PROPERTIES RUNTIME_OUTPUT_DIRECTORY "${CMAKE_BINARY_DIR}/tests")
    target_link_libraries(test-beginnings PRIVATE welcomer-fakes welcomer GTest::gtest GTest::gtest_main)
    # The desktop's libraries ask for -pthread.
    set(options ${WELCOMER_PRECOMPILED_OPTIONS} -pthread)
    set(WELCOMER_TEST_OPTIONS "${options}" PARENT_SCOPE)
    target_compile_options(test-beginnings PRIVATE ${options})
    target_precompile_headers(test-beginnings PRIVATE
        <algorithm> <chrono> <functional> <map> <memory> <optional> <string> <thread> <utility> <vector>
        <gtest/gtest.h> <platform/Platform.h>)
endfunction()

# welcomer_add_test(NAME sources... [LIBRARIES ...] [LABELS ...] [RESOURCE_LOCK ...])
#   A GoogleTest program; each of its cases becomes a ctest test named NAME.Suite.Case. Tests with the same lock do not run at
#   once. A case may take five minutes: the longest takes one with the thread sanitizer, while the machine has nothing else
#   to do.
function(welcomer_add_test name)
    cmake_parse_arguments(ARG "" "RESOURCE_LOCK" "LIBRARIES;LABELS" ${ARGN})
    add_executable(${name} ${ARG_UNPARSED_ARGUMENTS})
    welcomer_configure_target(${name})
    target_link_libraries(${name} PRIVATE ${ARG_LIBRARIES} welcomer-fakes welcomer GTest::gtest GTest::gtest_main)
    target_precompile_headers(${name} REUSE_FROM test-beginnings)
    # What is tested is compiled as everywhere else: clang-tidy takes no header that another compiler has read.
    foreach(source IN LISTS ARG_UNPARSED_ARGUMENTS)
        cmake_path(ABSOLUTE_PATH source NORMALIZE OUTPUT_VARIABLE path)
        if(NOT path MATCHES "^${PROJECT_SOURCE_DIR}/tests/")
            set_source_files_properties(${source} PROPERTIES SKIP_PRECOMPILE_HEADERS ON)
        endif()
    endforeach()
    target_compile_options(${name} PRIVATE ${WELCOMER_TEST_OPTIONS})
    set_target_properties(${name} PROPERTIES RUNTIME_OUTPUT_DIRECTORY "${CMAKE_BINARY_DIR}/tests")
    set(lock)
    if(ARG_RESOURCE_LOCK)
        set(lock RESOURCE_LOCK ${ARG_RESOURCE_LOCK})
    endif()
    set(environment)
    if(WELCOMER_SANITIZE MATCHES thread)
        set(environment ENVIRONMENT "TSAN_OPTIONS=suppressions=${PROJECT_SOURCE_DIR}/tests/support/tsan.supp")
    elseif(WELCOMER_SANITIZE MATCHES address AND ARG_LABELS MATCHES desktop)
        # Only the slow way finds out where in the desktop's libraries something was lost.
        set(environment ENVIRONMENT "LSAN_OPTIONS=suppressions=${PROJECT_SOURCE_DIR}/tests/support/lsan.supp:fast_unwind_on_malloc=0:print_suppressions=0")
    endif()
    gtest_discover_tests(${name} TEST_PREFIX "${name}." DISCOVERY_TIMEOUT 60
                         PROPERTIES TIMEOUT 300 LABELS "${ARG_LABELS}" ${lock} ${environment})
endfunction()
