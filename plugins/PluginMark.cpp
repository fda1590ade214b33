#include "plugins/PluginMark.h"

#include <utility>

namespace welcomer {

namespace {

// Part of the thread from its start, whatever holds this code, so that a signal handler may read it.
[[gnu::tls_model("initial-exec")]] constinit thread_local const char* innermost = nullptr;

} // namespace

PluginMark::PluginMark(const char* name) noexcept : _outer(std::exchange(innermost, name)) {}

PluginMark::~PluginMark() {
    innermost = _outer;
}

const char* PluginMark::current() noexcept {
    return innermost;
}

} // namespace welcomer
