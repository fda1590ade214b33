// What the tests of real plug-in libraries share.

#pragma once

#include "plugins/AbiDelegatePlugin.h"
#include "plugins/WLNimbusDelegatePlugins.h"
#include "tests/fakes/FakePlatform.h"
#include "tests/unit/plugins/Thrown.h"

#include <dlfcn.h>
#include <future>
#include <gtest/gtest.h>
#include <memory>
#include <string>
#include <vector>

namespace welcomer {

using Strings = std::vector<std::string>;
using Aliases = std::optional<Strings>;

class PluginLibraries : public testing::Test {
  protected:
    // Puts a file into the plug-in directory, after those before, and loads it.
    void add(const std::string& name, const std::string& file) {
        const std::string path = std::string(kPluginDirectory) + "/" + name + ".ncdplugin";
        fake.fileSystem.addFile(path, "");
        void* const library = dlopen(file.c_str(), RTLD_NOW | RTLD_LOCAL);
        if (const void* const symbol = library ? dlsym(library, "wl_delegate_plugin") : nullptr) {
            fake.pluginBundle.add(path, "wl_delegate_plugin", symbol);
        } else {
            fake.pluginBundle.addBroken(path, dlerror());
        }
    }

    std::shared_ptr<WLFirstRunDelegateConfiguration> only() {
        const DelegatePluginArray& plugins = WLNimbusDelegatePlugins();
        EXPECT_EQ(fake.systemLog.lines(), Strings{});
        EXPECT_EQ(plugins.size(), 1U);
        return plugins.at(0);
    }

    // The outcomes that a plug-in's handler gave; kept by the handler.
    struct Outcomes {
        std::promise<void> first;
        std::vector<std::pair<bool, std::optional<platform::Error>>> all;
    };

    static WLFirstRunDelegateConfiguration::CompletionHandler handler(std::shared_ptr<Outcomes> outcomes) {
        return [outcomes](bool succeeded, const std::optional<platform::Error>& error) {
            outcomes->all.emplace_back(succeeded, error);
            if (outcomes->all.size() == 1) {
                outcomes->first.set_value();
            }
        };
    }

    fakes::FakePlatform fake;
    platform::ScopedPlatform installed{fake.platform()};
    std::shared_ptr<Outcomes> outcomes = std::make_shared<Outcomes>();
};

} // namespace welcomer
