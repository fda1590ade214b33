#include "platform/CredentialStore.h"

#include <gtest/gtest.h>

#include <set>
#include <string>

namespace welcomer::platform {

namespace {

constexpr std::int32_t kNotAsked[] = {
    kCredentialNoBus,          kCredentialFindTimedOut, kCredentialCreateTimedOut, kCredentialReadTimedOut,
    kCredentialDeleteTimedOut, kCredentialStartFailed,  kCredentialBusDied};

} // namespace

TEST(CredentialStatusTest, EachWayOfNotBeingAskedHasATextOfItsOwnThatSaysSo) {
    std::set<std::string> texts;
    for (const std::int32_t status : kNotAsked) {
        const std::string text = credentialStatusText(status);
        EXPECT_TRUE(text.starts_with("the keyring could not be asked")) << text;
        EXPECT_TRUE(credentialServiceWasNotAsked(status));
        texts.insert(text);
    }
    EXPECT_EQ(texts.size(), std::size(kNotAsked));
}

TEST(CredentialStatusTest, ATimeOutSaysWhichOperationItWas) {
    const std::pair<std::int32_t, const char*> operations[] = {{kCredentialFindTimedOut, "for the item:"},
                                                               {kCredentialCreateTimedOut, "create"},
                                                               {kCredentialReadTimedOut, "attributes"},
                                                               {kCredentialDeleteTimedOut, "delete"}};
    for (const auto& [status, operation] : operations) {
        EXPECT_NE(credentialStatusText(status).find(operation), std::string::npos);
    }
}

TEST(CredentialStatusTest, WhatIsKnownOfAServiceIsNotThat) {
    for (const std::int32_t status :
         {kCredentialSuccess, kCredentialItemNotFound, kCredentialLocked, kCredentialDismissed,
          kCredentialPromptUnanswered, kCredentialNoService, kCredentialServiceFailed}) {
        EXPECT_FALSE(credentialServiceWasNotAsked(status)) << status;
    }
}

} // namespace welcomer::platform
