// The kit for calls on a bus, against sockets that are no bus. tests/integration has those that are.

#include "backends/bus/BusCall.h"

#include "backends/posix/FileDescriptor.h"
#include "tests/contract/TemporaryRoot.h"

#include <cerrno>
#include <cstring>
#include <gtest/gtest.h>
#include <sys/socket.h>
#include <sys/un.h>

namespace welcomer::bus {
namespace {

using namespace std::chrono_literals;

class BusCall : public testing::Test {
  protected:
    // A socket that takes connections and says nothing, as the one of a bus that was stopped.
    posix::FileDescriptor listen() const {
        posix::FileDescriptor socket(::socket(AF_UNIX, SOCK_STREAM | SOCK_CLOEXEC, 0));
        sockaddr_un address = {};
        address.sun_family = AF_UNIX;
        std::strncpy(address.sun_path, path.c_str(), sizeof address.sun_path - 1);
        EXPECT_EQ(::bind(socket.get(), reinterpret_cast<const sockaddr*>(&address), sizeof address), 0);
        EXPECT_EQ(::listen(socket.get(), 5), 0);
        return socket;
    }

    const TemporaryRoot folder;
    const std::string path = folder.path() + "/bus";
    platform::Error why;
};

TEST_F(BusCall, ABusThatLetsNobodyInIsGivenUpInTime) {
    const posix::FileDescriptor silent = listen();
    EXPECT_EQ(openBusAt("unix:path=" + path, 50ms, &why), nullptr);
    EXPECT_EQ(why.number, ETIMEDOUT);
    EXPECT_EQ(openBusAt("unix:path=" + path, 0ms), nullptr); // and nobody is told
}

TEST_F(BusCall, ABusThatIsNotThereIsToldApart) {
    EXPECT_EQ(openBusAt("unix:path=" + path, 50ms, &why), nullptr);
    EXPECT_EQ(why, (platform::Error{ENOENT, "No such file or directory"}));
}

TEST_F(BusCall, ABusThatHangsUpIsToldApart) {
    posix::FileDescriptor socket = listen();
    ASSERT_EQ(::shutdown(socket.get(), SHUT_RDWR), 0);
    EXPECT_EQ(openBusAt("unix:path=" + path, 50ms, &why), nullptr);
    EXPECT_EQ(why.number, ECONNREFUSED);
}

} // namespace
} // namespace welcomer::bus
