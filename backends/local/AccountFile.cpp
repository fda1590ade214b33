#include "backends/local/AccountFile.h"

#include "platform/Path.h"

namespace welcomer::local {

namespace {

using State = PreferenceFileContent::State;

constexpr char kFolderName[] = "Accounts";
constexpr char kFileName[] = "Accounts.plist";

} // namespace

std::vector<std::string> AccountFile::names() {
    return ask([](const PropertyList::Dictionary& content) {
        std::vector<std::string> names;
        const auto accounts = content.find(kAccountsKey);
        if (accounts != content.end() && accounts->second.isDictionary()) {
            for (const auto& [name, account] : *accounts->second.dictionary()) {
                if (account.isDictionary()) {
                    names.push_back(name);
                }
            }
        }
        return names;
    });
}

bool AccountFile::change(const std::function<bool(PropertyList::Dictionary& content)>& change) {
    const std::string path = _folder();
    const std::lock_guard lock(_mutex);
    const LockedPreferenceFolder folder(path);
    if (!folder) {
        return false;
    }
    rereadPreferenceFile(platform::joinPath(path, kFileName), _onDisk);
    switch (_onDisk.state) {
    case State::Whole:
        break;
    case State::Damaged:
        if (folder.setAside(kFileName, _onDisk.bytes).empty()) {
            return false;
        }
        _onDisk = {};
        break;
    case State::Unreadable:
        return false;
    }
    PropertyList::Dictionary values = _onDisk.values;
    if (!change(values)) {
        return false;
    }
    std::optional<std::string> bytes = folder.write(kFileName, values);
    if (!bytes) {
        return false;
    }
    _onDisk = {State::Whole, std::move(values), std::move(*bytes), {}};
    return true;
}

const PropertyList::Dictionary& AccountFile::_readContent() {
    if (!_path) {
        _path = platform::joinPath(_folder(), kFileName);
    }
    rereadPreferenceFile(*_path, _onDisk);
    return _onDisk.values;
}

// Makes the library folder where it is missing: the platform gives the library folder without a "~".
std::string AccountFile::_folder() {
    return _root.locate(platform::joinPath(_identity.userLibraryDirectories().front(), kFolderName));
}

} // namespace welcomer::local
