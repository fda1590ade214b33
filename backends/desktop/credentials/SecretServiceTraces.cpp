#include "backends/desktop/credentials/SecretServiceTraces.h"

#include "backends/posix/Directory.h"
#include "platform/Error.h"
#include "platform/Path.h"

#include <algorithm>
#include <array>
#include <fcntl.h>
#include <string>
#include <string_view>
#include <sys/stat.h>

namespace welcomer::desktop {

namespace {

constexpr char kServiceFile[] = "dbus-1/services/org.freedesktop.secrets.service";

struct KeyringFiles {
    const char* folder;
    const char* extension;
};
constexpr std::array<KeyringFiles, 2> kKeyringFiles = {{{"keyrings", ".keyring"}, {"kwalletd", ".kwl"}}};

// A file with nothing in it names no service.
bool isServiceFile(const posix::RootFolder& root, const std::string& path) {
    const posix::FileDescriptor file = root.open(path, O_PATH);
    struct stat status = {};
    return file && ::fstat(file.get(), &status) == 0 && S_ISREG(status.st_mode) && status.st_size > 0;
}

bool hasFileOfKind(const posix::RootFolder& root, const std::string& folder, std::string_view extension) {
    const auto names = posix::listDirectory(root.open(folder, O_RDONLY | O_DIRECTORY));
    return names && std::any_of(names->begin(), names->end(),
                                [extension](const std::string& name) { return name.ends_with(extension); });
}

} // namespace

bool hasSecretServiceTraces(const posix::RootFolder& root, platform::ProcessIdentity& identity) {
    std::string own;
    try {
        own = platform::joinPath(identity.homeDirectory(), ".local/share");
    } catch (const platform::Exception&) {
        return false; // a user without a home has no keyring
    }
    for (const std::string& folder : {own, std::string("/usr/local/share"), std::string("/usr/share")}) {
        if (isServiceFile(root, platform::joinPath(folder, kServiceFile))) {
            return true;
        }
    }
    for (const KeyringFiles& files : kKeyringFiles) {
        if (hasFileOfKind(root, platform::joinPath(own, files.folder), files.extension)) {
            return true;
        }
    }
    return false;
}

} // namespace welcomer::desktop
