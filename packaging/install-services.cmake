# Run by `cmake --install`, which has the last word on the prefix, and so on the paths in these files.
#   PREFIX/lib/systemd   for the prefixes /usr and /usr/local this is on systemd's own search path
#   /etc/xdg             the only place where sessions look for what they start, whichever of the two it is; with another
#                        prefix nothing outside it is written

if(IS_ABSOLUTE "${WELCOMER_LIBEXECDIR}")
    set(WELCOMER_LIBEXEC "${WELCOMER_LIBEXECDIR}")
else()
    set(WELCOMER_LIBEXEC "${CMAKE_INSTALL_PREFIX}/${WELCOMER_LIBEXECDIR}")
endif()
if(CMAKE_INSTALL_PREFIX MATCHES "^/usr(/local)?/?$")
    set(WELCOMER_AUTOSTART "/etc/xdg/autostart")
else()
    set(WELCOMER_AUTOSTART "${CMAKE_INSTALL_PREFIX}/etc/xdg/autostart")
endif()
set(WELCOMER_SYSTEMD "${CMAKE_INSTALL_PREFIX}/lib/systemd")

# A folder of this run's own: installations of one build may run side by side, into different prefixes.
string(RANDOM LENGTH 16 run)
set(WELCOMER_INSTALLED "${WELCOMER_INSTALLED}/${run}")

# Macros, since `cmake --install` lists what was installed in a variable of its own.
macro(install_service_file name destination)
    configure_file("${WELCOMER_PACKAGING}/${name}.in" "${WELCOMER_INSTALLED}/${name}" @ONLY)
    file(INSTALL "${WELCOMER_INSTALLED}/${name}" DESTINATION "${destination}")
endmacro()
# install_wish(UNIT TARGET FOLDER): has a target start a unit, without anybody enabling it first.
macro(install_wish unit target folder)
    file(MAKE_DIRECTORY "${WELCOMER_INSTALLED}/${target}.wants")
    file(CREATE_LINK "../${unit}" "${WELCOMER_INSTALLED}/${target}.wants/${unit}" SYMBOLIC)
    file(INSTALL "${WELCOMER_INSTALLED}/${target}.wants/${unit}" DESTINATION "${folder}/${target}.wants")
endmacro()

install_service_file(welcomer-launch-agents.service "${WELCOMER_SYSTEMD}/user")
install_wish(welcomer-launch-agents.service graphical-session.target "${WELCOMER_SYSTEMD}/user")
install_service_file(welcomer-launch-agents.desktop "${WELCOMER_AUTOSTART}")

install_service_file(welcomer-resolver-sync.service "${WELCOMER_SYSTEMD}/system")
install_wish(welcomer-resolver-sync.service multi-user.target "${WELCOMER_SYSTEMD}/system")

file(REMOVE_RECURSE "${WELCOMER_INSTALLED}")
