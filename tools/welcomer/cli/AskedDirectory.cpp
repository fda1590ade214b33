#include "tools/welcomer/cli/AskedDirectory.h"

#include "backends/posix/SecretText.h"
#include "platform/AccountService.h"
#include "propertylist/Lookup.h"
#include "propertylist/PropertyListWriter.h"
#include "propertylist/XMLPropertyListReader.h"

#include <cerrno>
#include <cstdint>
#include <sys/socket.h>
#include <utility>

namespace welcomer::tool {

namespace {

// A message is the number of its bytes and an XML property list; texts are data in it, so that any can be
// asked for. A password follows its question by itself, its bytes behind their number: what writes and reads
// property lists leaves copies.
constexpr char kQuestionKey[] = "Question";
constexpr char kUserKey[] = "User";
constexpr char kRequestKey[] = "Request";
constexpr char kTermsKey[] = "Terms";
constexpr char kAnswerQuestion[] = "answer";
constexpr char kAcceptQuestion[] = "accept";
constexpr char kServerQuestion[] = "server";
constexpr char kServicesQuestion[] = "services";
constexpr char kNamesQuestion[] = "names";

constexpr char kCompletedKey[] = "Completed";
constexpr char kContentsKey[] = "Contents";
constexpr char kDelayKey[] = "DelaySeconds";
constexpr char kServicesKey[] = "Services";
constexpr char kNamesKey[] = "Names";
constexpr char kServerKey[] = "Server";

constexpr std::uint32_t kLongestMessage = 64U << 20U; // bytes

// Has all of these bytes sent or received.
//  step  does so with as many of them as go at once
template <class Byte, class Step>
bool transfer(Byte* bytes, std::size_t size, Step step) {
    while (size > 0) {
        const ssize_t count = step(bytes, size);
        if (count < 0 && errno == EINTR) {
            continue;
        }
        if (count <= 0) {
            return false;
        }
        bytes += count;
        size -= static_cast<std::size_t>(count);
    }
    return true;
}

bool sendAll(int socket, const char* bytes, std::size_t size) {
    return transfer(bytes, size, [socket](const char* rest, std::size_t length) {
        return ::send(socket, rest, length, MSG_NOSIGNAL);
    });
}

bool receiveAll(int socket, char* bytes, std::size_t size) {
    return transfer(bytes, size,
                    [socket](char* rest, std::size_t length) { return ::recv(socket, rest, length, 0); });
}

bool sendCounted(int socket, std::string_view bytes) {
    const auto size = static_cast<std::uint32_t>(bytes.size());
    return bytes.size() <= kLongestMessage &&
           sendAll(socket, reinterpret_cast<const char*>(&size), sizeof(size)) &&
           sendAll(socket, bytes.data(), bytes.size());
}

// How many bytes follow; none at the end of all messages, and where it makes no sense.
std::optional<std::uint32_t> receiveCount(int socket) {
    std::uint32_t size = 0;
    return receiveAll(socket, reinterpret_cast<char*>(&size), sizeof(size)) && size <= kLongestMessage
               ? std::optional(size)
               : std::nullopt;
}

// What cannot be written is sent as nothing.
bool sendMessage(int socket, const PropertyList& message) {
    return sendCounted(socket, writeXMLPropertyList(message).value_or(""));
}

// None at the end of all messages, and for one that makes no sense.
std::optional<PropertyList> receiveMessage(int socket) {
    const auto size = receiveCount(socket);
    std::string bytes(size.value_or(0), '\0');
    return size && receiveAll(socket, bytes.data(), bytes.size()) ? readXMLPropertyList(bytes).value
                                                                  : std::nullopt;
}

// One that breaks off is empty, and so is right for nobody.
posix::SecretText receivePassword(int socket) {
    const std::uint32_t size = receiveCount(socket).value_or(0);
    return {size, [&](std::string& text) {
                text.resize(size);
                if (!receiveAll(socket, text.data(), size)) {
                    posix::wipe(text);
                }
            }};
}

std::string bytesIn(const PropertyList& message, const char* key) {
    const PropertyList* const value = valueIn(message, key);
    return value && value->data() ? value->data()->bytes : "";
}

PropertyList::Array dataOf(const std::vector<std::string>& texts) {
    PropertyList::Array data;
    for (const std::string& text : texts) {
        data.emplace_back(PropertyList::Data{text});
    }
    return data;
}

PropertyList::Dictionary written(const platform::SignInAnswer& answer) {
    return {{kCompletedKey, answer.isCompleted},
            {kContentsKey, answer.contents},
            {kDelayKey, answer.delaySeconds}};
}

//  socket  has the password that goes with the question
PropertyList replyTo(const PropertyList& question, int socket, const platform::SignInDirectory& directory) {
    const std::string* const kind = textIn(question, kQuestionKey);
    const std::string user = bytesIn(question, kUserKey);
    PropertyList::Dictionary reply;
    if (kind && *kind == kAnswerQuestion) {
        const posix::SecretText password = receivePassword(socket);
        reply = written(directory.answer(
            user, password.text(),
            copyOf(dictionaryIn(question, kRequestKey)).value_or(PropertyList::Dictionary())));
    } else if (kind && *kind == kAcceptQuestion) {
        const posix::SecretText password = receivePassword(socket);
        reply = written(directory.acceptTerms(user, password.text(),
                                              copyOf(valueIn(question, kTermsKey)).value_or(PropertyList())));
    } else if (kind && *kind == kServerQuestion) {
        reply = {{kServerKey, PropertyList::Data{directory.server()}}};
    } else if (kind && *kind == kServicesQuestion) {
        reply = {{kServicesKey, directory.servicesOfNewAccount(user)}};
    } else if (kind && *kind == kNamesQuestion) {
        if (const auto names = directory.userNames()) {
            reply = {{kNamesKey, dataOf(*names)}};
        }
    }
    return reply;
}

} // namespace

platform::SignInAnswer AskedDirectory::answer(const std::string& username, const std::string& password,
                                              const PropertyList::Dictionary& delegateRequest) const {
    return _askWithPassword({{kQuestionKey, kAnswerQuestion},
                             {kUserKey, PropertyList::Data{username}},
                             {kRequestKey, delegateRequest}},
                            password);
}

platform::SignInAnswer AskedDirectory::acceptTerms(const std::string& username, const std::string& password,
                                                   const PropertyList& terms) const {
    return _askWithPassword(
        {{kQuestionKey, kAcceptQuestion}, {kUserKey, PropertyList::Data{username}}, {kTermsKey, terms}},
        password);
}

std::string AskedDirectory::server() const {
    return bytesIn(_ask({{kQuestionKey, kServerQuestion}}), kServerKey);
}

platform::SignInAnswer AskedDirectory::_askWithPassword(PropertyList::Dictionary question,
                                                        const std::string& password) const {
    const PropertyList reply = _ask(std::move(question), &password);
    const PropertyList::Dictionary* const contents = dictionaryIn(reply, kContentsKey);
    if (!contents) {
        return {false, {{platform::kSKPropertyAccountError, platform::kSKAccountErrorServerUnavailable}}, 0};
    }
    const PropertyList* const delay = valueIn(reply, kDelayKey);
    return {isTrueIn(reply, kCompletedKey), *contents, delay ? delay->real().value_or(0) : 0};
}

PropertyList::Dictionary AskedDirectory::servicesOfNewAccount(const std::string& username) const {
    const PropertyList reply =
        _ask({{kQuestionKey, kServicesQuestion}, {kUserKey, PropertyList::Data{username}}});
    return copyOf(dictionaryIn(reply, kServicesKey)).value_or(PropertyList::Dictionary());
}

std::optional<std::vector<std::string>> AskedDirectory::userNames() const {
    const PropertyList reply = _ask({{kQuestionKey, kNamesQuestion}});
    const PropertyList::Array* const names = arrayIn(reply, kNamesKey);
    if (!names) {
        return std::nullopt;
    }
    std::vector<std::string> texts;
    for (const PropertyList& name : *names) {
        texts.push_back(name.data() ? name.data()->bytes : "");
    }
    return texts;
}

PropertyList AskedDirectory::_ask(PropertyList::Dictionary question, const std::string* password) const {
    const std::lock_guard lock(_mutex);
    if (!sendMessage(_socket.get(), std::move(question)) ||
        (password && !sendCounted(_socket.get(), *password))) {
        return {};
    }
    return receiveMessage(_socket.get()).value_or(PropertyList());
}

void answerQuestions(int socket, const platform::SignInDirectory& directory) {
    while (const std::optional<PropertyList> question = receiveMessage(socket)) {
        if (!sendMessage(socket, replyTo(*question, socket, directory))) {
            return;
        }
    }
}

} // namespace welcomer::tool
