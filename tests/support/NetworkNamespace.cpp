#include "tests/support/NetworkNamespace.h"

#include <array>
#include <cerrno>
#include <cstdio>
#include <sched.h>
#include <stdexcept>
#include <system_error>
#include <unistd.h>

namespace welcomer {

bool mayHaveNetwork() {
    return ::geteuid() == 0;
}

void enterNetworkNamespace() {
    if (::unshare(CLONE_NEWNET) != 0) {
        throw std::system_error(errno, std::generic_category(), "a network namespace");
    }
    shell("ip link set lo up");
}

std::string shell(const std::string& command) {
    FILE* const pipe = ::popen((command + " 2>&1").c_str(), "r");
    if (!pipe) {
        throw std::system_error(errno, std::generic_category(), command);
    }
    std::string output;
    std::array<char, 4096> block = {};
    for (std::size_t count = 0; (count = std::fread(block.data(), 1, block.size(), pipe)) > 0;) {
        output.append(block.data(), count);
    }
    if (const int status = ::pclose(pipe); status != 0) {
        throw std::runtime_error(command + ": status " + std::to_string(status) + ": " + output);
    }
    return output;
}

} // namespace welcomer
