// Plug-in bundles whose symbols tests choose.

#pragma once

#include "platform/PluginBundle.h"
#include "tests/fakes/CallRecorder.h"

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

    // Has loading the bundle at a path throw, as the initialisers of its library may.
    void addThrowing(const std::string& path, const std::string& message);

  private:
    CallRecorder& _recorder;
    mutable std::mutex _mutex;
    std::map<std::pair<std::string, std::string>, const void*> _symbols;
    std::map<std::string, std::string> _reasons;
    std::map<std::string, std::string> _exceptions;
};

} // namespace welcomer::fakes
