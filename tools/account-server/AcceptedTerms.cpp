#include "tools/account-server/AcceptedTerms.h"

#include "backends/posix/AtomicFile.h"
#include "backends/posix/FileContent.h"
#include "backends/posix/FileLock.h"
#include "backends/posix/RootFolder.h"
#include "backends/posix/SystemError.h"
#include "propertylist/Lookup.h"
#include "propertylist/PropertyListReader.h"
#include "propertylist/PropertyListWriter.h"

#include <cerrno>
#include <utility>

namespace welcomer::server {

namespace {

constexpr char kFile[] = "accepted-terms.plist";
constexpr char kLock[] = "locks/accepted-terms";
constexpr std::size_t kMaximumFileSize = std::size_t{16} * 1024 * 1024;
constexpr mode_t kMode = 0600;

const posix::RootFolder& machine() {
    static const posix::RootFolder root("/");
    return root;
}

} // namespace

PropertyList::Dictionary AcceptedTerms::_read() const {
    std::string bytes;
    if (!canBeNoted() || posix::readFile(machine(), _folder + "/" + kFile, bytes, kMaximumFileSize) != 0) {
        return {};
    }
    PropertyListReadResult read = readPropertyList(bytes);
    PropertyList::Dictionary* const users = read ? read.value->dictionary() : nullptr;
    return users ? std::move(*users) : PropertyList::Dictionary();
}

bool AcceptedTerms::has(const std::string& user, const PropertyList& terms) const {
    const PropertyList::Dictionary users = _read();
    const PropertyList* const accepted = valueIn(users, user);
    return accepted && *accepted == terms;
}

platform::Outcome AcceptedTerms::add(const std::string& user, const PropertyList& terms) const {
    const posix::FileLock lock(machine(), _folder + "/" + kLock);
    if (!lock) {
        return platform::Outcome::failure(lock.error());
    }
    PropertyList::Dictionary users = _read();
    if (const PropertyList* const accepted = valueIn(users, user); accepted && *accepted == terms) {
        return platform::Outcome::success();
    }
    users.insert_or_assign(user, terms);
    std::string why;
    const auto bytes = writeXMLPropertyList(users, &why);
    if (!bytes) {
        return platform::Outcome::failure({0, why});
    }
    const posix::FileDescriptor folder = machine().open(_folder, O_RDONLY | O_DIRECTORY);
    return posix::systemOutcome("cannot write " + _folder + "/" + kFile,
                                folder ? posix::replaceFile(folder.get(), kFile, *bytes, kMode) : errno);
}

} // namespace welcomer::server
