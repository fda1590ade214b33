// The instance, and what it says of itself.

#include "propertylist/UnwritableValue.h"
#include "tools/welcomer/plugins/CheckingHost.h"
#include "tools/welcomer/plugins/Checks.h"
#include "tools/welcomer/plugins/HandleBook.h"

#include "plugins/PluginText.h"

#include <algorithm>
#include <cstddef>
#include <iterator>
#include <set>
#include <thread>

namespace welcomer::tool::checks {

namespace {

constexpr int kTimes = 20;
constexpr int kThreads = 8;
constexpr std::size_t kLongestIdentifier = 255;

bool make(CheckedPlugin& plugin) {
    plugin.load();
    return plugin.create(checkingHost()) != nullptr;
}

std::string joined(const std::vector<std::string>& texts) {
    std::string line;
    for (const std::string& text : texts) {
        line += (line.empty() ? "" : "; ") + text;
    }
    return line;
}

// In reverse-domain form: names of letters, digits, hyphens and underscores with points between.
std::string problemWith(const std::string& identifier) {
    if (identifier.empty() || identifier.size() > kLongestIdentifier) {
        return "it is " + std::to_string(identifier.size()) + " bytes long";
    }
    const auto isFit = [](char each) {
        return (each >= 'a' && each <= 'z') || (each >= 'A' && each <= 'Z') || (each >= '0' && each <= '9') ||
               each == '-' || each == '_' || each == '.';
    };
    if (!std::ranges::all_of(identifier, isFit)) {
        return "it holds other characters than letters, digits, - and _: " + pluginText(identifier);
    }
    const bool hasEmptyName =
        identifier.front() == '.' || identifier.back() == '.' || identifier.find("..") != std::string::npos;
    return hasEmptyName || identifier.find('.') == std::string::npos
               ? "it is not in reverse-domain form: " + identifier
               : "";
}

// Asks on several threads at once, and finds what differs from what was said first.
template <class Ask>
void askOnThreads(const Ask& ask) {
    std::vector<std::thread> threads(kThreads);
    for (std::thread& thread : threads) {
        thread = std::thread([&] {
            for (int time = 0; time < kTimes; ++time) {
                ask();
            }
        });
    }
    std::ranges::for_each(threads, &std::thread::join);
}

void findEach(CheckReport& report, const std::set<std::string>& texts) {
    for (const std::string& text : texts) {
        report.find(text);
    }
}

std::string shown(const std::optional<std::string>& identifier) {
    return identifier ? "'" + pluginText(*identifier) + "'" : "none";
}

std::string problemWith(const PropertyList& request) {
    if (!request.isDictionary()) {
        return "the request is no dictionary";
    }
    const auto unwritable = findUnwritableValue(request);
    return unwritable ? "the request cannot be written: " + *unwritable : "";
}

} // namespace

void create(CheckedPlugin& plugin, CheckReport& report, const CheckInput& /*input*/) {
    if (!make(plugin)) {
        report.find(plugin.raised().empty() ? "create gives no instance" : joined(plugin.raised()));
    }
}

void instanceSize(CheckedPlugin& plugin, CheckReport& report, const CheckInput& /*input*/) {
    make(plugin);
    constexpr std::size_t kFirst = offsetof(wl_delegate, get_extension);
    const std::size_t size = plugin.instance()->size;
    if (size < kFirst || size > sizeof(wl_delegate)) {
        report.find("the instance's structure has " + std::to_string(size) +
                    " bytes; that of the first version has " + std::to_string(kFirst) + ", this version's " +
                    std::to_string(sizeof(wl_delegate)));
    }
}

void requiredFunctions(CheckedPlugin& plugin, CheckReport& report, const CheckInput& /*input*/) {
    make(plugin);
    const wl_delegate& instance = *plugin.instance();
    const auto require = [&](bool isThere, const char* name) {
        if (!isThere) {
            report.find(std::string(name) + " is null");
        }
        return isThere;
    };
    const bool hasIdentifier = require(instance.delegate_identifier != nullptr, "delegate_identifier");
    require(instance.delegate_setup_request != nullptr, "delegate_setup_request");
    require(instance.complete_setup_with_response != nullptr, "complete_setup_with_response");
    if (hasIdentifier && plugin.identifier() && plugin.getsAliases()) {
        require(instance.complete_setup_with_response_chosen_aliases != nullptr,
                "complete_setup_with_response_chosen_aliases");
        require(instance.messaging_aliases_from_response != nullptr, "messaging_aliases_from_response");
    }
}

void firstHost(CheckedPlugin& plugin, CheckReport& report, const CheckInput& /*input*/) {
    plugin.load();
    if (plugin.create(firstCheckingHost()) && plugin.identifier()) {
        plugin.request();
    }
    if (wasCalledBeyondFirst()) {
        report.find("it calls get_extension, which lies beyond the size of the host's structure");
    }
}

void destroy(CheckedPlugin& plugin, CheckReport& /*report*/, const CheckInput& /*input*/) {
    if (!make(plugin) || !plugin.descriptor().destroy) {
        return;
    }
    plugin.identifier();
    plugin.destroy();
    plugin.descriptor().destroy(nullptr);
}

void extensions(CheckedPlugin& plugin, CheckReport& report, const CheckInput& /*input*/) {
    make(plugin);
    if (WL_HAS_MEMBER(plugin.instance(), get_extension) && plugin.instance()->get_extension) {
        report.step("get_extension");
        if (plugin.instance()->get_extension(plugin.instance(), "org.example.nobody-has-this/1")) {
            report.find("get_extension gives something for an identifier that nobody knows");
        }
    }
}

void identifier(CheckedPlugin& plugin, CheckReport& report, const CheckInput& /*input*/) {
    make(plugin);
    const auto text = plugin.identifier();
    if (!plugin.raised().empty()) {
        report.find(joined(plugin.raised()));
    } else if (const std::string problem = text ? problemWith(*text) : "it has none"; !problem.empty()) {
        report.find(problem);
    } else {
        report.see(*text);
    }
}

void identifierAgain(CheckedPlugin& plugin, CheckReport& report, const CheckInput& /*input*/) {
    make(plugin);
    const auto first = plugin.identifier();
    for (int time = 0; time < kTimes; ++time) {
        if (const auto again = plugin.identifier(); again != first) {
            report.find(shown(first) + " at the first call, " + shown(again) + " at a later one");
            return;
        }
    }
}

void identifierOnThreads(CheckedPlugin& plugin, CheckReport& report, const CheckInput& /*input*/) {
    make(plugin);
    const auto first = plugin.identifier();
    std::mutex mutex;
    std::set<std::string> differences;
    askOnThreads([&] {
        if (const auto other = plugin.identifier(); other != first) {
            const std::lock_guard lock(mutex);
            differences.insert(shown(first) + " on the first thread, " + shown(other) + " on another");
        }
    });
    findEach(report, differences);
}

void request(CheckedPlugin& plugin, CheckReport& report, const CheckInput& /*input*/) {
    make(plugin);
    plugin.identifier();
    const auto value = plugin.request();
    if (!plugin.raised().empty()) {
        report.find(joined(plugin.raised()));
    } else if (const std::string problem = value ? problemWith(*value) : ""; !problem.empty()) {
        report.find(problem);
    } else if (!value) {
        report.see("none: it leaves itself out of setup");
    }
}

void requestOnThreads(CheckedPlugin& plugin, CheckReport& report, const CheckInput& /*input*/) {
    make(plugin);
    plugin.identifier();
    const auto first = plugin.request();
    std::mutex mutex;
    std::set<std::string> differences;
    askOnThreads([&] {
        const auto other = plugin.request();
        const std::string problem = other ? problemWith(*other) : "";
        if (!problem.empty() || other.has_value() != first.has_value()) {
            const std::lock_guard lock(mutex);
            differences.insert(problem.empty() ? "a request on one thread, none on another" : problem);
        }
    });
    findEach(report, differences);
}

} // namespace welcomer::tool::checks
