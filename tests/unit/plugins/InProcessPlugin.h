// A plug-in within the test program, over the same C structures as one in a library.

#pragma once

#include "sdk/welcomer/delegate_plugin.h"

#include <functional>
#include <optional>
#include <string>

namespace welcomer::fakes {

// A well-behaved plug-in whose parts a test replaces. It must outlive the instances that it makes.
struct InProcessPlugin {
    explicit InProcessPlugin(std::optional<std::string> name) : identifier(std::move(name)) {
        descriptor.destroy = [](wl_delegate* delegate) {
            ++static_cast<InProcessPlugin*>(delegate->plugin_data)->destroyed;
        };
        instance.plugin_data = this;
        instance.delegate_identifier = [](wl_delegate* delegate, wl_error_slot*) {
            auto& plugin = of(delegate);
            ++plugin.identifierCalls;
            return plugin.identifier ? plugin.identifier->c_str() : static_cast<const char*>(nullptr);
        };
        instance.delegate_setup_request = [](wl_delegate* delegate, wl_error_slot* slot) {
            return of(delegate).request ? of(delegate).request(slot) : static_cast<wl_value*>(nullptr);
        };
        instance.complete_setup_with_response = [](wl_delegate* delegate, const wl_value* response,
                                                   wl_completion_handler handler, wl_error_slot* slot) {
            of(delegate).complete(response, nullptr, handler, slot);
        };
        instance.complete_setup_with_response_chosen_aliases =
            [](wl_delegate* delegate, const wl_value* response, const wl_value* chosen,
               wl_completion_handler handler, wl_error_slot* slot) {
                of(delegate).complete(response, chosen, handler, slot);
            };
        instance.messaging_aliases_from_response = [](wl_delegate* delegate, const wl_value* response,
                                                      wl_error_slot* slot) {
            return of(delegate).aliases(response, slot);
        };
    }

    // The plug-in behind an instance.
    static InProcessPlugin& of(wl_delegate* delegate) {
        return *static_cast<InProcessPlugin*>(delegate->plugin_data);
    }

    // Behind a C function pointer there is no room for the plug-in that is to make an instance; the
    // descriptor's address says which one it is.
    template <int Index>
    static wl_delegate* createNumber(const wl_host* table, wl_error_slot* slot) {
        InProcessPlugin& plugin = *numbered[Index];
        plugin.host = table;
        ++plugin.created;
        return plugin.create ? plugin.create(slot) : &plugin.instance;
    }

    // Takes one of the places for plug-ins that a test scans at once.
    template <int Index>
    const wl_delegate_plugin_descriptor* exportAs() {
        numbered[Index] = this;
        descriptor.create = createNumber<Index>;
        return &descriptor;
    }

    static inline InProcessPlugin* numbered[4] = {};

    std::optional<std::string> identifier;
    std::function<wl_delegate*(wl_error_slot*)> create; // empty: makes the instance
    std::function<wl_value*(wl_error_slot*)> request;   // empty: none
    std::function<void(const wl_value*, const wl_value*, wl_completion_handler, wl_error_slot*)> complete;
    std::function<wl_value*(const wl_value*, wl_error_slot*)> aliases;

    const wl_host* host = nullptr;
    int created = 0;
    int destroyed = 0;
    int identifierCalls = 0;

    wl_delegate instance = {sizeof(wl_delegate), {}, {}, {}, {}, {}, {}, {}, {}};
    wl_delegate_plugin_descriptor descriptor = {WL_DELEGATE_PLUGIN_ABI_VERSION,
                                                sizeof(wl_delegate_plugin_descriptor),
                                                WL_DELEGATE_PLUGIN_PROTOCOL,
                                                "Sample",
                                                nullptr,
                                                nullptr};
};

} // namespace welcomer::fakes
