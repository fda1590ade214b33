#include "tools/account-server/Settings.h"

#include <gtest/gtest.h>

namespace welcomer::server {
namespace {

using namespace std::chrono_literals;
using Problems = std::vector<std::string>;

TEST(AccountServerSettings, NothingSetIsTheDirectoryFileWithoutACertificate) {
    const SettingsText read = readSettings("# nothing\n\n; else\n");
    EXPECT_EQ(read.problems, Problems());
    EXPECT_EQ(read.settings.source, Settings::Source::Directory);
    EXPECT_TRUE(read.settings.certificate.empty());
    EXPECT_FALSE(read.settings.tellsUnknownUsers);
    EXPECT_FALSE(read.settings.trustsLoopback);
    EXPECT_EQ(read.settings.headLimit, 10s);
}

TEST(AccountServerSettings, EverySettingIsReadWithBlanksAroundIt) {
    const SettingsText read =
        readSettings(" Source = ldap \nCertificate=/a/c.pem\nKey=/a/k.pem\r\nFronts=www-data loopback\n"
                     "Users=anna  bert\nUnknownUsers=told\nWorkers=7\nQueue=0\nConnections=9\n"
                     "HeadSeconds=1\nBodySeconds=2\nAnswerSeconds=3\nIdleSeconds=4\nStopSeconds=5\n");
    EXPECT_EQ(read.problems, Problems{"Source=ldap needs LdapServers"});
    const Settings& settings = read.settings;
    EXPECT_EQ(settings.source, Settings::Source::LDAP);
    EXPECT_EQ(settings.certificate, "/a/c.pem");
    EXPECT_EQ(settings.key, "/a/k.pem");
    EXPECT_EQ(settings.fronts, Problems{"www-data"});
    EXPECT_TRUE(settings.trustsLoopback);
    EXPECT_EQ(settings.users, (Problems{"anna", "bert"}));
    EXPECT_TRUE(settings.tellsUnknownUsers);
    EXPECT_EQ(settings.workers, 7U);
    EXPECT_EQ(settings.queue, 0U);
    EXPECT_EQ(settings.connections, 9U);
    EXPECT_EQ(settings.headLimit, 1s);
    EXPECT_EQ(settings.bodyLimit, 2s);
    EXPECT_EQ(settings.answerLimit, 3s);
    EXPECT_EQ(settings.idleLimit, 4s);
    EXPECT_EQ(settings.stopLimit, 5s);
}

TEST(AccountServerSettings, WhatMakesNoSenseIsToldWithItsLine) {
    EXPECT_EQ(readSettings("\nSource\n").problems, Problems{"line 2: this is no setting: there is no \"=\""});
    EXPECT_EQ(readSettings("Sauce=ldap\n").problems, Problems{"line 1: there is no such setting"});
    EXPECT_EQ(readSettings("Source=files\n").problems,
              Problems{"line 1: Source is not `directory` or `ldap`"});
    for (const std::string value : {"0", "257", "-1", "7 ", "x", "", "7x"}) {
        EXPECT_EQ(readSettings("Workers=" + value).problems.empty(), value == "7 ") << value;
    }
    for (const std::string value : {"0", "3601", "", "1s"}) {
        EXPECT_EQ(readSettings("BodySeconds=" + value).problems,
                  Problems{"line 1: BodySeconds is not a number of seconds from 1 to 3600"});
    }
    EXPECT_EQ(readSettings("Certificate=c.pem").problems.front(),
              "line 1: Certificate is not the path of a file, which begins with /");
}

TEST(AccountServerSettings, WhatBelongsTogetherIsAskedForTogether) {
    EXPECT_EQ(readSettings("Certificate=/c").problems, Problems{"Certificate and Key belong together"});
    EXPECT_EQ(readSettings("LdapSearchName=cn=a").problems,
              Problems{"LdapSearchName and LdapSearchPasswordFile belong together"});
}

TEST(AccountServerSettings, TheServersOfADirectoryKeepTheirOrder) {
    const SettingsText read =
        readSettings("Source=ldap\nLdapServers=ldap://b.example ldaps://a.example:636 ldapi:///\n"
                     "LdapBase=dc=example\nLdapFilter=(mail=%u)\nLdapSeconds=2\nLdapAuthority=/ca\n"
                     "LdapTermsAttribute=acceptedTerms\n");
    EXPECT_EQ(read.settings.ldap.termsAttribute, "acceptedTerms");
    EXPECT_EQ(read.problems, Problems());
    EXPECT_EQ(read.settings.ldap.servers,
              (Problems{"ldap://b.example", "ldaps://a.example:636", "ldapi:///"}));
    EXPECT_EQ(read.settings.ldap.base, "dc=example");
    EXPECT_EQ(read.settings.ldap.filter, "(mail=%u)");
    EXPECT_EQ(read.settings.ldap.limit, 2s);
    EXPECT_EQ(read.settings.ldap.authority, "/ca");
    EXPECT_FALSE(readSettings("LdapServers=http://a").problems.empty());
    EXPECT_FALSE(readSettings("LdapFilter=(mail=anna)").problems.empty());
    EXPECT_FALSE(readSettings("LdapTermsAttribute=two words").problems.empty());
}

TEST(AccountServerSettings, AttributesAndValuesLeadToMembersOfTheirType) {
    using Type = MappedMember::Type;
    const SettingsText read = readSettings("LdapAttribute=mail mailAddress\n"
                                           "LdapAttribute=mailAlias delegates/com.corvid.chatter/aliases[]\n"
                                           "LdapAttribute=code status:integer\n"
                                           "LdapValue=delegates/com.corvid.chatter/on:boolean TRUE\n"
                                           "LdapValue=delegates/com.corvid.reader/greeting Hello there\n");
    EXPECT_EQ(read.problems, Problems());
    const auto& members = read.settings.ldap.members;
    ASSERT_EQ(members.size(), 5U);
    EXPECT_EQ(members[0].attribute, "mail");
    EXPECT_EQ(members[0].path, Problems{"mailAddress"});
    EXPECT_EQ(members[0].type, Type::Text);
    EXPECT_EQ(members[1].path, (Problems{"delegates", "com.corvid.chatter", "aliases"}));
    EXPECT_EQ(members[1].type, Type::Texts);
    EXPECT_EQ(members[2].type, Type::Integer);
    EXPECT_EQ(members[3].type, Type::Boolean);
    EXPECT_EQ(members[3].value, "TRUE");
    EXPECT_EQ(members[4].value, "Hello there");
    for (const std::string line :
         {"LdapAttribute=mail", "LdapAttribute=mail a//b", "LdapAttribute=mail a:real",
          "LdapAttribute=mail a[]:integer", "LdapAttribute=mail /", "LdapValue=status:integer"}) {
        EXPECT_EQ(readSettings(line).problems.size(), 1U) << line;
    }
}

} // namespace
} // namespace welcomer::server
