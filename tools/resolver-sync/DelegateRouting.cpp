#include "tools/resolver-sync/DelegateRouting.h"

#include "platform/Platform.h"

#include <cerrno>

namespace welcomer::resolver {

namespace {

constexpr std::string_view kPrefix = "welcomer-";
constexpr std::string_view kEnding = ".dns-delegate";

std::string fileName(const std::string& domain) {
    return std::string(kPrefix).append(domain).append(kEnding);
}

platform::Outcome named(platform::Outcome outcome, const std::string& what) {
    if (!outcome) {
        outcome.error.message = what + ": " + outcome.error.message;
    }
    return outcome;
}

} // namespace

std::string delegateText(const std::string& domain, const std::vector<Nameserver>& nameservers) {
    std::string text = "[Delegate]\nDNS=";
    const char* separator = "";
    for (const Nameserver& nameserver : nameservers) {
        const bool bracketed = nameserver.isIPv6() && nameserver.port != 53;
        text.append(separator)
            .append(bracketed ? "[" : "")
            .append(nameserver.address)
            .append(bracketed ? "]" : "");
        if (nameserver.port != 53) {
            text.append(":").append(std::to_string(nameserver.port));
        }
        separator = " ";
    }
    return text.append("\nDomains=~").append(domain).append("\nDefaultRoute=no\n");
}

platform::Outcome DelegateRouting::apply(const Overrides& overrides) {
    platform::FileSystem& files = platform::current().fileSystem;
    bool changed = false;
    std::map<std::string, std::string> wanted;
    for (const auto& [domain, nameservers] : overrides) {
        wanted.emplace(fileName(domain), delegateText(domain, nameservers));
    }
    for (const std::string& name : files.list(_folder).value_or(std::vector<std::string>())) {
        const bool ours = name.starts_with(kPrefix) && name.ends_with(kEnding);
        if (ours && !wanted.contains(name)) {
            const std::string path = std::string(_folder).append("/").append(name);
            if (const auto removed = files.remove(path); !removed) {
                return named(removed, "failed to remove " + path);
            }
            changed = true;
        }
    }
    for (const auto& [name, text] : wanted) {
        const std::string path = std::string(_folder).append("/").append(name);
        if (files.readText(path) == text) {
            continue;
        }
        const auto made = files.createDirectory(_folder, 0755);
        if (!made && made.error.number != EEXIST) {
            return named(made, "failed to create " + _folder);
        }
        if (const auto written = files.writeText(path, text); !written) {
            return named(written, "failed to write " + path);
        }
        changed = true;
    }
    return changed ? _reload() : platform::Outcome::success();
}

} // namespace welcomer::resolver
