#include "tools/welcomer/plugins/CheckProcess.h"

#include "backends/posix/FileDescriptor.h"
#include "platform/Platform.h"
#include "plugins/PluginContext.h"
#include "text/Describe.h"
#include "tools/welcomer/cli/PropertyListOutput.h"
#include "tools/welcomer/story/AgentProcess.h"

#include <array>
#include <chrono>
#include <csignal>
#include <cstring>
#include <fcntl.h>
#include <optional>
#include <pthread.h>
#include <sstream>
#include <sys/mman.h>
#include <sys/resource.h>
#include <unistd.h>

namespace welcomer::tool {

namespace {

using namespace std::chrono_literals;

constexpr auto kLimit = 5s;
constexpr char kAccount[] = "user@nimbus.example";
constexpr std::size_t kMostOutput = 65536; // bytes, of those that are read of it
constexpr std::string_view kSanitizerReport = "ERROR: AddressSanitizer";

class TooLong {};

// What the child has told.
struct Told {
    std::string step;
    std::string findings;
    std::string seen;
    bool isFinished = false;

    void take(const std::string& text) {
        const Json record = Json::parse(text, nullptr, false);
        const std::string kind = record.is_object() ? record.value("kind", "") : "";
        const std::string what = record.is_object() ? record.value("text", "") : "";
        if (kind == "step") {
            step = what;
        } else if (kind == "found") {
            findings += (findings.empty() ? "" : "; ") + what;
        } else if (kind == "seen") {
            seen = what;
        } else if (kind == "finished") {
            isFinished = true;
        }
    }
};

// What the child wrote: its last line, or that of a sanitizer's report.
std::string wordsIn(int output) {
    std::array<char, kMostOutput> buffer{};
    const ssize_t count = ::pread(output, buffer.data(), buffer.size(), 0);
    std::istringstream text(std::string(buffer.data(), count > 0 ? static_cast<std::size_t>(count) : 0));
    std::string last;
    for (std::string line; std::getline(text, line);) {
        if (line.find(kSanitizerReport) != std::string::npos) {
            return line;
        }
        last = line.empty() ? last : line;
    }
    return last;
}

// In the child: what a plug-in may do must not reach anybody else.
void shutIn(int output) {
    ::dup2(output, STDOUT_FILENO);
    ::dup2(output, STDERR_FILENO);
    const rlimit none{0, 0};
    ::setrlimit(RLIMIT_CORE, &none);
    // As the agent does: what the desktop's libraries do then changes nothing.
    ::signal(SIGPIPE, SIG_IGN);
    ::signal(SIGXFSZ, SIG_IGN);
    // A copy of this process has nothing to tell; it would say everything twice.
    ::pthread_atfork(nullptr, nullptr, [] { ::_exit(0); });
    setPluginAccount(kAccount);
}

ChildLife lifeOf(const PluginCheck& check, const CheckInput& input, int output) {
    return [&check, &input, output](const KeptLog& /*log*/, const CheckReport::Tell& tell) {
        shutIn(output);
        CheckReport report(tell);
        CheckedPlugin plugin(input.name, report);
        try {
            check.run(plugin, report, input);
        } catch (...) {
            report.find(text::describe(std::current_exception()));
        }
        report.finish();
        return EXIT_SUCCESS;
    };
}

// How the child ended before it was through, and whether that was by exit.
struct EarlyEnd {
    std::string text;
    bool isExit = false;
};

EarlyEnd earlyEnd(const std::optional<AgentEnd>& end) {
    if (!end) {
        return {"it took longer than " + std::to_string(kLimit.count()) + " s"};
    }
    if (end->exitStatus) {
        return {"it ended the process: exit(" + std::to_string(*end->exitStatus) + ")", true};
    }
    const char* const name = ::sigabbrev_np(end->signal);
    return {"it ended the process: " + (name ? std::string("SIG") + name : end->description())};
}

bool counts(const PluginCheck& check, const EarlyEnd& end, const std::string& words) {
    switch (check.ends) {
    case EndsThatCount::All:
        return true;
    case EndsThatCount::Exit:
        return end.isExit;
    case EndsThatCount::SanitizerReport:
        return words.find(kSanitizerReport) != std::string::npos;
    case EndsThatCount::None:
        return false;
    }
    return true;
}

} // namespace

CheckOutcome runCheck(const PlatformFactory& buildPlatform, const std::string& root, InterruptionGuard& guard,
                      const PluginCheck& check, const CheckInput& input) {
    const posix::FileDescriptor output(::memfd_create("plug-in output", MFD_CLOEXEC));
    Told told;
    const auto start = std::chrono::steady_clock::now();
    AgentListener listener;
    listener.record = [](const AgentLogRecord&) {
    };
    listener.told = [&](const std::string& text) {
        told.take(text);
    };
    listener.tick = [&] {
        if (std::chrono::steady_clock::now() - start > kLimit) {
            throw TooLong();
        }
    };
    std::optional<AgentEnd> end;
    try {
        end = runChildProcess(buildPlatform, root, TimeKind::Real, guard, listener,
                              lifeOf(check, input, output.get()), &platform::current().runLoops);
    } catch (const TooLong&) {
    }
    if (!told.isFinished) {
        const EarlyEnd early = earlyEnd(end);
        const std::string words = wordsIn(output.get());
        if (counts(check, early, words)) {
            told.findings += (told.findings.empty() ? "" : "; ") + early.text +
                             (told.step.empty() ? "" : " in " + told.step) +
                             (words.empty() ? "" : " (" + words + ")");
        }
    }
    return {told.findings, told.seen};
}

} // namespace welcomer::tool
