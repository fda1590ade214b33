// What the server is set to: lines of the form `Name=value`.

#pragma once

#include <chrono>
#include <cstddef>
#include <string>
#include <string_view>
#include <vector>

namespace welcomer::server {

inline constexpr char kSettingsFile[] = "/etc/welcomer/account-server.conf";

// A member of what a user of an LDAP directory is answered.
struct MappedMember {
    enum class Type { Text, Texts, Integer, Boolean };

    std::string attribute; // the attribute that it comes from; empty where it is the same for everybody
    std::string value;     // what it is for everybody
    std::vector<std::string>
        path; // the keys that lead to it, from the user's entry as the directory file has it
    Type type = Type::Text;
};

struct LdapSettings {
    std::vector<std::string> servers; // their addresses, in the order in which they are asked
    std::string authority;            // a file of certificates; empty: the system's own
    std::string searchName;           // who searches; empty: nobody in particular
    std::string searchPasswordFile;
    std::string base;
    std::string filter = "(&(objectClass=person)(uid=%u))"; // %u is the user's name
    std::chrono::seconds limit{3};                          // for each server
    std::vector<MappedMember> members;
    std::string termsAttribute; // where users have noted which terms of service they accept; empty: nowhere
};

struct Settings {
    enum class Source { Directory, LDAP };

    Source source = Source::Directory;
    LdapSettings ldap;

    std::string certificate; // files; both or none
    std::string key;

    // Whose word is taken for where a request comes from: users on a Unix socket and addresses, and whoever comes
    // to the loopback address.
    std::vector<std::string> fronts;
    bool trustsLoopback = false;
    std::vector<std::string> users; // who may ask on a Unix socket; everybody where there is none

    bool tellsUnknownUsers = false; // a user that there is not is told from a wrong password

    std::size_t workers = 0; // threads; 0: as many as fit the source
    std::size_t queue = 256;
    std::size_t connections = 4096; // at each socket

    std::chrono::seconds headLimit{10};   // for the head of a request, from the connection's beginning
    std::chrono::seconds bodyLimit{30};   // for its body
    std::chrono::seconds answerLimit{30}; // for taking the answer
    std::chrono::seconds idleLimit{60};   // from an answer to the head of the next request
    std::chrono::seconds stopLimit{30};   // for what is under way at the end
};

struct SettingsText {
    Settings settings;
    std::vector<std::string> problems; // one line each
};

// Reads the text of a settings file. Blanks around a line, a name and a value count for nothing, nor do empty
// lines and those that begin with "#" or ";". Whoever meets a problem should not go on with these settings.
// Any thread.
SettingsText readSettings(std::string_view text);

} // namespace welcomer::server
