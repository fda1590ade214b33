#include "backends/desktop/accountserver/DesktopProxies.h"

#include "backends/desktop/glib/AsyncCall.h"

#include <algorithm>
#include <string_view>

namespace welcomer::desktop {

namespace {

constexpr std::string_view kDirect = "direct://";

// What a proxy is called where it is to be used, which may be another name than GLib's.
struct Scheme {
    std::string_view name;
    std::string_view libcurl;
};
// The server's name is looked up by the proxy where its protocol has a place for it: this machine may know none.
constexpr Scheme kSchemes[] = {{"http://", "http://"},       {"https://", "https://"},
                               {"socks5://", "socks5h://"},  {"socks://", "socks5h://"},
                               {"socks4a://", "socks4a://"}, {"socks4://", "socks4://"}};

struct FreeTexts {
    void operator()(char** texts) const { g_strfreev(texts); }
};
using Texts = std::unique_ptr<char*, FreeTexts>;

} // namespace

std::vector<std::string> desktopProxies(const std::string& address, std::chrono::milliseconds limit,
                                        Interruption& interruption) {
    GProxyResolver* const resolver = g_proxy_resolver_get_default(); // borrowed
    AsyncCall lookup(limit);
    GCancellable* const cancellable = lookup.cancellable();
    const Interruption::Registration registration(interruption,
                                                  [cancellable] { g_cancellable_cancel(cancellable); });
    g_proxy_resolver_lookup_async(resolver, address.c_str(), cancellable, AsyncCall::done, lookup.argument());
    GAsyncResult* const result = lookup.wait();
    ErrorSlot error;
    const Texts found(result ? g_proxy_resolver_lookup_finish(resolver, result, error.out()) : nullptr);
    std::vector<std::string> proxies;
    for (char* const* each = found.get(); each && *each; ++each) {
        const std::string_view proxy = *each;
        if (proxy == kDirect) {
            proxies.emplace_back();
            continue;
        }
        const auto* const scheme = std::ranges::find_if(
            kSchemes, [proxy](const Scheme& known) { return proxy.starts_with(known.name); });
        if (scheme != std::end(kSchemes)) {
            proxies.push_back(std::string(scheme->libcurl) += proxy.substr(scheme->name.size()));
        }
    }
    return proxies;
}

} // namespace welcomer::desktop
