#include "backends/desktop/SecretServiceTraces.h"

#include "platform/Error.h"
#include "platform/Path.h"

#include <array>
#include <filesystem>
#include <optional>
#include <string>
#include <system_error>

namespace welcomer::desktop {

namespace {

constexpr char kServiceFile[] = "dbus-1/services/org.freedesktop.secrets.service";

struct KeyringFiles {
    const char* folder;
    const char* extension;
};
constexpr std::array<KeyringFiles, 2> kKeyringFiles = {{{"keyrings", ".keyring"}, {"kwalletd", ".kwl"}}};

// A file with nothing in it names no service.
bool isServiceFile(const local::RootFolder& root, const std::string& path) {
    const std::optional<std::string> found = root.resolve(path);
    std::error_code error;
    return found && std::filesystem::is_regular_file(*found, error) &&
           std::filesystem::file_size(*found, error) > 0;
}

bool hasFileOfKind(const local::RootFolder& root, const std::string& folder, const char* extension) {
    const std::optional<std::string> found = root.resolve(folder);
    if (!found) {
        return false;
    }
    std::error_code error;
    std::filesystem::directory_iterator file(*found, error);
    for (; !error && file != std::filesystem::directory_iterator(); file.increment(error)) {
        if (file->path().extension() == extension) {
            return true;
        }
    }
    return false;
}

} // namespace

bool hasSecretServiceTraces(const local::RootFolder& root, platform::ProcessIdentity& identity) {
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
