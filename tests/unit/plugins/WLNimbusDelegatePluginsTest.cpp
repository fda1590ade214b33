#include "plugins/WLNimbusDelegatePlugins.h"

#include "log/PCLogManager.h"
#include "plugins/PluginMark.h"
#include "tests/fakes/FakePlatform.h"
#include "tests/unit/plugins/InProcessPlugin.h"

#include <gtest/gtest.h>
#include <stdexcept>
#include <string>
#include <vector>

namespace welcomer {
namespace {

using fakes::InProcessPlugin;

// Run loops that are made to be seen.
class RecordedRunLoops final : public platform::RunLoops {
  public:
    RecordedRunLoops(platform::RunLoops& loops, fakes::CallRecorder& recorder)
        : _loops(loops),
          _recorder(recorder) {}

    std::shared_ptr<platform::RunLoop> current() override {
        _recorder.record("RunLoops.current");
        return _loops.current();
    }

  private:
    platform::RunLoops& _loops;
    fakes::CallRecorder& _recorder;
};

class WLNimbusDelegatePluginsTest : public testing::Test {
  protected:
    static std::string path(const std::string& fileName) {
        return "/System/Library/CoreServices/FirstRunPlugins/" + fileName;
    }

    // Puts an entry into the plug-in directory, after those before.
    void add(const std::string& fileName, const void* symbol) {
        fake.fileSystem.addFile(path(fileName), "");
        fake.pluginBundle.add(path(fileName), "wl_delegate_plugin", symbol);
    }

    std::vector<std::string> identifiers() {
        std::vector<std::string> result;
        for (const auto& plugin : WLNimbusDelegatePlugins()) {
            result.push_back(plugin->delegateIdentifier().value_or("(none)"));
        }
        return result;
    }

    std::vector<std::string> lines() { return fake.systemLog.lines(); }

    using Strings = std::vector<std::string>;

