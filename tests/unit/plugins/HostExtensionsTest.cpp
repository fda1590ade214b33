// What a plug-in gets by asking for an extension.

#include "plugins/HostExtensions.h"

#include "plugins/PluginContext.h"
#include "plugins/PluginMark.h"
#include "tests/fakes/FakePlatform.h"
#include "tests/unit/plugins/AbiDelegatePluginFixture.h"

#include <chrono>
#include <cmath>
#include <limits>
#include <stdexcept>

namespace welcomer {
namespace {

using namespace std::chrono_literals;
using Strings = std::vector<std::string>;

class HostExtensionsTest : public AbiDelegatePluginTest {
  protected:
    // An instance that the host knows with its identifier.
    std::shared_ptr<AbiDelegatePlugin> known() {
        auto instance = create();
        instance->delegateIdentifier();
        return instance;
    }

    // Every note is a text that was given to a block.
    static void note(void* data) { notes.emplace_back(static_cast<const char*>(data)); }
    static void noteDrop(void* data) {
        notes.push_back("dropped " + std::string(static_cast<const char*>(data)));
    }
    static void* text(const char* content) { return const_cast<char*>(content); }

    void SetUp() override {
        notes.clear();
        setPluginMainLoop();
    }

    static inline Strings notes;
    fakes::FakePlatform fake;
    const platform::ScopedPlatform installed{fake.platform()};
    wl_delegate* const self = &plugin.instance;
    const wl_dispatch& loop = dispatchExtension();
};

TEST_F(HostExtensionsTest, AreFoundByTheirExactIdentifiers) {
    EXPECT_EQ(host.get_extension(WL_EXTENSION_LOG), &logExtension());
    EXPECT_EQ(host.get_extension(WL_EXTENSION_CONTEXT), &contextExtension());
    EXPECT_EQ(host.get_extension(WL_EXTENSION_PROGRESS), &progressExtension());
    EXPECT_EQ(host.get_extension(WL_EXTENSION_DISPATCH), &dispatchExtension());
    for (const char* identifier :
         {"", "com.corvid.welcomer.log", "com.corvid.welcomer.log/2", static_cast<const char*>(nullptr)}) {
        EXPECT_EQ(host.get_extension(identifier), nullptr);
    }
}

TEST_F(HostExtensionsTest, BeginWithTheirSizes) {
    EXPECT_EQ(logExtension().size, sizeof(wl_log));
    EXPECT_EQ(contextExtension().size, sizeof(wl_context));
    EXPECT_EQ(progressExtension().size, sizeof(wl_progress));
    EXPECT_EQ(dispatchExtension().size, sizeof(wl_dispatch));
}

TEST_F(HostExtensionsTest, OfAPluginAreAskedForWhereItHasThatFunction) {
    static const int content = 1;
    plugin.instance.get_extension = [](wl_delegate*, const char* identifier) -> const void* {
        return std::string(identifier) == "org.example.own/1" ? &content : nullptr;
    };
    EXPECT_EQ(create()->extension("org.example.own/1"), &content);
    EXPECT_EQ(create()->extension("org.example.other/1"), nullptr);
    plugin.instance.get_extension = [](wl_delegate*, const char*) -> const void* {
        throw 42;
    };
    EXPECT_EQ(create()->extension("org.example.own/1"), nullptr);
    plugin.instance.get_extension = nullptr;
    EXPECT_EQ(create()->extension("org.example.own/1"), nullptr);
}

TEST_F(HostExtensionsTest, OfAPluginFromTheFirstHeaderAreNone) {
    plugin.instance.get_extension = [](wl_delegate*, const char*) -> const void* {
        ADD_FAILURE() << "behind the plug-in's own size";
        return nullptr;
    };
    plugin.instance.size = offsetof(wl_delegate, get_extension);
    EXPECT_EQ(create()->extension("org.example.own/1"), nullptr);
}

TEST_F(HostExtensionsTest, ALineIsUnderThePluginsNameAndLevel) {
    const auto instance = known();
    logExtension().write(self, WL_LOG_ERROR, "one");
    logExtension().write(self, WL_LOG_WARNING, "two\nforged");
    logExtension().write(self, WL_LOG_INFORMATION, "bad \xFF");
    logExtension().write(self, WL_LOG_DEBUG, "");
    logExtension().write(self, -1, std::string(5000, 'x').c_str());
    logExtension().write(self, WL_LOG_ERROR, nullptr);
    const Strings lines = fake.systemLog.lines();
    ASSERT_EQ(lines.size(), 5U);
    EXPECT_EQ(lines[0], "plug-in Sample.ncdplugin error: one");
    EXPECT_EQ(lines[1], "plug-in Sample.ncdplugin warning: two\\nforged");
    EXPECT_EQ(lines[2], "plug-in Sample.ncdplugin information: bad \xEF\xBF\xBD");
    EXPECT_EQ(lines[3], "plug-in Sample.ncdplugin debug: ");
    EXPECT_EQ(lines[4].size(), std::string("plug-in Sample.ncdplugin information: ").size() + 1024);
}

TEST_F(HostExtensionsTest, WithoutAnInstanceTheThreadsPluginSpeaks) {
    {
        const PluginMark mark("Other.ncdplugin");
        logExtension().write(nullptr, WL_LOG_ERROR, "one");
    }
    logExtension().write(self, WL_LOG_ERROR, "two");
    EXPECT_EQ(fake.systemLog.lines(),
              (Strings{"plug-in Other.ncdplugin error: one", "plug-in (unknown) error: two"}));
}

TEST_F(HostExtensionsTest, TheContextIsWhatWasSetLast) {
    const wl_context& context = contextExtension();
    EXPECT_EQ(context.account_name(), nullptr);
    EXPECT_STREQ(context.root_folder(), "/");
    EXPECT_FALSE(context.is_trial());
    EXPECT_STREQ(context.home_folder(), fake.platform().processIdentity.homeDirectory().c_str());
    EXPECT_NE(std::string(context.host_version()), "");
    setPluginAccount("first");
    const char* const first = context.account_name();
    setPluginAccount("second");
    setPluginRoot("/elsewhere");
    EXPECT_STREQ(first, "first");
    EXPECT_STREQ(context.account_name(), "second");
    EXPECT_STREQ(context.root_folder(), "/elsewhere");
    EXPECT_TRUE(context.is_trial());
    setPluginRoot("/");
}

TEST_F(HostExtensionsTest, ProgressIsSaidOnceAndWithinItsBounds) {
    const auto instance = known();
    const wl_progress& progress = progressExtension();
    for (const double fraction : {-1.0, 0.0, 0.009, 0.5, 0.501, 7.0, std::nan("")}) {
        progress.report(self, fraction, nullptr);
    }
    progress.report(self, 0, "two\nlines");
    progress.report(nullptr, 0.5, "nobody");
    EXPECT_EQ(fake.systemLog.lines(),
              (Strings{"com.corvid.sample progress: 0 %", "com.corvid.sample progress: 50 %",
                       "com.corvid.sample progress: 100 %", "com.corvid.sample progress: 0 %",
                       "com.corvid.sample progress: 0 % two\\nlines"}));
}

TEST_F(HostExtensionsTest, ProgressFillsNoLog) {
    const auto instance = known();
    for (int line = 0; line < 1000; ++line) {
        progressExtension().report(self, 0.5, std::to_string(line).c_str());
    }
    EXPECT_EQ(fake.systemLog.lines().size(), 200U);
}

TEST_F(HostExtensionsTest, BlocksRunOnTheMainLoopInTheirOrder) {
    const auto instance = known();
    EXPECT_NE(loop.after(self, 2, note, noteDrop, text("late")), 0U);
    EXPECT_NE(loop.after(self, 0, note, noteDrop, text("one")), 0U);
    EXPECT_NE(loop.after(self, -1, note, noteDrop, text("two")), 0U);
    EXPECT_NE(loop.after(self, std::nan(""), note, noteDrop, text("three")), 0U);
    EXPECT_NE(loop.after(self, std::numeric_limits<double>::infinity(), note, nullptr, text("never")), 0U);
    EXPECT_EQ(notes, Strings{}) << "not within the call";
    const auto port = fake.platform().runLoops.current()->attachPort();
    fake.platform().runLoops.current()->run(1s);
    EXPECT_EQ(notes, (Strings{"one", "two", "three"}));
    fake.platform().runLoops.current()->run(5s);
    EXPECT_EQ(notes, (Strings{"one", "two", "three", "late"}));
}

TEST_F(HostExtensionsTest, ACancelledBlockIsDroppedOnce) {
    const auto instance = known();
    const std::uint64_t number = loop.after(self, 0, note, noteDrop, text("one"));
    wl_delegate stranger{};
    EXPECT_FALSE(loop.cancel(&stranger, number));
    EXPECT_FALSE(loop.cancel(self, number + 1));
    EXPECT_TRUE(loop.cancel(self, number));
    EXPECT_FALSE(loop.cancel(self, number));
    fake.platform().runLoops.current()->run(1s);
    EXPECT_EQ(notes, Strings{"dropped one"});
}

TEST_F(HostExtensionsTest, TheEndOfADelegateDropsItsBlocks) {
    auto instance = known();
    loop.after(self, 0, note, noteDrop, text("one"));
    loop.after(self, 0, note, nullptr, text("two"));
    instance.reset();
    fake.platform().runLoops.current()->run(1s);
    EXPECT_EQ(notes, Strings{"dropped one"});
    EXPECT_EQ(loop.after(self, 0, note, noteDrop, text("late")), 0U);
}

TEST_F(HostExtensionsTest, WhatABlockThrowsIsLogged) {
    const auto instance = known();
    loop.after(
        self, 0,
        [](void*) {
            note(text(PluginMark::current()));
            throw std::runtime_error("in a block");
        },
        nullptr, nullptr);
    loop.after(self, 0, note, nullptr, text("next"));
    fake.platform().runLoops.current()->run(1s);
    EXPECT_EQ(notes, (Strings{"Sample.ncdplugin", "next"}));
    EXPECT_EQ(fake.systemLog.lines(),
              Strings{"exception in a block of plug-in Sample.ncdplugin: in a block"});
}

TEST_F(HostExtensionsTest, BlocksOfNobodyAndNoBlocksAreRefused) {
    const auto instance = known();
    EXPECT_EQ(loop.after(nullptr, 0, note, noteDrop, text("nobody's")), 0U);
    EXPECT_EQ(loop.after(self, 0, nullptr, noteDrop, text("none")), 0U);
    EXPECT_EQ(notes, Strings{});
}

} // namespace
} // namespace welcomer
