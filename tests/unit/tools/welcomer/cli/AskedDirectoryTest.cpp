// A directory of who can sign in that is asked over a socket, and what the one who answers lets through.

#include "tools/welcomer/cli/AskedDirectory.h"

#include "platform/AccountService.h"

#include <gtest/gtest.h>

#include <array>
#include <sys/socket.h>
#include <thread>

namespace welcomer::tool {
namespace {

using Dictionary = PropertyList::Dictionary;

struct FixedDirectory final : platform::SignInDirectory {
    platform::SignInAnswer answer(const std::string& username, const std::string& password,
                                  const Dictionary& delegateRequest) const override {
        return {password == "se\x01\xffret",
                {{"user", PropertyList::Data{username}}, {"asked", delegateRequest}, {"more", more}},
                2.5};
    }
    platform::SignInAnswer acceptTerms(const std::string& username, const std::string& password,
                                       const PropertyList& terms) const override {
        return {password == "se\x01\xffret", {{"user", PropertyList::Data{username}}, {"terms", terms}}, 0};
    }
    std::string server() const override { return "https://accounts.example"; }
    Dictionary servicesOfNewAccount(const std::string& username) const override { return {{"of", username}}; }
    std::optional<std::vector<std::string>> userNames() const override { return names; }

    PropertyList more = 1;
    std::optional<std::vector<std::string>> names;
};

class AskedDirectoryTest : public testing::Test {
  protected:
    AskedDirectoryTest() {
        std::array<int, 2> sockets = {};
        EXPECT_EQ(::socketpair(AF_UNIX, SOCK_STREAM | SOCK_CLOEXEC, 0, sockets.data()), 0);
        answering = posix::FileDescriptor(sockets[0]);
        asking = posix::FileDescriptor(sockets[1]);
    }
    ~AskedDirectoryTest() override {
        asked.reset(); // which ends the other's work
        if (other.joinable()) {
            other.join();
        }
    }

    AskedDirectory& ask() {
        other = std::thread([this] { answerQuestions(answering.get(), directory); });
        asked = std::make_unique<AskedDirectory>(std::move(asking));
        return *asked;
    }

    posix::FileDescriptor answering;
    posix::FileDescriptor asking;
    FixedDirectory directory;
    std::unique_ptr<AskedDirectory> asked;
    std::thread other;
};

TEST_F(AskedDirectoryTest, TheAnswerIsTheOthersWhateverTheNameAndThePasswordAre) {
    const AskedDirectory& client = ask();
    for (const std::string name : {"anna", "an\x01na\xff", ""}) {
        const platform::SignInAnswer answer = client.answer(name, "se\x01\xffret", {});
        EXPECT_TRUE(answer.isCompleted);
        EXPECT_EQ(answer.contents,
                  (Dictionary{{"user", PropertyList::Data{name}}, {"asked", Dictionary{}}, {"more", 1}}));
        EXPECT_EQ(answer.delaySeconds, 2.5);
    }
    EXPECT_FALSE(client.answer("anna", "other", {}).isCompleted);
    EXPECT_EQ(client.servicesOfNewAccount("anna"), (Dictionary{{"of", "anna"}}));
}

TEST_F(AskedDirectoryTest, TheRequestTheTermsAndTheServerArePassedOn) {
    const AskedDirectory& client = ask();
    const Dictionary request{{"delegates", Dictionary{{"org.example.notes", Dictionary{{"n", 1.5}}}}}};
    EXPECT_EQ(client.answer("anna", "se\x01\xffret", request).contents.at("asked"), PropertyList(request));
    const platform::SignInAnswer accepted = client.acceptTerms("anna", "se\x01\xffret", "v2");
    EXPECT_TRUE(accepted.isCompleted);
    EXPECT_EQ(accepted.contents, (Dictionary{{"user", PropertyList::Data{"anna"}}, {"terms", "v2"}}));
    EXPECT_FALSE(client.acceptTerms("anna", "other", 1).isCompleted);
    EXPECT_EQ(client.server(), "https://accounts.example");
}

TEST_F(AskedDirectoryTest, NamesNobodyAndNotKnowingThemAreThreeAnswers) {
    const AskedDirectory& client = ask();
    EXPECT_EQ(client.userNames(), std::nullopt);
    directory.names.emplace();
    EXPECT_EQ(client.userNames(), directory.names);
    directory.names = {{"anna", "b\x02rt"}};
    EXPECT_EQ(client.userNames(), directory.names);
}

TEST_F(AskedDirectoryTest, ALongAnswerArrivesWhole) {
    directory.more = std::string(3'000'000, 'x');
    const platform::SignInAnswer answer = ask().answer("anna", "se\x01\xffret", {});
    ASSERT_TRUE(answer.contents.contains("more"));
    EXPECT_EQ(answer.contents.at("more"), directory.more);
}

TEST_F(AskedDirectoryTest, WhatCannotBeHandedOnIsAServerThatCannotBeAsked) {
    directory.more = "\x01";
    const platform::SignInAnswer answer = ask().answer("anna", "se\x01\xffret", {});
    EXPECT_FALSE(answer.isCompleted);
    EXPECT_EQ(answer.contents.at(platform::kSKPropertyAccountError),
              PropertyList(platform::kSKAccountErrorServerUnavailable));
}

TEST_F(AskedDirectoryTest, SoIsOneWhoHasGone) {
    answering = posix::FileDescriptor();
    const AskedDirectory client(std::move(asking));
    EXPECT_EQ(client.answer("anna", "se\x01\xffret", {}).contents.at(platform::kSKPropertyAccountError),
              PropertyList(platform::kSKAccountErrorServerUnavailable));
    EXPECT_EQ(client.userNames(), std::nullopt);
    EXPECT_EQ(client.servicesOfNewAccount("anna"), Dictionary());
}

TEST_F(AskedDirectoryTest, WhatMakesNoSenseEndsTheAnswers) {
    const std::string tooLong = "\xff\xff\xff\xff";
    ASSERT_EQ(::send(asking.get(), tooLong.data(), tooLong.size(), 0), 4);
    answerQuestions(answering.get(), directory); // returns although the other end is open
    const std::string noList("\x03\x00\x00\x00<x>", 7);
    ASSERT_EQ(::send(asking.get(), noList.data(), noList.size(), 0), 7);
    answerQuestions(answering.get(), directory);
    char byte = 0;
    EXPECT_LT(::recv(asking.get(), &byte, 1, MSG_DONTWAIT), 0) << "nothing was answered";
}

} // namespace
} // namespace welcomer::tool