    fakes::FakePlatform fake;
    platform::ScopedPlatform installed{fake.platform()};
    InProcessPlugin first{"com.corvid.first"};
    InProcessPlugin second{"com.corvid.second"};
    InProcessPlugin third{"com.corvid.third"};
};

TEST_F(WLNimbusDelegatePluginsTest, GivesThePluginsInTheOrderInWhichTheyWereMet) {
    add("z.ncdplugin", first.exportAs<0>());
    add("a.ncdplugin", second.exportAs<1>());
    add("m.ncdplugin", third.exportAs<2>());
    EXPECT_EQ(identifiers(), (Strings{"com.corvid.first", "com.corvid.second", "com.corvid.third"}));
    EXPECT_EQ(lines(), Strings{});
}

TEST_F(WLNimbusDelegatePluginsTest, TheThreadHasItsRunLoopBeforeTheFirstPluginIsLoaded) {
    add("a.ncdplugin", first.exportAs<0>());
    RecordedRunLoops runLoops(fake.virtualTime, fake.recorder);
    fakes::FakePlatform watched(
        {.fileSystem = &fake.fileSystem, .pluginBundle = &fake.pluginBundle, .runLoops = &runLoops});
    const platform::ScopedPlatform watchedInstalled(watched.platform());
    EXPECT_EQ(identifiers(), Strings{"com.corvid.first"});
    ASSERT_FALSE(fake.recorder.callsTo("PluginBundle.load").empty());
    EXPECT_EQ(fake.recorder.calls().at(0), "RunLoops.current");
}

TEST_F(WLNimbusDelegatePluginsTest, IsEmptyWithoutALogLineWhenTheDirectoryIsMissing) {
    EXPECT_TRUE(WLNimbusDelegatePlugins().empty());
    EXPECT_EQ(lines(), Strings{});
    EXPECT_EQ(fake.recorder.callsTo("FileSystem.list"),
              Strings{"FileSystem.list /System/Library/CoreServices/FirstRunPlugins"});
}

TEST_F(WLNimbusDelegatePluginsTest, IsEmptyWithoutALogLineWhenTheDirectoryIsUnreadable) {
    add("a.ncdplugin", first.exportAs<0>());
    fake.fileSystem.fail(fakes::FakeFileSystem::Operation::List,
                         "/System/Library/CoreServices/FirstRunPlugins", 13);
    EXPECT_TRUE(WLNimbusDelegatePlugins().empty());
    EXPECT_EQ(lines(), Strings{});
}

TEST_F(WLNimbusDelegatePluginsTest, NeverScansAgainEvenWhenTheFirstScanFoundNothing) {
    const DelegatePluginArray* const array = &WLNimbusDelegatePlugins();
    add("a.ncdplugin", first.exportAs<0>());
    EXPECT_EQ(&WLNimbusDelegatePlugins(), array);
    EXPECT_TRUE(array->empty());
    EXPECT_EQ(fake.recorder.callsTo("FileSystem.list").size(), 1U);
    EXPECT_EQ(first.created, 0);
}

TEST_F(WLNimbusDelegatePluginsTest, NeverScansAgainNorRetriesAPluginThatFailed) {
    add("a.ncdplugin", first.exportAs<0>());
    add("b.ncdplugin", second.exportAs<1>());
    first.identifier.reset();
    WLNimbusDelegatePlugins();
    first.identifier = "com.corvid.first";
    EXPECT_EQ(identifiers(), Strings{"com.corvid.second"});
    EXPECT_EQ(fake.recorder.callsTo("PluginBundle.load").size(), 2U);
    EXPECT_EQ(second.created, 1);
}

TEST_F(WLNimbusDelegatePluginsTest, SkipsSilentlyWhateverHasAnotherExtension) {
    for (const char* name :
         {"a.NCDPLUGIN", "b.ncdPlugin", "c.so", "d.ncdplugin.bak", "ncdplugin", ".ncdplugin", "e.ncdplugin.",
          "f.xncdplugin", "g ncdplugin", "h.ncdplugins", "i.ncdplugin~", "j.ncdplugi"}) {
        add(name, first.exportAs<0>());
    }
    EXPECT_TRUE(WLNimbusDelegatePlugins().empty());
    EXPECT_EQ(lines(), Strings{});
    EXPECT_EQ(fake.recorder.callsTo("PluginBundle.load"), Strings{});
}

TEST_F(WLNimbusDelegatePluginsTest, TestsNothingOfAnEntryButItsExtension) {
    fake.fileSystem.addDirectory(path("folder.with.points.ncdplugin"));
    fake.pluginBundle.add(path("folder.with.points.ncdplugin"), "wl_delegate_plugin", first.exportAs<0>());
    EXPECT_EQ(identifiers(), Strings{"com.corvid.first"});
}

TEST_F(WLNimbusDelegatePluginsTest, SkipsWhatDoesNotLoadWithOneLogLine) {
    fake.fileSystem.addFile(path("broken.ncdplugin"), "no library");
    fake.pluginBundle.addBroken(path("broken.ncdplugin"), "file too short");
    add("good.ncdplugin", first.exportAs<0>());
    EXPECT_EQ(identifiers(), Strings{"com.corvid.first"});
    EXPECT_EQ(lines(), Strings{"Nimbus Plugins: Failed to get principal class for broken.ncdplugin"});
}

TEST_F(WLNimbusDelegatePluginsTest, SkipsALibraryWithoutTheSymbol) {
    fake.fileSystem.addFile(path("a.ncdplugin"), "");
    EXPECT_TRUE(WLNimbusDelegatePlugins().empty());
    EXPECT_EQ(lines(), Strings{"Nimbus Plugins: Failed to get principal class for a.ncdplugin"});
}

TEST_F(WLNimbusDelegatePluginsTest, TheThreadIsMarkedWithTheEntrysNameWhileItsLibraryIsLoaded) {
    std::string mark;
    fake.pluginBundle.onLoad = [&mark] {
        mark = PluginMark::current() ? PluginMark::current() : "none";
    };
    add("a.ncdplugin", first.exportAs<0>());
    EXPECT_EQ(identifiers(), Strings{"com.corvid.first"});
    EXPECT_EQ(mark, "a.ncdplugin");
    EXPECT_EQ(PluginMark::current(), nullptr);
}

TEST_F(WLNimbusDelegatePluginsTest, SkipsAnotherAbiVersion) {
    first.descriptor.abi_version = WL_DELEGATE_PLUGIN_ABI_VERSION + 1;
    add("a.ncdplugin", first.exportAs<0>());
    EXPECT_TRUE(WLNimbusDelegatePlugins().empty());
    EXPECT_EQ(lines(), Strings{"Nimbus Plugins: Failed to get principal class for a.ncdplugin"});
    EXPECT_EQ(first.created, 0);
}

TEST_F(WLNimbusDelegatePluginsTest, SkipsAnotherProtocol) {
    first.descriptor.protocol = "WLFirstRunDelegateConfiguration2";
    add("a.ncdplugin", first.exportAs<0>());
    EXPECT_TRUE(WLNimbusDelegatePlugins().empty());
    EXPECT_EQ(lines(),
              Strings{"Nimbus Plugins: Principal class for a.ncdplugin does not conform to protocol"});
    EXPECT_EQ(first.created, 0);
}

TEST_F(WLNimbusDelegatePluginsTest, SkipsAClassThatMakesNothing) {
    first.create = [](wl_error_slot*) -> wl_delegate* {
        return nullptr;
    };
    add("a.ncdplugin", first.exportAs<0>());
    EXPECT_TRUE(WLNimbusDelegatePlugins().empty());
    EXPECT_EQ(lines(), Strings{"Nimbus Plugins: Failed to init plugin object for a.ncdplugin"});
    EXPECT_EQ(first.created, 1);
    EXPECT_EQ(first.identifierCalls, 0);
}

TEST_F(WLNimbusDelegatePluginsTest, SkipsAClassThatRaisesWhenItIsToMakeAnInstance) {
    first.create = [this](wl_error_slot* slot) -> wl_delegate* {
        first.host->raise(slot, "no");
        return &first.instance;
    };
    add("a.ncdplugin", first.exportAs<0>());
    add("b.ncdplugin", second.exportAs<1>());
    EXPECT_EQ(identifiers(), Strings{"com.corvid.second"});
    EXPECT_EQ(lines(), Strings{"Nimbus Plugins: Failed to init plugin object for a.ncdplugin"});
    EXPECT_EQ(first.destroyed, 1);
}

TEST_F(WLNimbusDelegatePluginsTest, SkipsAClassThatThrowsWhenItIsToMakeAnInstance) {
    first.create = [](wl_error_slot*) -> wl_delegate* {
        throw 42;
    };
    add("a.ncdplugin", first.exportAs<0>());
    EXPECT_TRUE(WLNimbusDelegatePlugins().empty());
    EXPECT_EQ(lines(), Strings{"Nimbus Plugins: Failed to init plugin object for a.ncdplugin"});
}

TEST_F(WLNimbusDelegatePluginsTest, SkipsAPluginWhoseIdentifierRaisesAndGoesOn) {
    first.instance.delegate_identifier = [](wl_delegate* self, wl_error_slot* slot) -> const char* {
        InProcessPlugin::of(self).host->raise(slot, "not today");
        return "com.corvid.first";
    };
    add("a.ncdplugin", first.exportAs<0>());
    add("b.ncdplugin", second.exportAs<1>());
    EXPECT_EQ(identifiers(), Strings{"com.corvid.second"});
    EXPECT_EQ(lines(), Strings{"Nimbus Plugins: Exception querying 'a.ncdplugin' for id on load: not today"});
    EXPECT_EQ(first.destroyed, 1);
}

TEST_F(WLNimbusDelegatePluginsTest, SkipsAPluginWhoseIdentifierThrowsAndGoesOn) {
    first.instance.delegate_identifier = [](wl_delegate*, wl_error_slot*) -> const char* {
        throw 42;
    };
    add("a.ncdplugin", first.exportAs<0>());
    add("b.ncdplugin", second.exportAs<1>());
    EXPECT_EQ(identifiers(), Strings{"com.corvid.second"});
    EXPECT_EQ(lines(),
              Strings{"Nimbus Plugins: Exception querying 'a.ncdplugin' for id on load: unknown exception"});
}

TEST_F(WLNimbusDelegatePluginsTest, SkipsAPluginWhoseIdentifierIsNoUtf8) {
    first.identifier = "com.corvid.\xFF";
    add("a.ncdplugin", first.exportAs<0>());
    EXPECT_TRUE(WLNimbusDelegatePlugins().empty());
    EXPECT_EQ(lines(), Strings{"Nimbus Plugins: Exception querying 'a.ncdplugin' for id on load: "
                               "delegateIdentifier returned what cannot be written: the value "
                               "holds invalid UTF-8, for which XML has no place"});
}

TEST_F(WLNimbusDelegatePluginsTest, SkipsAPluginWithoutAnIdentifier) {
    first.identifier.reset();
    add("a.ncdplugin", first.exportAs<0>());
    EXPECT_TRUE(WLNimbusDelegatePlugins().empty());
    EXPECT_EQ(lines(), Strings{"Nimbus Plugins: 'a.ncdplugin' does not specify a plugin identifier"});
    EXPECT_EQ(first.destroyed, 1);
}

TEST_F(WLNimbusDelegatePluginsTest, TakesAnEmptyTextForAnIdentifier) {
    first.identifier = "";
    add("a.ncdplugin", first.exportAs<0>());
    EXPECT_EQ(identifiers(), Strings{""});
    EXPECT_EQ(lines(), Strings{});
}

TEST_F(WLNimbusDelegatePluginsTest, KeepsTheEarlierOfTwoWithTheSameIdentifier) {
    second.identifier = "com.corvid.first";
    add("z.ncdplugin", first.exportAs<0>());
    add("a.ncdplugin", second.exportAs<1>());
    add("m.ncdplugin", third.exportAs<2>());
    EXPECT_EQ(identifiers(), (Strings{"com.corvid.first", "com.corvid.third"}));
    EXPECT_EQ(lines(), Strings{"Nimbus Plugins: duplicate plugins with id 'com.corvid.first', only one will "
                               "be used"});
    EXPECT_EQ(first.destroyed, 0);
    EXPECT_EQ(second.destroyed, 1);
}

TEST_F(WLNimbusDelegatePluginsTest, NamesAndIdentifiersAreOneLineOfTheLogWhateverIsInThem) {
    first.identifier = second.identifier = "com.corvid.\nforged";
    add("a\nforged.ncdplugin", nullptr);
    add("b.ncdplugin", first.exportAs<0>());
    add("c.ncdplugin", second.exportAs<1>());
    EXPECT_EQ(identifiers(), Strings{"com.corvid.\nforged"});
    EXPECT_EQ(lines(),
              (Strings{R"(Nimbus Plugins: Failed to get principal class for a\nforged.ncdplugin)",
                       R"(Nimbus Plugins: duplicate plugins with id 'com.corvid.\nforged', only one )"
                       "will be used"}));
}

TEST_F(WLNimbusDelegatePluginsTest, ADuplicateIsLoggedBeforeItIsDestroyed) {
    second.identifier = "com.corvid.first";
    add("a.ncdplugin", first.exportAs<0>());
    add("b.ncdplugin", second.exportAs<1>());
    std::vector<int> destroyedThen;
    PCLogManager::sharedManager().setObserver(
        [&](const PCLogManager::Call&) { destroyedThen.push_back(second.destroyed); });
    WLNimbusDelegatePlugins();
    PCLogManager::sharedManager().setObserver({});
    EXPECT_EQ(destroyedThen, std::vector<int>{0});
    EXPECT_EQ(second.destroyed, 1);
}

TEST_F(WLNimbusDelegatePluginsTest, APluginThatWasSkippedDoesNotTakeItsIdentifier) {
    first.instance.delegate_identifier = [](wl_delegate*, wl_error_slot*) -> const char* {
        throw 42;
    };
    second.identifier = "com.corvid.first";
    add("a.ncdplugin", first.exportAs<0>());
    add("b.ncdplugin", second.exportAs<1>());
    EXPECT_EQ(identifiers(), Strings{"com.corvid.first"});
}

TEST_F(WLNimbusDelegatePluginsTest, LogsWithPriority115) {
    first.identifier.reset();
    add("a.ncdplugin", first.exportAs<0>());
    WLNimbusDelegatePlugins();
    ASSERT_EQ(fake.systemLog.records().size(), 1U);
    EXPECT_EQ(fake.systemLog.records()[0].priority, 115);
}

TEST_F(WLNimbusDelegatePluginsTest, AScanSaysWhatBecameOfEachEntry) {
    second.identifier = "com.corvid.first";
    third.descriptor.abi_version = 9;
    fake.fileSystem.addFile(path("a.ncdplugin"), "");
    fake.pluginBundle.addBroken(path("a.ncdplugin"), "file too short");
    fake.fileSystem.addFile(path("other.txt"), "");
    add("b.ncdplugin", first.exportAs<0>());
    add("c.ncdplugin", second.exportAs<1>());
    add("d.ncdplugin", third.exportAs<2>());
    const auto entries = scanDelegatePlugins();
    ASSERT_EQ(entries.size(), 4U);
    EXPECT_EQ(entries[0].fileName, "a.ncdplugin");
    EXPECT_EQ(entries[0].plugin, nullptr);
    EXPECT_EQ(entries[0].identifier, std::nullopt);
    EXPECT_EQ(entries[0].reason, "file too short");
    EXPECT_EQ(entries[1].fileName, "b.ncdplugin");
    EXPECT_NE(entries[1].plugin, nullptr);
    EXPECT_EQ(entries[1].identifier, "com.corvid.first");
    EXPECT_EQ(entries[1].reason, "");
    EXPECT_EQ(entries[2].plugin, nullptr);
    EXPECT_EQ(entries[2].identifier, "com.corvid.first");
    EXPECT_EQ(entries[2].reason, "another plug-in has the same identifier");
    EXPECT_EQ(entries[3].reason, "ABI version 9 instead of 1");
}

TEST_F(WLNimbusDelegatePluginsTest, AScanGivesTheReasonOfEveryOtherRefusal) {
    InProcessPlugin fourth{"com.corvid.fourth"};
    first.descriptor.protocol = "Other";
    second.create = [this](wl_error_slot* slot) -> wl_delegate* {
        second.host->raise(slot, "no licence");
        return nullptr;
    };
    third.identifier.reset();
    fourth.create = [](wl_error_slot*) -> wl_delegate* {
        return nullptr;
    };
    add("a.ncdplugin", first.exportAs<0>());
    add("b.ncdplugin", second.exportAs<1>());
    add("c.ncdplugin", third.exportAs<2>());
    add("d.ncdplugin", fourth.exportAs<3>());
    const auto entries = scanDelegatePlugins();
    ASSERT_EQ(entries.size(), 4U);
    EXPECT_EQ(entries[0].reason, "does not conform to WLFirstRunDelegateConfiguration");
    EXPECT_EQ(entries[1].reason, "no licence");
    EXPECT_EQ(entries[2].reason, "has no identifier");
    EXPECT_EQ(entries[3].reason, "made no plug-in object");
}

TEST_F(WLNimbusDelegatePluginsTest, AScanGivesTheTextOfWhatWasThrown) {
    first.instance.delegate_identifier = [](wl_delegate*, wl_error_slot*) -> const char* {
        throw std::runtime_error("thrown for the identifier");
    };
    add("a.ncdplugin", first.exportAs<0>());
    const auto entries = scanDelegatePlugins();
    ASSERT_EQ(entries.size(), 1U);
    EXPECT_EQ(entries[0].reason, "thrown for the identifier");
}

} // namespace
} // namespace welcomer
