// What a plug-in must not do to the process that it is in.

#include "tools/welcomer/plugins/Checks.h"
#include "tools/welcomer/plugins/ProcessState.h"

#include <atomic>
#include <chrono>
#include <pthread.h>
#include <unistd.h>

namespace welcomer::tool::checks {

namespace {

using namespace std::chrono_literals;

constexpr auto kPatience = 1s; // whether there is an answer is for others to find

// Finds behind which of a plug-in's operations something became other than it was before, the first time.
//  difference  what is so now, in one line; empty where it is as before
//  life        has the plug-in do what it does
void findChange(CheckedPlugin& plugin, CheckReport& report, const std::function<std::string()>& difference,
                const std::function<void()>& life) {
    std::mutex mutex;
    bool isFound = false;
    plugin.afterCall = [&](const std::string& operation) {
        const std::lock_guard lock(mutex);
        if (const std::string text = isFound ? "" : difference(); !text.empty()) {
            isFound = true;
            report.find(text + ", after " + operation);
        }
    };
    life();
    plugin.afterCall = nullptr;
}

// The same in an ordinary life.
void findChange(CheckedPlugin& plugin, CheckReport& report, const CheckInput& input,
                const std::function<std::string()>& difference) {
    findChange(plugin, report, difference, [&] { liveLife(plugin, report, input); });
}

// The same for what one text says.
void findChangeOf(CheckedPlugin& plugin, CheckReport& report, const CheckInput& input, const char* what,
                  std::string (*current)()) {
    const std::string before = current();
    findChange(plugin, report, input, [&] {
        const std::string now = current();
        return now == before ? "" : std::string(what) + " was " + before + " and is " + now;
    });
}

std::atomic<int> forkCount{0};

} // namespace

void wholeLife(CheckedPlugin& plugin, CheckReport& report, const CheckInput& input) {
    liveLife(plugin, report, input);
}

void exceptions(CheckedPlugin& plugin, CheckReport& report, const CheckInput& input) {
    findChange(
        plugin, report,
        [&] {
            const auto thrown = plugin.thrown();
            return thrown.empty() ? std::string() : thrown.front();
        },
        [&] {
            if (beginLife(plugin)) {
                if (plugin.getsAliases()) {
                    plugin.aliases(input.response);
                }
                completeLife(plugin, report,
                             {.response = input.response, .isTerminated = true, .patience = kPatience});
                plugin.destroy();
            }
        });
}

void callingThread(CheckedPlugin& plugin, CheckReport& report, const CheckInput& input) {
    findChange(plugin, report, input,
               [&] { return plugin.hasEndedThread() ? "it has ended the thread that called it" : ""; });
}

void forks(CheckedPlugin& plugin, CheckReport& report, const CheckInput& input) {
    ::pthread_atfork([] { ++forkCount; }, nullptr, nullptr);
    findChange(plugin, report, input, [] { return forkCount > 0 ? "it called fork" : ""; });
}

void workingDirectory(CheckedPlugin& plugin, CheckReport& report, const CheckInput& input) {
    findChangeOf(plugin, report, input, "the working directory", currentFolder);
}

void locale(CheckedPlugin& plugin, CheckReport& report, const CheckInput& input) {
    findChangeOf(plugin, report, input, "the locale", currentLocale);
}

void fileModeMask(CheckedPlugin& plugin, CheckReport& report, const CheckInput& input) {
    findChangeOf(plugin, report, input, "the umask", currentFileModeMask);
}

void signalHandlers(CheckedPlugin& plugin, CheckReport& report, const CheckInput& input) {
    const auto before = currentSignalHandlers();
    findChange(plugin, report, input, [&] {
        for (const auto& [signal, handler] : currentSignalHandlers()) {
            if (before.at(signal) != handler) {
                std::string text = "the handler of " + signal;
                text.append(" was ").append(before.at(signal)).append(" and is ").append(handler);
                return text;
            }
        }
        return std::string();
    });
}

void descriptors(CheckedPlugin& plugin, CheckReport& report, const CheckInput& input) {
    const auto before = currentDescriptors();
    findChange(plugin, report, input, [&] {
        const auto now = currentDescriptors();
        for (const auto& [number, descriptor] : before) {
            const auto found = now.find(number);
            if (found == now.end()) {
                return "the descriptor " + std::to_string(number) + " of the host is closed";
            }
            if (found->second != descriptor) {
                return "the descriptor " + std::to_string(number) + " of the host leads somewhere else";
            }
        }
        return std::string();
    });
}

void openedDescriptors(CheckedPlugin& plugin, CheckReport& report, const CheckInput& input) {
    const auto before = currentDescriptors();
    liveLife(plugin, report, input);
    for (const auto& [number, descriptor] : currentDescriptors()) {
        if (!before.contains(number) && descriptor.isInherited) {
            report.find("the descriptor " + std::to_string(number) +
                        " is left open for every program that is started: open it with O_CLOEXEC");
        }
    }
}

} // namespace welcomer::tool::checks
