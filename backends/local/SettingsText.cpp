#include "backends/local/SettingsText.h"

#include "propertylist/UTF8.h"

#include <algorithm>
#include <climits>

namespace welcomer::local {

namespace {

constexpr std::string_view kLetters = "abcdefghijklmnopqrstuvwxyzABCDEFGHIJKLMNOPQRSTUVWXYZ";
constexpr std::string_view kDigits = "0123456789";
constexpr std::size_t kMaximumName = 64;      // bytes; of a provider, and of a setting that is told of
constexpr std::size_t kMaximumAddress = 1024; // bytes

bool consistsOf(std::string_view text, std::initializer_list<std::string_view> characters) {
    return std::ranges::all_of(text, [&](char each) {
        return std::ranges::any_of(
            characters, [&](std::string_view set) { return set.find(each) != std::string_view::npos; });
    });
}

bool isProvider(std::string_view text) {
    return !text.empty() && text.size() <= kMaximumName &&
           consistsOf(text, {kLetters.substr(0, 26), kDigits, "_"});
}

bool isHost(std::string_view text) {
    return !text.empty() && consistsOf(text, {kLetters, kDigits, ".-"}) &&
           consistsOf(text.substr(0, 1), {kLetters, kDigits}) &&
           consistsOf(text.substr(text.size() - 1), {kLetters, kDigits});
}

// A host, perhaps with a port.
bool isServer(std::string_view text) {
    const std::size_t colon = text.find(':');
    const std::string_view port = colon == std::string_view::npos ? "0" : text.substr(colon + 1);
    return isHost(text.substr(0, colon)) && !port.empty() && port.size() <= 5 && consistsOf(port, {kDigits});
}

bool isPath(std::string_view text) {
    return consistsOf(text, {kLetters, kDigits, "./_~-"});
}

bool isAddress(std::string_view text) {
    if (text.size() > kMaximumAddress || (!text.starts_with("https://") && !text.starts_with("http://"))) {
        return false;
    }
    text.remove_prefix(text.find("//") + 2);
    const std::size_t slash = text.find('/');
    return slash != std::string_view::npos && isServer(text.substr(0, slash)) && isPath(text.substr(slash));
}

bool isFolder(std::string_view text) {
    return text.starts_with('/') && text.size() < PATH_MAX && findInvalidXMLText(text) == std::string::npos &&
           std::ranges::none_of(
               text, [](char each) { return static_cast<unsigned char>(each) < ' ' || each == '\x7f'; });
}

constexpr std::string_view kHTTPS = "https://";
constexpr std::string_view kUnix = "unix:";
constexpr std::size_t kMaximumSocketPath = 107; // bytes; what the system has room for

// Empty for none. Nothing but TLS goes over a network.
bool isAccountServer(std::string_view text) {
    if (text.starts_with(kUnix)) {
        text.remove_prefix(kUnix.size());
        return isFolder(text) && text.size() <= kMaximumSocketPath;
    }
    if (text.empty() || !text.starts_with(kHTTPS) || text.size() > kMaximumAddress) {
        return text.empty();
    }
    text.remove_prefix(kHTTPS.size());
    const std::size_t slash = std::min(text.find('/'), text.size());
    return isServer(text.substr(0, slash)) && isPath(text.substr(slash));
}

bool isFileOrNone(std::string_view text) {
    return text.empty() || isFolder(text);
}

bool isSeconds(std::string_view text) {
    return !text.empty() && text.size() <= 3 && consistsOf(text, {kDigits}) &&
           consistsOf(text.substr(0, 1), {"123456789"});
}

// What there is to know of each setting, by Setting.
struct Kind {
    const char* name;
    bool (*makesSense)(std::string_view value);
    const char* whatItIs;
};
constexpr std::array<Kind, kSettingCount> kKinds = {
    Kind{"AccountServer", isAccountServer, "https://HOST, perhaps with a port and a path, nor unix:/PATH"},
    Kind{"AccountServerAuthority", isFileOrNone, "the path of a file, which begins with /"},
    Kind{"AccountServerConnectSeconds", isSeconds, "a number of seconds from 1 to 999"},
    Kind{"AccountServerRevocations", isFileOrNone, "the path of a file, which begins with /"},
    Kind{"AccountServerSeconds", isSeconds, "a number of seconds from 1 to 999"},
    Kind{"OnlineAccountProvider", isProvider, "a provider, such as owncloud"},
    Kind{"OnlineAccountServer", isAddress, "an address, such as https://services.example/"},
    Kind{"PluginFolder", isFolder, "the path of a folder, which begins with /"}};

std::string_view withoutBlanks(std::string_view text) {
    constexpr std::string_view blanks = " \t\r";
    const std::size_t first = text.find_first_not_of(blanks);
    return first == std::string_view::npos ? std::string_view()
                                           : text.substr(first, text.find_last_not_of(blanks) - first + 1);
}

// Takes one line that is no comment.
//  result  what is wrong with it; empty when nothing is
std::string takeLine(std::string_view line, SettingsText& settings) {
    const std::size_t equals = line.find('=');
    if (equals == std::string_view::npos) {
        return "this is no setting: there is no \"=\"";
    }
    const std::string_view name = withoutBlanks(line.substr(0, equals));
    const std::string_view value = withoutBlanks(line.substr(equals + 1));
    const auto* const kind =
        std::ranges::find(kKinds, name, [](const Kind& each) { return std::string_view(each.name); });
    if (kind == kKinds.end()) {
        const bool canBeShown = name.size() <= kMaximumName && consistsOf(name, {kLetters, kDigits, "-_."});
        return "there is no such setting" + (canBeShown ? ": " + std::string(name) : "");
    }
    if (!kind->makesSense(value)) {
        return std::string(kind->name) + " is not " + kind->whatItIs;
    }
    settings.values[static_cast<std::size_t>(kind - kKinds.begin())] = std::string(value);
    return "";
}

} // namespace

const char* nameOf(Setting setting) {
    return kKinds[static_cast<std::size_t>(setting)].name;
}

SettingsText readSettings(std::string_view text) {
    SettingsText settings;
    std::size_t problems = 0;
    for (std::size_t number = 1; !text.empty(); ++number) {
        const std::size_t end = std::min(text.find('\n'), text.size());
        const std::string_view line = withoutBlanks(text.substr(0, end));
        text.remove_prefix(std::min(end + 1, text.size()));
        if (line.empty() || line.starts_with('#') || line.starts_with(';')) {
            continue;
        }
        const std::string problem = takeLine(line, settings);
        if (!problem.empty() && ++problems <= kMaximumSettingsProblems) {
            settings.problems.push_back("line " + std::to_string(number) + ": " + problem);
        }
    }
    if (problems > kMaximumSettingsProblems) {
        settings.problems.push_back(std::to_string(problems - kMaximumSettingsProblems) +
                                    " more lines make no sense");
    }
    return settings;
}

} // namespace welcomer::local
