#include "backends/local/AccountFile.h"

#include "backends/local/PreferenceFile.h"
#include "platform/Path.h"

namespace welcomer::local {

namespace {

constexpr char kFolderName[] = "Accounts";
constexpr char kFileName[] = "Accounts.plist";

} // namespace

PropertyList::Dictionary AccountFile::read() {
    return readPreferenceFile(platform::joinPath(_folder(), kFileName)).values;
}

std::vector<std::string> AccountFile::names() {
    std::vector<std::string> names;
    const PropertyList::Dictionary content = read();
    const auto accounts = content.find(kAccountsKey);
    if (accounts != content.end() && accounts->second.isDictionary()) {
        for (const auto& [name, account] : *accounts->second.dictionary()) {
            if (account.isDictionary()) {
                names.push_back(name);
            }
        }
    }
    return names;
}

bool AccountFile::change(const std::function<bool(PropertyList::Dictionary& content)>& change) {
    const std::string path = _folder();
    const LockedPreferenceFolder folder(path);
    if (!folder) {
        return false;
    }
    PreferenceFileContent content = readPreferenceFile(platform::joinPath(path, kFileName));
    switch (content.state) {
    case PreferenceFileContent::State::Whole:
        break;
    case PreferenceFileContent::State::Damaged:
        if (folder.setAside(kFileName, content.bytes).empty()) {
            return false;
        }
        break;
    case PreferenceFileContent::State::Unreadable:
        return false;
    }
    return change(content.values) && folder.write(kFileName, content.values);
}

// The platform gives the library folder without a "~".
std::string AccountFile::_folder() {
    return _root.locate(platform::joinPath(_identity.userLibraryDirectories().front(), kFolderName));
}

} // namespace welcomer::local
