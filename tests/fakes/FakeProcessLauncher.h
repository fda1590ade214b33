// A launcher that starts nothing.

#pragma once

#include "platform/Error.h"
#include "platform/ProcessLauncher.h"
#include "tests/fakes/CallRecorder.h"

#include <functional>
#include <map>
#include <string>
#include <vector>

namespace welcomer::fakes {

// Recorded as "ProcessLauncher.launchAndWait /program, argument, argument". Any thread.
class FakeProcessLauncher final : public platform::ProcessLauncher {
  public:
    explicit FakeProcessLauncher(CallRecorder& recorder) : _recorder(recorder) {}

    // What running a program does: give its exit status, or throw. A program without an entry cannot be
    // launched.
    std::map<std::string, std::function<int(const std::vector<std::string>& arguments)>> programs;

    int launchAndWait(const std::string& program, const std::vector<std::string>& arguments) override {
        std::string call = "ProcessLauncher.launchAndWait " + program;
        for (const std::string& argument : arguments) {
            call += ", " + argument;
        }
        _recorder.record(call);
        const auto found = programs.find(program);
        if (found == programs.end()) {
            throw platform::Exception(program + ": No such file or directory");
        }
        return found->second(arguments);
    }

  private:
    CallRecorder& _recorder;
};

} // namespace welcomer::fakes
