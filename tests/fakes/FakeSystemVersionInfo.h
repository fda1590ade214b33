// A system version that tests choose.

#pragma once

#include "platform/SystemVersionInfo.h"
#include "tests/fakes/CallRecorder.h"

#include <optional>
#include <string>

namespace welcomer::fakes {

// Version "12" until a test says otherwise. Recorded as "SystemVersionInfo.productVersion". Any thread once
// the version is chosen.
class FakeSystemVersionInfo final : public platform::SystemVersionInfo {
  public:
    explicit FakeSystemVersionInfo(CallRecorder& recorder) : _recorder(recorder) {}

    std::optional<std::string> productVersion() override {
        _recorder.record("SystemVersionInfo.productVersion");
        return version;
    }

    std::optional<std::string> version = "12";

  private:
    CallRecorder& _recorder;
};

} // namespace welcomer::fakes
