# Run by the build, with PROGRAM, SCDOC, PARTS, WRITTEN and RESULT: has the tool write what is written from its command line,
# and makes manual pages of that and of what is written by hand.

foreach(folder completions man1 man5 man7 man8)
    file(REMOVE_RECURSE "${RESULT}/${folder}") # a command that is gone leaves no page
    file(MAKE_DIRECTORY "${RESULT}/${folder}")
endforeach()
execute_process(COMMAND "${PROGRAM}" write-help "${RESULT}/completions" "${PARTS}"
                OUTPUT_QUIET COMMAND_ERROR_IS_FATAL ANY)
file(GLOB sources "${RESULT}/completions/*.scd" "${WRITTEN}/*.scd")
foreach(source IN LISTS sources)
    cmake_path(GET source STEM LAST_ONLY name) # welcomer-replay.1
    cmake_path(GET name EXTENSION LAST_ONLY section)
    string(SUBSTRING "${section}" 1 -1 section)
    execute_process(COMMAND "${SCDOC}" INPUT_FILE "${source}" OUTPUT_FILE "${RESULT}/man${section}/${name}"
                    COMMAND_ERROR_IS_FATAL ANY)
endforeach()
file(GLOB sources "${RESULT}/completions/*.scd")
file(REMOVE ${sources})
