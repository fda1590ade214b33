#include "backends/desktop/DesktopModule.h"
#include "tests/fakes/FakeSystemLog.h"
#include "tests/fixtures/modules/FixtureModule.h"

#include <gtest/gtest.h>

#include <exception>
#include <thread>

namespace welcomer::desktop {

namespace {

using fixtures::Visitor;
using fixtures::VisitorModule;

struct Counts {
    int created = 0;
    int ended = 0;
};

template <int number>
DesktopModule<VisitorModule<number>> moduleWith(Counts& counts, Visitor* local = nullptr) {
    return DesktopModule<VisitorModule<number>>(local, {&counts.created, &counts.ended},
                                                {nullptr, WELCOMER_FIXTURE_MODULES});
}

// What loading says about a module that cannot serve.
template <int number>
std::string reasonOf() {
    Counts counts;
    auto module = moduleWith<number>(counts);
    EXPECT_EQ(module.service(), nullptr);
    platform::BackendReport report{"Visitor", "local", "", ""};
    EXPECT_FALSE(module.describe(report));
    EXPECT_EQ(report.backend, "local");
    EXPECT_NE(report.advice, "");
    return report.reason;
}

} // namespace

TEST(DesktopModuleTest, NothingIsLoadedBeforeTheServiceIsAskedFor) {
    Counts counts;
    { const auto module = moduleWith<0>(counts); }
    EXPECT_EQ(counts.created, 0);
}

TEST(DesktopModuleTest, TheServiceIsMadeOnceForAllThreadsAndEndsWithTheModule) {
    Counts counts;
    {
        auto module = moduleWith<0>(counts);
        std::vector<Visitor*> seen(8);
        std::vector<std::thread> threads;
        for (Visitor*& service : seen) {
            threads.emplace_back([&module, &service] { service = module.service(); });
        }
        for (std::thread& thread : threads) {
            thread.join();
        }
        ASSERT_NE(seen.front(), nullptr);
        EXPECT_EQ(seen, std::vector<Visitor*>(8, seen.front()));
        EXPECT_EQ(counts.created, 1);
        EXPECT_EQ(counts.ended, 0);
    }
    EXPECT_EQ(counts.ended, 1);
}

TEST(DesktopModuleTest, ObjectsCrossBothWays) {
    Counts counts;
    auto module = moduleWith<0>(counts);
    ASSERT_NE(module.service(), nullptr);
    const std::string prefix = "a prefix that is too long for the string's own room: ";

    const auto echoed =
        module.service()->echo({"one", "two"}, [&](const std::string& word) { return prefix + word; });

    ASSERT_EQ(echoed.size(), 1U);
    EXPECT_EQ(echoed.begin()->second, (std::vector<std::string>{prefix + "one", prefix + "two"}));
    auto text = std::make_shared<std::string>("the program's text");
    EXPECT_EQ(module.service()->share(text), text);
    EXPECT_EQ(*text, "the program's text and the module's text, on the heap of both");
    EXPECT_EQ(text.use_count(), 1);
}

TEST(DesktopModuleTest, ExceptionsCrossBothWaysAndAreOver) {
    Counts counts;
    auto module = moduleWith<0>(counts);
    ASSERT_NE(module.service(), nullptr);
    std::string caught;
    try {
        module.service()->refuse();
    } catch (const fixtures::Refusal& refusal) {
        caught = refusal.what();
        EXPECT_EQ(std::uncaught_exceptions(), 0);
    }
    EXPECT_EQ(caught, "thrown in the module");
    EXPECT_EQ(module.service()->survive([] { throw fixtures::Refusal("thrown in the program"); }),
              "thrown in the program");
    EXPECT_EQ(std::uncaught_exceptions(), 0);
}

TEST(DesktopModuleTest, AModuleSpeaksForItself) {
    Counts counts;
    auto module = moduleWith<0>(counts);
    platform::BackendReport report{"Visitor", "local", "", ""};
    EXPECT_TRUE(module.describe(report));
    EXPECT_EQ(report.backend, "the module's own words");
    EXPECT_EQ(counts.created, 0);
}

TEST(DesktopModuleTest, AModuleWhoseServiceIsNotThereMakesNone) {
    Counts counts;
    auto module = moduleWith<1>(counts);
    EXPECT_EQ(module.service(), nullptr);
    EXPECT_EQ(module.service(), nullptr);
}

TEST(DesktopModuleTest, TheLocalServiceServesWhereTheModulesIsNotThereAndStandsBehindItElsewhere) {
    Counts counts;
    auto good = moduleWith<0>(counts);
    Visitor* const local = good.service();
    auto absent = moduleWith<1>(counts, local);
    EXPECT_EQ(absent.service(), local);
    auto stale = moduleWith<2>(counts, local);
    EXPECT_EQ(stale.service(), local);
    auto another = moduleWith<0>(counts, local);
    EXPECT_NE(another.service(), local);
    EXPECT_EQ(another.service()->behind(), local);
}

TEST(DesktopModuleTest, AModuleOfAnotherBuildIsRefused) {
    EXPECT_NE(reasonOf<2>().find("is of another build: another build"), std::string::npos);
}

TEST(DesktopModuleTest, ALibraryWithoutAnEntryIsNoModule) {
    EXPECT_NE(reasonOf<3>().find("is no module"), std::string::npos);
}

TEST(DesktopModuleTest, AModuleThatIsNotInstalledIsSaidToBeMissing) {
    EXPECT_EQ(reasonOf<4>(), "the module missing.so is not installed");
}

TEST(DesktopModuleTest, WhyWhatIsLocalServesIsLoggedOnceUnlessNobodyHasInstalledTheModules) {
    Counts counts;
    fakes::CallRecorder recorder;
    fakes::FakeSystemLog log(recorder);
    const Modules modules{&log, WELCOMER_FIXTURE_MODULES};
    DesktopModule<VisitorModule<0>> good(nullptr, {&counts.created, &counts.ended}, modules);
    DesktopModule<VisitorModule<1>> absent(nullptr, {&counts.created, &counts.ended}, modules);
    DesktopModule<VisitorModule<2>> stale(nullptr, {&counts.created, &counts.ended}, modules);
    DesktopModule<VisitorModule<4>> missing(nullptr, {&counts.created, &counts.ended}, modules);
    for (int i = 0; i < 2; ++i) {
        good.service();
        absent.service();
        stale.service();
        missing.service();
    }
    EXPECT_EQ(log.lines(),
              (std::vector<std::string>{
                  "The desktop's absent is not used, but what is local: the service is not there",
                  "The desktop's stale is not used, but what is local: " WELCOMER_FIXTURE_MODULES
                  "/stale.so is of another build: another build"}));
}

} // namespace welcomer::desktop
