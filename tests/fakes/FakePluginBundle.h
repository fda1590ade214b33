// Plug-in bundles whose symbols tests choose.

#pragma once

#include "platform/PluginBundle.h"
#include "tests/fakes/CallRecorder.h"

#include <functional>
#include <map>
#include <mutex>
#include <string>
#include <utility>

namespace welcomer::fakes {

// Recorded as "PluginBundle.load /path, symbol". Any thread.
class FakePluginBundle final : public platform::PluginBundle {
  public:
    explicit FakePluginBundle(CallRecorder& recorder) : _recorder(recorder) {}

    // What was added, else no symbol and a reason.
    platform::PluginSymbol load(const std::string& path, const char* symbol) override;

    // Gives the bundle at a path a symbol. The address is borrowed.
    void add(const std::string& path, const std::string& symbol, const void* address);

    // Has the bundle at a path fail to load, whatever the symbol.
    void addBroken(const std::string& path, const std::string& reason);

    // What a library's own initialisers do, for every one that is loaded; empty: nothing.
    std::function<void()> onLoad;

  private:
    CallRecorder& _recorder;
    mutable std::mutex _mutex;
    std::map<std::pair<std::string, std::string>, const void*> _symbols;
    std::map<std::string, std::string> _reasons;
};

} // namespace welcomer::fakes
