# What a maker supplies: the one place for the hosts and addresses that the system is built for. Each is a cache value;
# together they become generated/WelcomerConfiguration.h.

set(WELCOMER_RESOLVER_DOMAINS
    "configuration.nimbus.example;services.nimbus.example;nimbus.example;online.example" CACHE STRING
    "The cloud service's resolver domains: configuration service, second service, main domain, former online service")
set(WELCOMER_TEST_NAMESERVERS
    "192.0.2.1;192.0.2.2;192.0.2.3;192.0.2.4;198.51.100.1;198.51.100.2;198.51.100.3;198.51.100.4" CACHE STRING
    "The nameservers of the test environments Nimbus1 to Nimbus4 and Q1 to Q4: IPv4 addresses, no two the same")
set(WELCOMER_PUBLIC_WEB_HOST "www.example.com" CACHE STRING
    "The public web host that stands for the internet when reachability is probed")
set(WELCOMER_INTERNAL_ADDRESS_PREFIX "203.0.113." CACHE STRING
    "What the addresses of the maker's own network begin with: whole numbers, each with the dot behind it")
set(WELCOMER_ONLINE_ACCOUNT_PROVIDER "owncloud" CACHE STRING
    "The provider type that the cloud service's accounts have in GNOME Online Accounts")
set(WELCOMER_ONLINE_ACCOUNT_SERVER "https://services.nimbus.example/" CACHE STRING
    "The address of the server that these accounts are made with: a URL")

# Where packages put plug-ins, which may make no folders at the top.
set(WELCOMER_PLUGIN_FOLDER "${CMAKE_INSTALL_FULL_LIBDIR}/welcomer/plugins")

# welcomer_read_configuration(VARIABLE COUNT PATTERN): checks a list and gives its entries as C++ string literals.
function(welcomer_read_configuration variable count pattern)
    set(values ${${variable}})
    list(LENGTH values length)
    if(NOT length EQUAL count)
        message(FATAL_ERROR "${variable} needs ${count} entries and has ${length}")
    endif()
    set(literals "")
    foreach(value IN LISTS values)
        if(NOT value MATCHES "^${pattern}$")
            message(FATAL_ERROR "${variable}: \"${value}\" is not what it should be")
        endif()
        list(APPEND literals "\"${value}\"")
    endforeach()
    list(REMOVE_DUPLICATES values)
    list(LENGTH values distinct)
    if(NOT distinct EQUAL count)
        message(FATAL_ERROR "${variable} names an entry twice")
    endif()
    list(JOIN literals ", " literals)
    set(${variable}_LITERALS "${literals}" PARENT_SCOPE)
endfunction()

set(host_pattern "[A-Za-z0-9]([A-Za-z0-9.-]*[A-Za-z0-9])?")
welcomer_read_configuration(WELCOMER_RESOLVER_DOMAINS 4 "${host_pattern}")
welcomer_read_configuration(WELCOMER_TEST_NAMESERVERS 8 "[0-9]+[.][0-9]+[.][0-9]+[.][0-9]+")
welcomer_read_configuration(WELCOMER_PUBLIC_WEB_HOST 1 "${host_pattern}")
welcomer_read_configuration(WELCOMER_INTERNAL_ADDRESS_PREFIX 1 "[0-9]+[.]([0-9]+[.])?([0-9]+[.])?")
welcomer_read_configuration(WELCOMER_ONLINE_ACCOUNT_PROVIDER 1 "[a-z_]+")
welcomer_read_configuration(WELCOMER_ONLINE_ACCOUNT_SERVER 1 "https?://${host_pattern}(:[0-9]+)?/[A-Za-z0-9./_~-]*")
configure_file("${CMAKE_CURRENT_LIST_DIR}/WelcomerConfiguration.h.in"
               "${PROJECT_BINARY_DIR}/generated/WelcomerConfiguration.h" @ONLY)
