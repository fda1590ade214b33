# Run by `cmake --install` for each WELCOMER_COMPONENT; it has the last word on the prefix, and so on the paths in these files.
#   PREFIX/lib             for the prefixes /usr and /usr/local this is on the search paths of systemd and its helpers
#   WELCOMER_SYSTEM_UNITS  where units of the system go, when that is not PREFIX/lib/systemd/system
#   /etc                   for what is looked for nowhere below /usr/local: with that prefix, and what sessions start with
#                          /usr, too; with another prefix nothing outside it is written
# Nothing is enabled here: the presets say what is to be.

function(installed_path variable folder)
    if(IS_ABSOLUTE "${folder}")
        set(${variable} "${folder}" PARENT_SCOPE)
    else()
        set(${variable} "${CMAKE_INSTALL_PREFIX}/${folder}" PARENT_SCOPE)
    endif()
endfunction()
installed_path(WELCOMER_LIBEXEC "${WELCOMER_LIBEXECDIR}")
installed_path(WELCOMER_SYSTEM_UNITS "${WELCOMER_SYSTEM_UNIT_DIR}")

if(CMAKE_INSTALL_PREFIX MATCHES "^/usr(/local)?/?$")
    set(WELCOMER_AUTOSTART "/etc/xdg/autostart")
else()
    set(WELCOMER_AUTOSTART "${CMAKE_INSTALL_PREFIX}/etc/xdg/autostart")
endif()
if(CMAKE_INSTALL_PREFIX MATCHES "^/usr/local/?$")
    set(WELCOMER_POLKIT_RULES "/etc/polkit-1/rules.d")
else()
    set(WELCOMER_POLKIT_RULES "${CMAKE_INSTALL_PREFIX}/share/polkit-1/rules.d")
endif()
set(WELCOMER_LIB "${CMAKE_INSTALL_PREFIX}/lib")

# A folder of this run's own: installations of one build may run side by side, into different prefixes.
string(RANDOM LENGTH 16 run)
set(WELCOMER_INSTALLED "${WELCOMER_INSTALLED}/${run}")

# install_service_file(NAME FOLDER [INSTALLED_NAME])
#   A macro, since `cmake --install` lists what was installed in a variable of its own.
macro(install_service_file name destination)
    set(installed "${name}")
    if(${ARGC} GREATER 2)
        set(installed "${ARGV2}")
    endif()
    configure_file("${WELCOMER_PACKAGING}/${name}.in" "${WELCOMER_INSTALLED}/${installed}" @ONLY)
    file(INSTALL "${WELCOMER_INSTALLED}/${installed}" DESTINATION "${destination}")
endmacro()

if(WELCOMER_COMPONENT STREQUAL "resolver-sync")
    install_service_file(welcomer-resolver-sync.service "${WELCOMER_SYSTEM_UNITS}")
    install_service_file(resolver-sync.preset "${WELCOMER_LIB}/systemd/system-preset" 80-welcomer-resolver-sync.preset)
    install_service_file(resolver-sync.sysusers "${WELCOMER_LIB}/sysusers.d" welcomer-resolver-sync.conf)
    install_service_file(resolver-sync.tmpfiles "${WELCOMER_LIB}/tmpfiles.d" welcomer-resolver-sync.conf)
    install_service_file(resolver-sync.rules "${WELCOMER_POLKIT_RULES}" welcomer-resolver-sync.rules)
elseif(WELCOMER_COMPONENT STREQUAL "account-server")
    foreach(unit welcomer-account-server.service welcomer-account-server.socket welcomer-account-server-tls.socket
                 welcomer-account-server-metrics.socket)
        install_service_file(${unit} "${WELCOMER_SYSTEM_UNITS}")
    endforeach()
    install_service_file(account-server.preset "${WELCOMER_LIB}/systemd/system-preset" 80-welcomer-account-server.preset)
    install_service_file(account-server.sysusers "${WELCOMER_LIB}/sysusers.d" welcomer-account-server.conf)
    install_service_file(account-server.tmpfiles "${WELCOMER_LIB}/tmpfiles.d" welcomer-account-server.conf)
else()
    install_service_file(welcomer-launch-agents.service "${WELCOMER_LIB}/systemd/user")
    install_service_file(welcomer-launch-agents.desktop "${WELCOMER_AUTOSTART}")
    install_service_file(user.preset "${WELCOMER_LIB}/systemd/user-preset" 80-welcomer.preset)
    install_service_file(welcomer-restore-network.service "${WELCOMER_SYSTEM_UNITS}")
    install_service_file(system.preset "${WELCOMER_LIB}/systemd/system-preset" 80-welcomer.preset)
endif()

file(REMOVE_RECURSE "${WELCOMER_INSTALLED}")
