#include "backends/local/network/DHCPClient.h"

#include "backends/local/LocalProcessLauncher.h"
#include "backends/network/IPv4Text.h"
#include "backends/posix/Directory.h"
#include "backends/posix/FileContent.h"
#include "backends/posix/FileDescriptor.h"
#include "platform/Error.h"
#include "platform/NetworkConfigStore.h"
#include "propertylist/Characters.h"

#include <algorithm>
#include <array>
#include <charconv>
#include <chrono>
#include <csignal>
#include <fcntl.h>
#include <string_view>
#include <thread>
#include <unistd.h>

namespace welcomer::local {

namespace {

constexpr char kFolder[] = "/run/welcomer";
constexpr char kISCName[] = "dhclient";
constexpr char kBusyBoxName[] = "udhcpc";
constexpr std::array<const char*, 4> kFolders = {"/sbin/", "/usr/sbin/", "/bin/", "/usr/bin/"};
constexpr std::size_t kMaximumSmallFile = 4096;
constexpr int kStopSlices = 40;
constexpr std::chrono::milliseconds kStopSlice{50};

// Where a program is installed, or empty.
std::string find(const std::string& name) {
    for (const char* folder : kFolders) {
        std::string path = folder + name;
        if (::access(path.c_str(), X_OK) == 0) {
            return path;
        }
    }
    return {};
}

// The bytes in hexadecimal, with a separator between them.
std::string hexadecimal(std::string_view bytes, std::string_view separator) {
    std::string text;
    for (const char byte : bytes) {
        if (!text.empty()) {
            text += separator;
        }
        appendHex(text, static_cast<unsigned char>(byte));
    }
    return text;
}

// What `dhclient` reads: short retries, as somebody is waiting, and what the user has set.
std::string configurationText(const DHCPRequest& request) {
    std::string text = "timeout 30;\nretry 5;\ninitial-interval 1;\n";
    if (request.clientID && !request.clientID->empty()) {
        text += "send dhcp-client-identifier " + hexadecimal(*request.clientID, ":") + ";\n";
    }
    std::string servers;
    for (const std::string& server : request.servers) {
        if (network::parseIPv4(server)) { // the option has no place for others
            servers += (servers.empty() ? "" : ", ") + server;
        }
    }
    return servers.empty() ? text : text + "supersede domain-name-servers " + servers + ";\n";
}

bool writeSmallFile(const std::string& path, const std::string& text) {
    const posix::FileDescriptor file(
        ::open(path.c_str(), O_WRONLY | O_CREAT | O_TRUNC | O_NOFOLLOW | O_CLOEXEC, 0600));
    return file && posix::writeAll(file.get(), text) == 0;
}

std::string firstLineOf(const std::string& path) {
    std::string text;
    const posix::FileDescriptor file(::open(path.c_str(), O_RDONLY | O_NOFOLLOW | O_CLOEXEC));
    if (!file || posix::readAll(file.get(), text, kMaximumSmallFile) != 0) {
        return {};
    }
    return text.substr(0, text.find('\n'));
}

// Whether a process is a DHCP client: numbers of processes are used again. One that has ended and that nobody
// has waited for is none any more.
bool isClient(pid_t process) {
    const std::string status = firstLineOf("/proc/" + std::to_string(process) + "/stat");
    return std::ranges::any_of(std::array{kISCName, kBusyBoxName}, [&](const std::string& name) {
        const std::string start = std::to_string(process) + " (" + name + ") ";
        return status.starts_with(start) && !status.substr(start.size()).starts_with('Z');
    });
}

int launch(const std::string& program, const std::vector<std::string>& arguments) {
    try {
        return LocalProcessLauncher().launchAndWait(program, arguments);
    } catch (const platform::Exception&) {
        return -1;
    }
}

} // namespace

bool DHCPClient::isInstalled() const {
    return !find(kISCName).empty() || !find(kBusyBoxName).empty();
}

std::int32_t DHCPClient::start(const DHCPRequest& request) const {
    stop(request.device);
    posix::makeDirectories(_root, kFolder, 0755);
    const std::optional<std::string> files = _pathOfFiles(request.device);
    if (!files) {
        return platform::kNetworkConfigDHCPClientFailed;
    }
    const std::string processFile = *files + ".pid";
    int status = -1;
    if (const std::string program = find(kISCName); !program.empty()) {
        const std::string configuration = *files + ".conf";
        if (writeSmallFile(configuration, configurationText(request))) {
            status = launch(program, {"-4", "-nw", "-pf", processFile, "-lf", *files + ".leases", "-cf",
                                      configuration, request.device});
        }
    } else if (const std::string other = find(kBusyBoxName); !other.empty()) {
        // One attempt of a second in the foreground, then every few seconds in the background.
        std::vector<std::string> arguments = {"-b", "-t", "1",         "-T", "1",           "-A",
                                              "5",  "-p", processFile, "-i", request.device};
        if (request.clientID && !request.clientID->empty()) {
            arguments.insert(arguments.end(), {"-x", "0x3d:" + hexadecimal(*request.clientID, "")});
        }
        status = launch(other, arguments);
    } else {
        return platform::kNetworkConfigNoDHCPClient;
    }
    return status == 0 ? platform::kNetworkConfigSuccess : platform::kNetworkConfigDHCPClientFailed;
}

void DHCPClient::stop(const std::string& device) const {
    const std::optional<std::string> files = _pathOfFiles(device);
    if (!files) {
        return; // nothing was started
    }
    const std::string path = *files + ".pid";
    const std::string text = firstLineOf(path);
    pid_t process = 0;
    const auto read = std::from_chars(text.data(), text.data() + text.size(), process);
    if (read.ec == std::errc() && process > 1 && isClient(process) && ::kill(process, SIGTERM) == 0) {
        for (int slice = 0; slice < kStopSlices && isClient(process); ++slice) {
            std::this_thread::sleep_for(kStopSlice);
        }
    }
    ::unlink(path.c_str());
}

std::optional<std::string> DHCPClient::_pathOfFiles(const std::string& device) const {
    const std::optional<std::string> folder = _root.resolve(kFolder);
    return folder ? std::optional(*folder + "/dhcp-" + device) : std::nullopt;
}

} // namespace welcomer::local
