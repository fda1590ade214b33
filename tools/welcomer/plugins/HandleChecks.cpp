// The values that a plug-in holds.

#include "tools/welcomer/plugins/CheckingHost.h"
#include "tools/welcomer/plugins/Checks.h"
#include "tools/welcomer/plugins/HandleBook.h"

#include <chrono>

namespace welcomer::tool::checks {

namespace {

using namespace std::chrono_literals;

constexpr auto kWatched = 100ms; // for what it releases behind its answer

// Whether a plug-in that was set up has misused a handle so.
void findMisuse(CheckedPlugin& plugin, CheckReport& report, const CheckInput& input, Misuse misuse) {
    if (beginLife(plugin)) {
        if (plugin.getsAliases()) {
            plugin.aliases(input.response);
        }
        completeLife(plugin, report, {.response = input.response, .watched = kWatched});
    }
    for (const MisuseRecord& record : HandleBook::instance().misuses()) {
        if (record.misuse == misuse) {
            report.find(record.text);
            return;
        }
    }
}

} // namespace

void leaks(CheckedPlugin& plugin, CheckReport& report, const CheckInput& input) {
    if (!beginLife(plugin)) {
        return;
    }
    plugin.request();
    if (plugin.getsAliases()) {
        plugin.aliases(input.response);
    }
    plugin.destroy();
    if (HandleBook::instance().owned() > 0) {
        report.find("never released when the instance was destroyed: " + HandleBook::instance().ownedTexts());
    }
}

void keptValues(CheckedPlugin& plugin, CheckReport& report, const CheckInput& input) {
    if (!beginLife(plugin)) {
        return;
    }
    const std::size_t before = HandleBook::instance().owned();
    completeLife(plugin, report, {.response = input.response, .watched = kWatched});
    if (HandleBook::instance().owned() > before) {
        report.find("not released after its answer: " + HandleBook::instance().ownedTexts());
    }
}

void releasedTwice(CheckedPlugin& plugin, CheckReport& report, const CheckInput& input) {
    findMisuse(plugin, report, input, Misuse::ReleasedTwice);
}

void changedBorrowed(CheckedPlugin& plugin, CheckReport& report, const CheckInput& input) {
    findMisuse(plugin, report, input, Misuse::ChangedBorrowed);
}

void usedAfterRelease(CheckedPlugin& plugin, CheckReport& report, const CheckInput& input) {
    findMisuse(plugin, report, input, Misuse::UsedAfterRelease);
}

void errorSlots(CheckedPlugin& plugin, CheckReport& report, const CheckInput& input) {
    findMisuse(plugin, report, input, Misuse::SlotOfAnother);
}

} // namespace welcomer::tool::checks
