#include "tools/account-server/Settings.h"

#include "tools/account-server/Words.h"

#include <algorithm>
#include <charconv>
#include <iterator>

namespace welcomer::server {

namespace {

std::vector<std::string> split(std::string_view text, char separator) {
    std::vector<std::string> parts;
    while (!text.empty()) {
        if (const std::string_view part = takeUntil(text, separator); !part.empty()) {
            parts.emplace_back(part);
        }
    }
    return parts;
}

template <class Number>
bool readNumber(std::string_view text, Number least, Number most, Number& number) {
    Number read{};
    const auto [end, error] = std::from_chars(text.data(), text.data() + text.size(), read);
    if (error != std::errc() || end != text.data() + text.size() || read < least || read > most) {
        return false;
    }
    number = read;
    return true;
}

bool readSeconds(std::string_view text, std::chrono::seconds& seconds) {
    int number = 0;
    if (!readNumber(text, 1, 3600, number)) {
        return false;
    }
    seconds = std::chrono::seconds(number);
    return true;
}

bool readPath(std::string_view text, std::string& path) {
    path = text;
    return text.starts_with('/') && text.find('\0') == std::string_view::npos;
}

bool readServers(std::string_view text, std::vector<std::string>& servers) {
    servers = split(text, ' ');
    return !servers.empty() && std::ranges::all_of(servers, [](const std::string& server) {
        return server.starts_with("ldap://") || server.starts_with("ldaps://") ||
               server.starts_with("ldapi://");
    });
}

// "Response/delegates/com.corvid.chatter/aliases[]", with what follows a colon as its type.
bool readMember(std::string_view text, MappedMember& member) {
    using Type = MappedMember::Type;
    const std::size_t colon = text.find(':');
    const std::string_view type = colon == std::string_view::npos ? "" : text.substr(colon + 1);
    text = text.substr(0, colon);
    if (text.ends_with("[]")) {
        member.type = Type::Texts;
        text.remove_suffix(2);
    }
    if (type == "integer" && member.type == Type::Text) {
        member.type = Type::Integer;
    } else if (type == "boolean" && member.type == Type::Text) {
        member.type = Type::Boolean;
    } else if (colon != std::string_view::npos) {
        return false;
    }
    member.path = split(text, '/');
    return !member.path.empty() && text.find("//") == std::string_view::npos;
}

// Two words.
bool readMapping(std::string_view text, std::vector<MappedMember>& members, bool fromAttribute) {
    const std::string_view first = takeUntil(text, ' ');
    const std::string_view second = withoutBlanks(text);
    MappedMember member;
    (fromAttribute ? member.attribute : member.value) = fromAttribute ? first : second;
    if (second.empty() || !readMember(fromAttribute ? second : first, member)) {
        return false;
    }
    members.push_back(std::move(member));
    return true;
}

bool readChoice(std::string_view text, std::string_view no, std::string_view yes, bool& value) {
    value = text == yes;
    return text == no || text == yes;
}

bool readFronts(std::string_view text, Settings& settings) {
    settings.fronts = split(text, ' ');
    settings.trustsLoopback = std::erase(settings.fronts, "loopback") > 0;
    return true;
}

using Text = std::string_view;
constexpr char kSecondsWanted[] = "a number of seconds from 1 to 3600";
constexpr char kPathWanted[] = "the path of a file, which begins with /";
constexpr char kMemberWanted[] = "of the form `attribute Response/delegates/identifier/key`, with `[]`, "
                                 "`:integer` or `:boolean` at its end where it is no text";

// What there is to know of each setting.
struct Kind {
    std::string_view name;
    bool (*read)(Text value, Settings& settings);
    const char* whatItIs;
};
constexpr Kind kKinds[] = {
    {"Source",
     [](Text value, Settings& to) {
         to.source = value == "ldap" ? Settings::Source::LDAP : Settings::Source::Directory;
         return value == "ldap" || value == "directory";
     },
     "`directory` or `ldap`"},
    {"Certificate", [](Text value, Settings& to) { return readPath(value, to.certificate); }, kPathWanted},
    {"Key", [](Text value, Settings& to) { return readPath(value, to.key); }, kPathWanted},
    {"Fronts", readFronts, "names of users, addresses, and `loopback`"},
    {"Users",
     [](Text value, Settings& to) {
         to.users = split(value, ' ');
         return true;
     },
     "names of users"},
    {"UnknownUsers",
     [](Text value, Settings& to) { return readChoice(value, "hidden", "told", to.tellsUnknownUsers); },
     "`hidden` or `told`"},
    {"Workers", [](Text value, Settings& to) { return readNumber<std::size_t>(value, 1, 256, to.workers); },
     "a number from 1 to 256"},
    {"Queue", [](Text value, Settings& to) { return readNumber<std::size_t>(value, 0, 65536, to.queue); },
     "a number from 0 to 65536"},
    {"Connections",
     [](Text value, Settings& to) { return readNumber<std::size_t>(value, 1, 65536, to.connections); },
     "a number from 1 to 65536"},
    {"HeadSeconds", [](Text value, Settings& to) { return readSeconds(value, to.headLimit); },
     kSecondsWanted},
    {"BodySeconds", [](Text value, Settings& to) { return readSeconds(value, to.bodyLimit); },
     kSecondsWanted},
    {"AnswerSeconds", [](Text value, Settings& to) { return readSeconds(value, to.answerLimit); },
     kSecondsWanted},
    {"IdleSeconds", [](Text value, Settings& to) { return readSeconds(value, to.idleLimit); },
     kSecondsWanted},
    {"StopSeconds", [](Text value, Settings& to) { return readSeconds(value, to.stopLimit); },
     kSecondsWanted},
    {"LdapServers", [](Text value, Settings& to) { return readServers(value, to.ldap.servers); },
     "addresses that begin with ldap://, ldaps:// or ldapi://"},
    {"LdapAuthority", [](Text value, Settings& to) { return readPath(value, to.ldap.authority); },
     kPathWanted},
    {"LdapSearchName",
     [](Text value, Settings& to) {
         to.ldap.searchName = value;
         return true;
     },
     ""},
    {"LdapSearchPasswordFile",
     [](Text value, Settings& to) { return readPath(value, to.ldap.searchPasswordFile); }, kPathWanted},
    {"LdapBase",
     [](Text value, Settings& to) {
         to.ldap.base = value;
         return true;
     },
     ""},
    {"LdapFilter",
     [](Text value, Settings& to) {
         to.ldap.filter = value;
         return value.starts_with('(') && value.ends_with(')') && value.find("%u") != Text::npos;
     },
     "a filter in brackets with %u in the place of the user's name"},
    {"LdapSeconds", [](Text value, Settings& to) { return readSeconds(value, to.ldap.limit); },
     kSecondsWanted},
    {"LdapTermsAttribute",
     [](Text value, Settings& to) {
         to.ldap.termsAttribute = value;
         return value.find(' ') == Text::npos;
     },
     "the name of an attribute"},
    {"LdapAttribute", [](Text value, Settings& to) { return readMapping(value, to.ldap.members, true); },
     kMemberWanted},
    {"LdapValue", [](Text value, Settings& to) { return readMapping(value, to.ldap.members, false); },
     "a member, such as Response/delegates/identifier/key, and its value"},
};

// Takes one line that is no comment.
//  result  what is wrong with it; empty when nothing is
std::string takeLine(std::string_view line, Settings& settings) {
    const std::size_t equals = line.find('=');
    if (equals == std::string_view::npos) {
        return "this is no setting: there is no \"=\"";
    }
    const std::string_view name = withoutBlanks(line.substr(0, equals));
    const auto* const kind = std::ranges::find(kKinds, name, &Kind::name);
    if (kind == std::end(kKinds)) {
        return "there is no such setting";
    }
    return kind->read(withoutBlanks(line.substr(equals + 1)), settings)
               ? ""
               : std::string(kind->name) + " is not " + kind->whatItIs;
}

// What does not fit together; empty when nothing is wrong.
std::string whatIsMissing(const Settings& settings) {
    if (settings.certificate.empty() != settings.key.empty()) {
        return "Certificate and Key belong together";
    }
    if (settings.source == Settings::Source::LDAP && settings.ldap.servers.empty()) {
        return "Source=ldap needs LdapServers";
    }
    if (settings.ldap.searchName.empty() != settings.ldap.searchPasswordFile.empty()) {
        return "LdapSearchName and LdapSearchPasswordFile belong together";
    }
    return "";
}

} // namespace

SettingsText readSettings(std::string_view text) {
    SettingsText result;
    for (std::size_t number = 1; !text.empty(); ++number) {
        const std::string_view line = takeUntil(text, '\n');
        if (line.empty() || line.starts_with('#') || line.starts_with(';')) {
            continue;
        }
        if (const std::string problem = takeLine(line, result.settings); !problem.empty()) {
            result.problems.push_back("line " + std::to_string(number) + ": " + problem);
        }
    }
    if (const std::string problem = whatIsMissing(result.settings); !problem.empty()) {
        result.problems.push_back(problem);
    }
    return result;
}

} // namespace welcomer::server
