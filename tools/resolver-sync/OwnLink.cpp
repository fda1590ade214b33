#include "tools/resolver-sync/OwnLink.h"

#include "backends/posix/NetlinkSocket.h"

#include <linux/if_addr.h>
#include <linux/if_link.h>
#include <linux/rtnetlink.h>
#include <linux/veth.h>
#include <net/if.h>
#include <string>
#include <system_error>

namespace welcomer::resolver {

namespace {

constexpr const char* kName = "welcomer0";
constexpr const char* kPeerName = "welcomer1";
// The address that is reserved as a dummy: nothing sends to it, and no network has it.
constexpr posix::IPv4Address kAddress = 0xC0000008; // 192.0.0.8

// Sends one request on a connection of its own: there are four, when the link is made.
int send(posix::NetlinkRequest& request) {
    return posix::NetlinkSocket().ask(request);
}

ifinfomsg linkBody(int index) {
    ifinfomsg body{};
    body.ifi_index = index;
    return body;
}

int makePair() {
    posix::NetlinkRequest request(RTM_NEWLINK, NLM_F_CREATE | NLM_F_EXCL, linkBody(0));
    request.addText(IFLA_IFNAME, kName);
    request.addNested(IFLA_LINKINFO, [&] {
        request.addText(IFLA_INFO_KIND, "veth");
        request.addNested(IFLA_INFO_DATA, [&] {
            request.addNested(VETH_INFO_PEER, [&] {
                request.addBody(linkBody(0));
                request.addText(IFLA_IFNAME, kPeerName);
            });
        });
    });
    return send(request);
}

// Neither end can be up before both are there.
int bringUp(const char* name) {
    ifinfomsg link = linkBody(static_cast<int>(::if_nametoindex(name)));
    link.ifi_flags = IFF_UP;
    link.ifi_change = IFF_UP;
    posix::NetlinkRequest request(RTM_NEWLINK, 0, link);
    return send(request);
}

int addAddress(int index) {
    ifaddrmsg body{};
    body.ifa_family = AF_INET;
    body.ifa_prefixlen = 32;
    body.ifa_scope = RT_SCOPE_UNIVERSE;
    body.ifa_index = static_cast<unsigned>(index);
    posix::NetlinkRequest request(RTM_NEWADDR, NLM_F_CREATE | NLM_F_REPLACE, body);
    request.addAddress(IFA_LOCAL, kAddress);
    request.addAddress(IFA_ADDRESS, kAddress);
    return send(request);
}

platform::Outcome outcome(int number, const std::string& what) {
    if (number == 0) {
        return platform::Outcome::success();
    }
    return platform::Outcome::failure({number, what + ": " + std::generic_category().message(number)});
}

} // namespace

int OwnLink::index() {
    return static_cast<int>(::if_nametoindex(kName));
}

platform::Outcome OwnLink::make() {
    if (index() != 0) {
        return platform::Outcome::success();
    }
    int number = makePair();
    if (number != 0) {
        return outcome(number, std::string("failed to create the link ") + kName);
    }
    number = addAddress(index());
    for (const char* const end : {kPeerName, kName}) {
        number = number != 0 ? number : bringUp(end);
    }
    if (number != 0) {
        // Half a link would pass for a whole one the next time.
        static_cast<void>(remove());
    }
    return outcome(number, std::string("failed to bring up the link ") + kName);
}

platform::Outcome OwnLink::remove() {
    const int number = index();
    if (number == 0) {
        return platform::Outcome::success();
    }
    posix::NetlinkRequest request(RTM_DELLINK, 0, linkBody(number));
    return outcome(send(request), std::string("failed to remove the link ") + kName);
}

} // namespace welcomer::resolver
