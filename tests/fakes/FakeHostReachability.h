// A network whose reach tests choose.

#pragma once

#include "platform/HostReachability.h"
#include "tests/fakes/CallRecorder.h"

#include <cstdint>
#include <memory>
#include <optional>
#include <string>

namespace welcomer::fakes {

// Every host is reachable until a test says otherwise. Recorded as "HostReachability.createTarget host" and
// "HostReachability.flags host". Any thread once the flags are chosen; must outlive its targets.
class FakeHostReachability final : public platform::HostReachability {
  public:
    explicit FakeHostReachability(CallRecorder& recorder) : _recorder(recorder) {}

    std::unique_ptr<platform::HostReachabilityTarget> createTarget(const std::string& hostName) override {
        _recorder.record("HostReachability.createTarget " + hostName);
        return std::make_unique<Target>(*this, hostName);
    }

    // None: they cannot be read.
    std::optional<std::uint32_t> flags = platform::kHostReachable;

    // How many probes find nothing before the flags count, and how many there were.
    std::uint64_t failingProbes = 0;
    std::uint64_t probes = 0;

  private:
    class Target final : public platform::HostReachabilityTarget {
      public:
        Target(FakeHostReachability& network, std::string hostName)
            : _network(network),
              _hostName(std::move(hostName)) {}

        std::optional<std::uint32_t> flags() override {
            _network._recorder.record("HostReachability.flags " + _hostName);
            return ++_network.probes > _network.failingProbes ? _network.flags : 0U;
        }

      private:
        FakeHostReachability& _network;
        std::string _hostName;
    };

    CallRecorder& _recorder;
};

} // namespace welcomer::fakes
