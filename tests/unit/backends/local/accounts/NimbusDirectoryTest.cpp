// Accepting the terms of service with the machine's own directory.

#include "backends/local/accounts/NimbusDirectory.h"

#include "tests/unit/backends/local/accounts/LocalAccountServiceFixture.h"

namespace welcomer {
namespace {

class NimbusDirectoryTest : public LocalAccountServiceTest {
  protected:
    SignInAnswer accept(const PropertyList& terms, const std::string& password = "secret") const {
        return directory.acceptTerms("anna", password, terms);
    }
    Dictionary answer() const { return directory.answer("anna", "secret", {}).contents; }

    const local::NimbusDirectory directory{posix::RootFolder(root.path())};
};

TEST_F(NimbusDirectoryTest, AcceptedTermsAreAskedForNoMoreAndMayBeAcceptedOnceMore) {
    addUser("anna", {{"AccountError", 3}, {"AccountErrorInfo", "v2"}, {"MailAddress", "a@example.org"}});
    EXPECT_EQ(answer().at(kSKPropertyAccountError), PropertyList(3));
    EXPECT_TRUE(accept("v2").isCompleted);
    EXPECT_TRUE(directory.answer("anna", "secret", {}).isCompleted);
    EXPECT_FALSE(answer().contains(kSKPropertyAccountErrorInfo));
    EXPECT_TRUE(accept("v2").isCompleted);
}

TEST_F(NimbusDirectoryTest, OtherTermsThanTheUsersAreNotAccepted) {
    addUser("anna", {{"AccountError", 3}, {"AccountErrorInfo", "v2"}});
    const SignInAnswer refused = accept("v1");
    EXPECT_FALSE(refused.isCompleted);
    EXPECT_EQ(refused.contents,
              (Dictionary{{kSKPropertyAccountError, 3}, {kSKPropertyAccountErrorInfo, "v2"}}));
    EXPECT_EQ(answer().at(kSKPropertyAccountError), PropertyList(3));
}

TEST_F(NimbusDirectoryTest, AcceptingTakesNoOtherAccountErrorAndNoWrongPassword) {
    addUser("anna", {{"AccountError", 5}, {"AccountErrorInfo", "v2"}});
    EXPECT_TRUE(accept("v2").isCompleted);
    EXPECT_EQ(answer().at(kSKPropertyAccountError), PropertyList(5));
    EXPECT_EQ(accept("v2", "wrong").contents.at(kSKPropertyAccountError),
              PropertyList(kSKAccountErrorWrongPassword));
    EXPECT_EQ(directory.acceptTerms("bert", "secret", "v2").contents.at(kSKPropertyAccountError),
              PropertyList(kSKAccountErrorUnknownUser));
}

} // namespace
} // namespace welcomer
