#include "text/ProgramOptions.h"

#include "generated/WelcomerConfiguration.h"

#include <cstdio>
#include <string>
#include <string_view>

namespace welcomer {

namespace {

std::string usageLine(const char* program, std::string_view usage) {
    std::string line = std::string("usage: ") + program;
    if (!usage.empty()) {
        line.append(" ").append(usage);
    }
    return line + "\n";
}

} // namespace

int answerOption(const char* option, const char* program, const char* usage) {
    const std::string_view asked = option;
    if (asked == "--version") {
        const std::string line = std::string(program).append(" ").append(configuration::kVersion);
        std::puts(line.c_str());
        return 0;
    }
    const bool isHelp = asked == "--help";
    std::fputs(usageLine(program, usage).c_str(), isHelp ? stdout : stderr);
    return isHelp ? 0 : 2;
}

} // namespace welcomer
