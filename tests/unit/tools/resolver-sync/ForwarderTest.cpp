#include "tools/resolver-sync/Forwarder.h"

#include <gtest/gtest.h>

namespace welcomer::resolver {
namespace {

TEST(Forwarder, EachNameserverOfADomainIsALine) {
    EXPECT_EQ(serverLines({{"a.example", {{"192.0.2.1", 53}, {"192.0.2.2", 5353}}},
                           {"b.example", {{"2001:db8::1", 53}}}}),
              "server=/a.example/192.0.2.1#53\n"
              "server=/a.example/192.0.2.2#5353\n"
              "server=/b.example/2001:db8::1#53\n");
}

} // namespace
} // namespace welcomer::resolver
