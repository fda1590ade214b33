// What the password database knows of a user.

#pragma once

#include <optional>
#include <string>
#include <sys/types.h>

namespace welcomer::posix {

struct PasswordEntry {
    std::string name;
    uid_t userID = 0;
    gid_t groupID = 0;
    std::string home;
    std::string shell;
};

// The entry of a user.
//  error   receives 0 where the database has none, else why it could not be asked
//  result  none where there is none
// Any thread.
std::optional<PasswordEntry> passwordEntryOf(uid_t userID, int& error);
std::optional<PasswordEntry> passwordEntryNamed(const std::string& name, int& error);

} // namespace welcomer::posix
