// A setup application that runs for long: it says that it has started, waits for a line, asks for its run loop twice, and
// says which one that is. What is logged meanwhile is printed.

#include "backends/Backends.h"
#include "platform/RunLoop.h"
#include "platform/SystemLog.h"

#include <iostream>
#include <string>
#include <typeinfo>

namespace {

class PrintedLog final : public welcomer::platform::SystemLog {
  public:
    void write(int priority, const std::string& message) override {
        std::cout << "logged " << priority << ": " << message << '\n';
    }
};

} // namespace

int main() {
    PrintedLog log;
    welcomer::PlatformOptions options;
    options.systemLog = &log;
    const auto owner = welcomer::buildPlatform(options);
    std::cout << "started" << std::endl;
    std::string line;
    std::getline(std::cin, line);
    owner->platform().runLoops.current();
    const auto loop = owner->platform().runLoops.current();
    const auto& kind = *loop;
    const bool isDesktops = std::string(typeid(kind).name()).find("GLib") != std::string::npos;
    std::cout << "run loop: " << (isDesktops ? "the desktop's" : "local") << '\n';
    return 0;
}
