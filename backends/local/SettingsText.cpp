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

bool isAddress(std::string_view text) {
    if (text.size() > kMaximumAddress || (!text.starts_with("https://") && !text.starts_with("http://"))) {
        return false;
    }
    text.remove_prefix(text.find("//") + 2);
    const std::size_t slash = text.find('/');
    if (slash == std::string_view::npos) {
        return false;
    }
    const std::string_view server = text.substr(0, slash);
    const std::size_t colon = server.find(':');
    const std::string_view port = colon == std::string_view::npos ? "0" : server.substr(colon + 1);
    return isHost(server.substr(0, colon)) && !port.empty() && port.size() <= 5 &&
           consistsOf(port, {kDigits}) && consistsOf(text.substr(slash), {kLetters, kDigits, "./_~-"});
}

bool isFolder(std::string_view text) {
    return text.starts_with('/') && text.size() < PATH_MAX && findInvalidXMLText(text) == std::string::npos &&
           std::ranges::none_of(
               text, [](char each) { return static_cast<unsigned char>(each) < ' ' || each == '\x7f'; });
}

// What there is to know of each setting, by Setting.
struct Kind {
    const char* name;
    bool (*makesSense)(std::string_view value);
    const char* whatItIs;
};
constexpr std::array<Kind, kSettingCount> kKinds = {
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
