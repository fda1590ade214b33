# How tests are declared. ctest runs each test case in a process of its own, so process-wide state needs no resetting.

if(WELCOMER_BUILD_TESTS)
    find_package(GTest REQUIRED)
    include(GoogleTest)
endif()

# welcomer_add_test(NAME sources... [LIBRARIES ...] [LABELS ...] [RESOURCE_LOCK ...])
#   A GoogleTest program; each of its cases becomes a ctest test named NAME.Suite.Case. Tests with the same lock do not run at
#   once. A case may take five minutes: the longest takes one with the thread sanitizer, while the machine has nothing else
#   to do.
function(welcomer_add_test name)
    cmake_parse_arguments(ARG "" "RESOURCE_LOCK" "LIBRARIES;LABELS" ${ARGN})
    add_executable(${name} ${ARG_UNPARSED_ARGUMENTS})
    welcomer_configure_target(${name})
    target_link_libraries(${name} PRIVATE ${ARG_LIBRARIES} welcomer-fakes welcomer GTest::gtest GTest::gtest_main)
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
