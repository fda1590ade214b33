#include "tools/account-server/DirectorySource.h"

#include "platform/AccountService.h"
#include "tests/contract/TemporaryRoot.h"

#include <gtest/gtest.h>

#include <sys/stat.h>

namespace welcomer::server {
namespace {

using accountserver::AuthenticateAnswer;
using accountserver::Problem;
using accountserver::ProblemType;

class FakeSignInDirectory final : public platform::SignInDirectory {
  public:
    platform::SignInAnswer answer(const std::string& /*username*/, const std::string& /*password*/,
                                  const PropertyList::Dictionary& /*delegateRequest*/) const override {
        return given;
    }
    platform::SignInAnswer acceptTerms(const std::string& /*username*/, const std::string& /*password*/,
                                       const PropertyList& /*terms*/) const override {
        return {};
    }
    std::string server() const override { return ""; }
    PropertyList::Dictionary servicesOfNewAccount(const std::string& /*username*/) const override {
        return services;
    }
    std::optional<std::vector<std::string>> userNames() const override { return std::nullopt; }

    platform::SignInAnswer given;
    PropertyList::Dictionary services;
};

class DirectorySourceTest : public testing::Test {
  protected:
    void failWith(std::int64_t error, std::optional<PropertyList> info = {}) {
        directory.given = {false, {{platform::kSKPropertyAccountError, error}}, 0};
        if (info) {
            directory.given.contents[platform::kSKPropertyAccountErrorInfo] = *info;
        }
    }
    Problem problem() { return std::get<Problem>(source.authenticate("anna", "x").content); }
    AuthenticateAnswer answer() {
        return std::get<AuthenticateAnswer>(source.authenticate("anna", "x").content);
    }

    FakeSignInDirectory directory;
    TemporaryRoot root;
    DirectorySource source{directory, AcceptedTerms(root.path())};
};

TEST_F(DirectorySourceTest, AnAnswerHasTheStatusTheDelegatesAndTheServices) {
    directory.given = {true, {{"status", 2}, {"delegates", PropertyList::Dictionary{{"a", 1}}}}, 1.5};
    directory.services = {
        {"mail", PropertyList::Dictionary{{"Properties", PropertyList::Dictionary{{"p", "v"}}}}},
        {"notes", PropertyList::Dictionary{{"CanBeEnabled", false}}}};
    EXPECT_EQ(answer().status, 2);
    EXPECT_EQ(answer().accountID, "anna");
    EXPECT_EQ(answer().delegates, (PropertyList::Dictionary{{"a", 1}}));
    EXPECT_EQ(answer().services->at("mail"), (accountserver::AccountServiceEntry{true, {{"p", "v"}}}));
    EXPECT_FALSE(answer().services->at("notes").canBeEnabled);
    EXPECT_EQ(source.authenticate("anna", "x").delay.count(), 1.5);
}

TEST_F(DirectorySourceTest, EachAccountErrorIsAProblemOfItsOwn) {
    const std::pair<std::int64_t, ProblemType> expected[] = {
        {1, ProblemType::WrongPassword}, {2, ProblemType::UnknownUser}, {3, ProblemType::TermsOfService},
        {4, ProblemType::Unavailable},   {5, ProblemType::Repair},      {77, ProblemType::ServerError}};
    for (const auto& [error, type] : expected) {
        failWith(error, "info");
        EXPECT_EQ(problem().type, type);
        EXPECT_EQ(problem().errorInfo, PropertyList("info"));
    }
    directory.given = {false, {}, 0};
    EXPECT_EQ(problem().type, ProblemType::ServerError);
}

TEST_F(DirectorySourceTest, AFailureWithoutAnErrorCountsAsASuccess) {
    failWith(0);
    EXPECT_EQ(answer().status, 0);
}

TEST_F(DirectorySourceTest, TermsThatWereAcceptedAreNotAskedForAgainAndOthersAre) {
    failWith(3, "October");
    EXPECT_EQ(problem().type, ProblemType::TermsOfService);
    const auto other = source.acceptTerms("anna", "x", "September");
    EXPECT_EQ(std::get<Problem>(other.content).type, ProblemType::OtherTerms);
    EXPECT_EQ(std::get<Problem>(other.content).errorInfo, PropertyList("October"));
    for (int i = 0; i < 2; ++i) {
        EXPECT_TRUE(
            std::holds_alternative<AuthenticateAnswer>(source.acceptTerms("anna", "x", "October").content));
    }
    EXPECT_EQ(answer().status, 0);
    EXPECT_EQ(std::get<Problem>(source.authenticate("bert", "x").content).type, ProblemType::TermsOfService);
    failWith(3, "November");
    EXPECT_EQ(problem().errorInfo, PropertyList("November"));
}

TEST_F(DirectorySourceTest, AWrongPasswordAcceptsNothing) {
    failWith(1);
    EXPECT_EQ(std::get<Problem>(source.acceptTerms("anna", "x", "October").content).type,
              ProblemType::WrongPassword);
    failWith(3, "October");
    EXPECT_EQ(problem().type, ProblemType::TermsOfService);
}

TEST_F(DirectorySourceTest, WithoutAPlaceToNoteThemTermsCannotBeAccepted) {
    DirectorySource without(directory, AcceptedTerms(""));
    failWith(3, "October");
    EXPECT_EQ(std::get<Problem>(without.acceptTerms("anna", "x", "October").content).type,
              ProblemType::NotSupported);
}

TEST_F(DirectorySourceTest, WhatWasAcceptedIsReadableByTheServerAlone) {
    failWith(3, "October");
    source.acceptTerms("anna", "x", "October");
    struct stat status = {};
    ASSERT_EQ(::stat((root.path() + "/accepted-terms.plist").c_str(), &status), 0);
    EXPECT_EQ(status.st_mode & 0777U, 0600U);
}

} // namespace
} // namespace welcomer::server
