#include "tools/welcomer/plugins/ProcessState.h"

#include "backends/posix/FileDescriptor.h"

#include <clocale>
#include <csignal>
#include <cstdio>
#include <cstring>
#include <fcntl.h>
#include <filesystem>
#include <fstream>
#include <sys/stat.h>

namespace welcomer::tool {

namespace {

std::string shown(const struct sigaction& action) {
    const bool isDefault = (action.sa_flags & SA_SIGINFO) == 0 && action.sa_handler == SIG_DFL;
    const bool isIgnored = (action.sa_flags & SA_SIGINFO) == 0 && action.sa_handler == SIG_IGN;
    char function[2 * sizeof(void*) + 3] = {};
    std::snprintf(function, sizeof function, "%p", reinterpret_cast<void*>(action.sa_handler));
    return isDefault ? "default" : isIgnored ? "ignored" : std::string("a function at ") + function;
}

} // namespace

std::string currentFolder() {
    std::error_code error;
    return std::filesystem::current_path(error).string();
}

std::string currentLocale() {
    const char* const name = std::setlocale(LC_ALL, nullptr);
    return name ? name : "";
}

// Asking the system call means changing it for a moment.
std::string currentFileModeMask() {
    std::ifstream status("/proc/self/status");
    for (std::string line; std::getline(status, line);) {
        if (line.starts_with("Umask:")) {
            return line.substr(line.find_last_of(" \t") + 1);
        }
    }
    return "";
}

std::map<std::string, std::string> currentSignalHandlers() {
    std::map<std::string, std::string> handlers;
    for (int number = 1; number < NSIG; ++number) {
        struct sigaction action = {};
        if (::sigaction(number, nullptr, &action) == 0) {
            const char* const name = ::sigabbrev_np(number);
            handlers[name ? std::string("SIG") + name : "signal " + std::to_string(number)] = shown(action);
        }
    }
    return handlers;
}

std::map<int, OpenDescriptor> currentDescriptors() {
    std::map<int, OpenDescriptor> descriptors;
    std::error_code error;
    for (const auto& entry : std::filesystem::directory_iterator("/proc/self/fd", error)) {
        const int number = std::stoi(entry.path().filename().string());
        const int flags = ::fcntl(number, F_GETFD);
        struct stat status = {};
        if (flags >= 0 && ::fstat(number, &status) == 0) {
            descriptors[number] = {std::to_string(status.st_dev) + ":" + std::to_string(status.st_ino),
                                   (flags & FD_CLOEXEC) == 0};
        }
    }
    // The folder itself was open while it was read.
    std::erase_if(descriptors, [](const auto& each) { return ::fcntl(each.first, F_GETFD) < 0; });
    return descriptors;
}

} // namespace welcomer::tool
