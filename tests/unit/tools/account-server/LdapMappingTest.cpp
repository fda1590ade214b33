#include "tools/account-server/LdapMapping.h"

#include <gtest/gtest.h>

namespace welcomer::server {
namespace {

using accountserver::AuthenticateAnswer;
using accountserver::Problem;
using accountserver::ProblemType;
using Type = MappedMember::Type;

TEST(LdapFilter, ANameIsNothingButText) {
    EXPECT_EQ(filterFor("(uid=%u)", "anna"), "(uid=anna)");
    EXPECT_EQ(filterFor("(uid=%u)", "*"), "(uid=\\2a)");
    EXPECT_EQ(filterFor("(uid=%u)", "a)(uid=b"), "(uid=a\\29\\28uid=b)");
    EXPECT_EQ(filterFor("(uid=%u)", "a\\2a"), "(uid=a\\5c2a)");
    EXPECT_EQ(filterFor("(uid=%u)", std::string("a\0b", 3)), "(uid=a\\00b)");
    EXPECT_EQ(filterFor("(uid=%u)", "änna"), "(uid=änna)");
}

TEST(LdapFilter, ANameStandsWhereverItIsWantedAndIsNotLookedIntoAgain) {
    EXPECT_EQ(filterFor("(|(uid=%u)(mail=%u))", "a"), "(|(uid=a)(mail=a))");
    EXPECT_EQ(filterFor("(|(uid=%u)(mail=%u))", "%u"), "(|(uid=%u)(mail=%u))");
}

AuthenticateAnswer answer(const LdapAttributes& attributes, const std::vector<MappedMember>& members) {
    const auto result = answerOf("anna", attributes, members);
    const auto* const found = std::get_if<AuthenticateAnswer>(&result);
    EXPECT_TRUE(found) << (found ? "" : std::get<Problem>(result).detail);
    return found ? *found : AuthenticateAnswer();
}

Problem problem(const LdapAttributes& attributes, const std::vector<MappedMember>& members) {
    const auto result = answerOf("anna", attributes, members);
    const auto* const found = std::get_if<Problem>(&result);
    EXPECT_TRUE(found);
    return found ? *found : Problem();
}

TEST(LdapMapping, TermsThatAnAttributeHasTheNoteOfAreNotAskedForAgain) {
    const std::vector<MappedMember> members{{"", "3", {"accountError"}, Type::Integer},
                                            {"", "2026-10", {"errorInfo", "version"}, Type::Text}};
    const std::string note = noteOfTerms(PropertyList::Dictionary{{"version", "2026-10"}});
    EXPECT_EQ(note, R"({"version":"2026-10"})");
    const auto isAskedFor = [&](const LdapAttributes& attributes, const std::string& attribute) {
        return std::holds_alternative<Problem>(answerOf("anna", attributes, members, attribute));
    };
    EXPECT_TRUE(isAskedFor({}, "note"));
    EXPECT_FALSE(isAskedFor({{"note", {note}}}, "Note"));
    EXPECT_FALSE(isAskedFor({{"note", {"something else", note}}}, "note"));
    EXPECT_TRUE(isAskedFor({{"note", {R"({"version":"2026-09"})"}}}, "note"));
    EXPECT_TRUE(isAskedFor({{"note", {note}}}, "other"));
    EXPECT_TRUE(isAskedFor({{"note", {note}}}, ""));
}

TEST(LdapMapping, ANoteOfTermsTakesNoRepairAway) {
    const std::vector<MappedMember> members{{"", "5", {"accountError"}, Type::Integer},
                                            {"", "2026-10", {"errorInfo"}, Type::Text}};
    const auto result = answerOf("anna", {{"note", {"\"2026-10\""}}}, members, "note");
    EXPECT_EQ(std::get<Problem>(result).type, ProblemType::Repair);
}

TEST(LdapMapping, WithoutMembersAnAnswerSaysThatAllIsWell) {
    EXPECT_EQ(answer({}, {}), (AuthenticateAnswer{0, "anna", {}, {}, {}}));
}

TEST(LdapMapping, AttributesAndValuesBecomeMembersOfTheirTypes) {
    const AuthenticateAnswer found =
        answer({{"mail", {"a@x.example", "b@x.example"}}, {"alias", {"one", "two"}}, {"level", {"7"}}},
               {{"mail", "", {"mailAddress"}, Type::Text},
                {"Alias", "", {"delegates", "chat", "aliases"}, Type::Texts},
                {"level", "", {"delegates", "chat", "level"}, Type::Integer},
                {"", "TRUE", {"delegates", "chat", "on"}, Type::Boolean},
                {"", "false", {"services", "mail", "canBeEnabled"}, Type::Boolean},
                {"missing", "", {"delegates", "video", "name"}, Type::Text}});
    EXPECT_EQ(found.mailAddress, "a@x.example");
    EXPECT_EQ(
        found.delegates,
        (PropertyList::Dictionary{
            {"chat", PropertyList::Dictionary{
                         {"aliases", PropertyList::Array{"one", "two"}}, {"level", 7}, {"on", true}}}}));
    EXPECT_FALSE(found.services->at("mail").canBeEnabled);
}

TEST(LdapMapping, AnAccountErrorIsAProblemWithItsInfo) {
    const std::vector<MappedMember> members{{"error", "", {"accountError"}, Type::Integer},
                                            {"", "2026-10", {"errorInfo", "version"}, Type::Text}};
    EXPECT_EQ(problem({{"error", {"3"}}}, members).type, ProblemType::TermsOfService);
    EXPECT_EQ(problem({{"error", {"5"}}}, members).type, ProblemType::Repair);
    EXPECT_EQ(problem({{"error", {"5"}}}, members).errorInfo,
              PropertyList(PropertyList::Dictionary{{"version", "2026-10"}}));
    EXPECT_EQ(problem({{"error", {"9"}}}, members).type, ProblemType::ServerError);
    EXPECT_EQ(answer({{"error", {"0"}}}, members).status, 0);
    EXPECT_EQ(answer({}, members).status, 0);
}

TEST(LdapMapping, MembersThatMakeNoAnswerAreNamed) {
    EXPECT_NE(problem({{"level", {"high"}}}, {{"level", "", {"status"}, Type::Integer}})
                  .detail.find("level/status"),
              std::string::npos);
    EXPECT_NE(problem({}, {{"", "x", {"delegates"}, Type::Text}}).detail.find("delegates"),
              std::string::npos);
    EXPECT_EQ(problem({}, {{"", "x", {"accountID", "more"}, Type::Text}}).type, ProblemType::ServerError);
    EXPECT_EQ(
        problem({{"photo", {"\xff\xfe"}}}, {{"photo", "", {"delegates", "a", "photo"}, Type::Text}}).type,
        ProblemType::ServerError);
}

} // namespace
} // namespace welcomer::server
