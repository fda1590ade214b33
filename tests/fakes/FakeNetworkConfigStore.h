// A persistent network configuration in memory.

#pragma once

#include "platform/NetworkConfigStore.h"
#include "tests/fakes/CallRecorder.h"

#include <cstdint>
#include <map>
#include <memory>
#include <optional>
#include <string>
#include <vector>

namespace welcomer::fakes {

// An interface and, from the outermost one inwards, what it stands on.
struct FakeInterface {
    std::optional<std::string> type = platform::kNetworkEthernet;
    std::optional<std::string> device = "eth0";
    std::optional<std::string> name = "Ethernet (eth0)";
};
using FakeInterfaceChain = std::vector<FakeInterface>;

struct FakeProtocol {
    std::optional<std::string> type;
    std::optional<PropertyList::Dictionary> configuration;
    bool isAbsent = false; // listed, but null
    friend bool operator==(const FakeProtocol&, const FakeProtocol&) = default;
};

struct FakeService {
    std::optional<std::string> name;
    std::optional<std::string> id;
    FakeInterfaceChain chain = {{}};
    bool isEnabled = false;
    std::vector<FakeProtocol> protocols;

    const FakeProtocol* protocol(const std::string& type) const;
    FakeProtocol* protocol(const std::string& type);
};

// How a call is to fail: with which code, from which call to it on and how often.
struct FakeFailure {
    std::int32_t code = 0;
    int after = 0;
    int times = 1000000;
};

// Recorded are the calls that open, change and store: "NetworkConfigStore.open name",
// "NetworkConfigStore.setEnabled service, yes" and so on, under the names that `failures` takes: "open" is no
// one of them. Changes are in `services` at once, in `stored` when committed. One thread.
class FakeNetworkConfigStore final : public platform::NetworkConfigStore {
  public:
    explicit FakeNetworkConfigStore(CallRecorder& recorder) : _recorder(recorder) {}

    std::shared_ptr<platform::NetworkConfigConnection> open(const std::string& name) override;
    std::vector<std::shared_ptr<platform::NetworkInterface>> copyInterfaces() override;

    // Each by its chain; an empty one is listed as null.
    std::vector<FakeInterfaceChain> interfaces;

    bool hasSet = true;
    int setAppearsAfterOpening = 0; // the set is there only from that connection on
    std::vector<FakeService> services;
    std::vector<FakeService> stored;
    std::vector<FakeService> newHardware; // what establishing adds
    bool cannotListServices = false;
    bool cannotListProtocols = false;
    std::int32_t lastError = 0;

    // By the name of the call: establish, commit, apply, setEnabled, setConfiguration, addProtocolType,
    // copyProtocol.
    std::map<std::string, FakeFailure> failures;

    // Calls that throw.
    std::map<std::string, std::string> exceptions;

    // Whether a call is to fail now; sets the last error.
    bool fails(const std::string& call);

    void record(const std::string& call) { _recorder.record("NetworkConfigStore." + call); }
    int opened = 0;

  private:
    CallRecorder& _recorder;
};

} // namespace welcomer::fakes
