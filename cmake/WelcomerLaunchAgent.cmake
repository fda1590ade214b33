# welcomer_launch_agent_file(AGENT FILE)
#   Writes the launch-agent file that starts the agent at this path. Also included by the install script.
set(WELCOMER_LAUNCH_AGENT_TEMPLATE
    "${CMAKE_CURRENT_LIST_DIR}/../handoff/Resources/com.corvid.welcomer.nimbussetup.user.plist.in")
function(welcomer_launch_agent_file agent file)
    string(REPLACE "&" "&amp;" WELCOMER_AGENT_PATH_XML "${agent}")
    string(REPLACE "<" "&lt;" WELCOMER_AGENT_PATH_XML "${WELCOMER_AGENT_PATH_XML}")
    configure_file("${WELCOMER_LAUNCH_AGENT_TEMPLATE}" "${file}" @ONLY)
endfunction()
