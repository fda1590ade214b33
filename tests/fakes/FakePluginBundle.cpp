#include "tests/fakes/FakePluginBundle.h"

namespace welcomer::fakes {

platform::PluginSymbol FakePluginBundle::load(const std::string& path, const char* symbol) {
    _recorder.record("PluginBundle.load " + path + ", " + symbol);
    if (onLoad) {
        onLoad();
    }
    const std::lock_guard lock(_mutex);
    if (const auto reason = _reasons.find(path); reason != _reasons.end()) {
        return {nullptr, reason->second};
    }
    if (const auto found = _symbols.find({path, symbol}); found != _symbols.end()) {
        return {found->second, {}};
    }
    return {nullptr, path + ": no symbol " + symbol};
}

void FakePluginBundle::add(const std::string& path, const std::string& symbol, const void* address) {
    const std::lock_guard lock(_mutex);
    _symbols[{path, symbol}] = address;
}

void FakePluginBundle::addBroken(const std::string& path, const std::string& reason) {
    const std::lock_guard lock(_mutex);
    _reasons[path] = reason;
}

} // namespace welcomer::fakes
