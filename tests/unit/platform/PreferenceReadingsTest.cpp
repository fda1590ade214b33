#include "platform/PreferenceStore.h"

#include "tests/fakes/FakePreferenceStore.h"

#include <gtest/gtest.h>

#include <string>
#include <vector>

namespace welcomer::platform {
namespace {

TEST(StandardDefaults, AreTheDomainOfTheApplication) {
    fakes::CallRecorder recorder;
    fakes::FakePreferenceStore store(recorder);
    store.store("com.corvid.welcomer", "Number", 7);
    store.store("com.corvid.welcomer", "Flag", true);
    store.store("com.corvid.FirstRun", "Other", true);

    EXPECT_EQ(store.integerDefault("Number"), 7);
    EXPECT_TRUE(store.booleanDefault("Flag"));
    EXPECT_FALSE(store.booleanDefault("Other"));
    EXPECT_EQ(recorder.calls(), (std::vector<std::string>{
                                    "PreferenceStore.copyValue com.corvid.welcomer, Number",
                                    "PreferenceStore.copyValue com.corvid.welcomer, Flag",
                                    "PreferenceStore.copyValue com.corvid.welcomer, Other",
                                }));
}

} // namespace
} // namespace welcomer::platform
