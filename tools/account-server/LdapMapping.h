// What an entry of an LDAP directory says of a user, in the protocol's terms.

#pragma once

#include "backends/accountserver/Messages.h"
#include "tools/account-server/Settings.h"

#include <map>
#include <string>
#include <string_view>
#include <variant>
#include <vector>

namespace welcomer::server {

// A filter with a user's name in the place of each "%u": whatever the name holds, it is nothing but text there.
// Any thread.
std::string filterFor(std::string_view filter, std::string_view user);

// The values of an entry's attributes, by their names in lower case.
using LdapAttributes = std::map<std::string, std::vector<std::string>>;

// What a user with this entry is answered, whose password is right. A member whose attribute the entry does not
// have is left out. The members are those of an answer, and besides
//     accountError  an integer: has the user accept terms (3) or be told of a repair (5) first
//     errorInfo     goes with it
// Members that make no answer are a problem that says what is wrong with them. Any thread.
//  termsAttribute  where the terms are noted that the user has accepted: these are not asked for; may be empty
std::variant<accountserver::AuthenticateAnswer, accountserver::Problem>
answerOf(const std::string& user, const LdapAttributes& attributes, const std::vector<MappedMember>& members,
         const std::string& termsAttribute = {});

// The value of that attribute for terms: JSON, which administrators can read. Any thread.
std::string noteOfTerms(const PropertyList& terms);

} // namespace welcomer::server
