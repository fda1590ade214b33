// Directories that tests choose.

#pragma once

#include "platform/DirectoryService.h"
#include "tests/fakes/CallRecorder.h"

#include <algorithm>
#include <memory>
#include <string>
#include <vector>

namespace welcomer::fakes {

// Only a local node until a test says otherwise; nodes whose name begins with "local" are local. Recorded as
// "DirectoryService.openNode 8705", "DirectoryService.subnodeNames" and
// "DirectoryService.unreachableSubnodeNames". One thread; must outlive its nodes.
class FakeDirectoryService final : public platform::DirectoryService {
  public:
    explicit FakeDirectoryService(CallRecorder& recorder) : _recorder(recorder) {}

    std::unique_ptr<platform::DirectoryNode> openNode(std::uint32_t nodeType) override {
        _recorder.record("DirectoryService.openNode " + std::to_string(nodeType));
        return openings-- > 0 ? std::make_unique<Node>(*this) : nullptr;
    }
    bool isLocalNodeName(const std::string& name) override { return name.starts_with("local"); }

    int openings = 1000; // how often a node can be opened
    std::vector<std::string> subnodes = {"local"};
    std::vector<std::string> unreachable;

  private:
    class Node final : public platform::DirectoryNode {
      public:
        explicit Node(FakeDirectoryService& service) : _service(service) {}
        std::vector<std::string> subnodeNames() override {
            _service._recorder.record("DirectoryService.subnodeNames");
            return _service.subnodes;
        }
        std::vector<std::string> unreachableSubnodeNames() override {
            _service._recorder.record("DirectoryService.unreachableSubnodeNames");
            return _service.unreachable;
        }

      private:
        FakeDirectoryService& _service;
    };

    CallRecorder& _recorder;
};

} // namespace welcomer::fakes
