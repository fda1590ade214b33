// Whom a setup is for, and where, as plug-ins may ask.

#include "generated/WelcomerConfiguration.h"
#include "platform/Platform.h"
#include "plugins/HostExtensions.h"
#include "plugins/PluginContext.h"

#include <atomic>
#include <mutex>
#include <set>
#include <string>
#include <string_view>

namespace welcomer {

namespace {

std::atomic<const char*> account = nullptr;
std::atomic<const char*> root = "/";

// A text that lives until the process ends.
const char* kept(const std::string& text) {
    static auto* const mutex = new std::mutex;
    static auto* const texts = new std::set<std::string>;
    const std::lock_guard lock(*mutex);
    return texts->insert(text).first->c_str();
}

// Null where there is none: no exception may reach a plug-in.
template <class Give>
const char* textOrNone(Give give) noexcept {
    try {
        return kept(give());
    } catch (...) {
        return nullptr;
    }
}

extern "C" {

static const char* accountName() {
    return account;
}

static const char* homeFolder() {
    return textOrNone([] { return platform::current().processIdentity.homeDirectory(); });
}

static const char* rootFolder() {
    return root;
}

// A root folder of its own is a machine that is made up.
static bool isTrial() {
    return std::string_view(root) != "/";
}

static const char* hostVersion() {
    return textOrNone([] { return std::string(configuration::kVersion); });
}
}

} // namespace

const wl_context& contextExtension() {
    static constexpr wl_context extension{sizeof(wl_context), accountName, homeFolder,
                                          rootFolder,         isTrial,     hostVersion};
    return extension;
}

void setPluginAccount(const std::string& name) {
    account = kept(name);
}

void setPluginRoot(const std::string& folder) {
    root = kept(folder);
}

} // namespace welcomer
