// What the tests of a plug-in behind the ABI share.

#pragma once

#include "plugins/AbiDelegatePlugin.h"
#include "plugins/PropertyListHandles.h"
#include "tests/unit/plugins/InProcessPlugin.h"
#include "tests/unit/plugins/Thrown.h"

#include <gtest/gtest.h>
#include <string>
#include <vector>

namespace welcomer {

using fakes::InProcessPlugin;
using Aliases = std::optional<std::vector<std::string>>;

inline constexpr const char* kName = "Sample.ncdplugin";

class AbiDelegatePluginTest : public testing::Test {
  protected:
    std::shared_ptr<AbiDelegatePlugin> create() {
        return AbiDelegatePlugin::create(*plugin.exportAs<0>(), kName);
    }

    const wl_delegate_plugin_descriptor* principalClass() {
        return AbiDelegatePlugin::principalClass(plugin.exportAs<0>(), reason);
    }

    WLFirstRunDelegateConfiguration::CompletionHandler handler() {
        return [this](bool succeeded, const std::optional<platform::Error>& error) {
            ++handlerCalls;
            lastSucceeded = succeeded;
            lastError = error;
        };
    }

    InProcessPlugin plugin{"com.corvid.sample"};
    const wl_host& host = delegatePluginHost();
    std::string reason;
    int handlerCalls = 0;
    bool lastSucceeded = false;
    std::optional<platform::Error> lastError;
};

} // namespace welcomer
