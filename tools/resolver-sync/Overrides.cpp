#include "tools/resolver-sync/Overrides.h"

#include "backends/network/IPv4Text.h"
#include "platform/Platform.h"

#include <algorithm>
#include <charconv>
#include <optional>

namespace welcomer::resolver {

namespace {

constexpr std::string_view kBlanks = " \t\r";

// Takes the next word off the text; empty when there is none.
std::string_view takeWord(std::string_view& text) {
    text.remove_prefix(std::min(text.find_first_not_of(kBlanks), text.size()));
    const std::string_view word = text.substr(0, text.find_first_of(kBlanks));
    text.remove_prefix(word.size());
    return word;
}

// An address that no zone follows, which the resolvers have no place for.
bool isNameserver(const std::string& text) {
    return network::isAddress(text) && text.find('%') == std::string::npos;
}

std::optional<std::uint16_t> portNumber(std::string_view text) {
    std::uint16_t number = 0;
    const auto [end, error] = std::from_chars(text.data(), text.data() + text.size(), number);
    const bool whole = error == std::errc() && end == text.data() + text.size();
    return whole && number != 0 ? std::optional(number) : std::nullopt;
}

bool isDomainCharacter(char character) {
    return (character >= 'a' && character <= 'z') || (character >= '0' && character <= '9') ||
           character == '-' || character == '_' || character == '.';
}

// Whether each part between the dots is as long as the name system allows: the forwarder ends over a longer one.
bool hasGoodLabels(std::string_view domain) {
    constexpr std::size_t kLongestLabel = 63;
    while (true) {
        const std::size_t end = std::min(domain.find('.'), domain.size());
        if (end == 0 || end > kLongestLabel) {
            return false;
        }
        if (end == domain.size()) {
            return true;
        }
        domain.remove_prefix(end + 1);
    }
}

// A domain in the form that is compared, or none when it is no domain: it goes into other programs' files.
std::optional<std::string> normalDomain(std::string_view text) {
    std::string domain(text);
    std::ranges::transform(domain, domain.begin(), [](char character) {
        return character >= 'A' && character <= 'Z' ? static_cast<char>(character - 'A' + 'a') : character;
    });
    if (domain.ends_with('.')) {
        domain.pop_back();
    }
    const bool plain = std::ranges::all_of(domain, isDomainCharacter) && domain.size() <= 253;
    return plain && hasGoodLabels(domain) ? std::optional(std::move(domain)) : std::nullopt;
}

OverrideFile refused(std::string reason) {
    return {"", {}, std::move(reason)};
}

} // namespace

OverrideFile readOverride(std::string_view name, std::string_view text) {
    std::string_view domain = name;
    std::vector<std::string> addresses;
    std::uint16_t port = 53;
    while (!text.empty()) {
        std::string_view line = text.substr(0, text.find('\n'));
        text.remove_prefix(std::min(line.size() + 1, text.size()));
        const std::string_view word = takeWord(line);
        const std::string_view value = takeWord(line);
        if (word == "domain") {
            domain = value;
        } else if (word == "nameserver") {
            addresses.emplace_back(value);
        } else if (word == "port") {
            const auto number = portNumber(value);
            if (!number) {
                return refused("\"" + std::string(value) + "\" is no port");
            }
            port = *number;
        }
    }
    OverrideFile file;
    const auto normal = normalDomain(domain);
    if (!normal) {
        return refused("\"" + std::string(domain) + "\" is no domain");
    }
    file.domain = *normal;
    for (const std::string& address : addresses) {
        if (!isNameserver(address)) {
            return refused("\"" + address + "\" is no address");
        }
        file.nameservers.push_back({address, port});
    }
    return file.nameservers.empty() ? refused("it names no nameserver") : file;
}

OverrideFolder readOverrides(const std::string& folder) {
    platform::FileSystem& files = platform::current().fileSystem;
    OverrideFolder result;
    auto names = files.list(folder).value_or(std::vector<std::string>());
    std::ranges::sort(names);
    for (const std::string& name : names) {
        const std::string path = std::string(folder).append("/").append(name);
        const auto text = files.readText(path);
        if (text && text->empty()) {
            continue; // as every file is at first, until it is written; its content is a change of its own
        }
        OverrideFile file = text ? readOverride(name, *text) : refused("it cannot be read as text");
        if (file.error.empty() && result.overrides.contains(file.domain)) {
            file = refused("an earlier file is for the same domain");
        }
        if (file.error.empty()) {
            result.overrides.emplace(std::move(file.domain), std::move(file.nameservers));
        } else {
            result.refusals.push_back(std::string(path).append(": ").append(file.error));
        }
    }
    return result;
}

} // namespace welcomer::resolver
