// What the tests of preferences in files share.

#pragma once

#include "backends/local/preferences/LocalPreferenceStore.h"
#include "propertylist/PropertyListReader.h"
#include "tests/contract/TemporaryRoot.h"
#include "tests/fakes/FakeFileSystem.h"
#include "tests/fakes/FakeProcessIdentity.h"
#include "tests/fakes/FakeSystemLog.h"
#include "tests/support/ChildProcess.h"

#include <gtest/gtest.h>
#include <string>
#include <sys/stat.h>
#include <vector>

namespace welcomer {

using Names = std::vector<std::string>;

class LocalPreferenceStoreTest : public testing::Test {
  protected:
    static inline const std::string kDomain = "com.corvid.FirstRun";
    static inline const std::string kFolder = "/home/user/Library/Preferences";
    static inline const std::string kFile = kFolder + "/com.corvid.FirstRun.plist";

    LocalPreferenceStoreTest() { root.addDirectory("/home/user/Library"); }

    // What another process reads.
    PropertyList::Dictionary stored() {
        const PropertyListReadResult result = readPropertyList(root.content(kFile).value_or("nothing"));
        EXPECT_TRUE(result) << result.error;
        return result && result.value->isDictionary() ? *result.value->dictionary()
                                                      : PropertyList::Dictionary();
    }

    mode_t mode(const std::string& path) {
        struct stat status = {};
        EXPECT_EQ(::stat(root.locate(path).c_str(), &status), 0);
        return status.st_mode & 07777;
    }

    // Stores one value as another process.
    bool storeElsewhere(const std::string& key, const PropertyList& value) {
        local::LocalPreferenceStore other(posix::RootFolder(root.path()), identity, log);
        other.setValue(key, value, kDomain);
        return other.synchronise(kDomain);
    }

    TemporaryRoot root;
    fakes::CallRecorder recorder;
    fakes::FakeFileSystem fileSystem{recorder};
    fakes::FakeProcessIdentity identity{recorder, fileSystem};
    fakes::FakeSystemLog log{recorder};
    local::LocalPreferenceStore store{posix::RootFolder(root.path()), identity, log};
};

} // namespace welcomer
