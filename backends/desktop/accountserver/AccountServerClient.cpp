#include "backends/desktop/accountserver/AccountServerClient.h"

#include "backends/accountserver/SignInAnswers.h"
#include "backends/desktop/accountserver/DesktopProxies.h"
#include "backends/desktop/accountserver/ReplyReading.h"
#include "backends/desktop/accountserver/TransferFailure.h"
#include "propertylist/CalendarDate.h"
#include "propertylist/PropertyListReadError.h"
#include "propertylist/UnwritableValue.h"

#include <array>
#include <chrono>
#include <cstdlib>
#include <ctime>
#include <random>

namespace welcomer::desktop {

namespace {

using namespace std::chrono_literals;
using accountserver::ContentType;

// Before the second and the third try.
constexpr std::array<std::chrono::milliseconds, 2> kWaits = {500ms, 1500ms};

constexpr std::size_t kMaximumRemembered = 64;        // users
constexpr std::int64_t kMaximumClockDifference = 120; // seconds
constexpr std::int64_t kSecondsOfADay = std::int64_t{24} * 60 * 60;
constexpr std::int64_t kSoon = 14; // days, before a certificate's end

// A random UUID.
std::string makeRequestID() {
    std::random_device random;
    constexpr std::string_view form = "xxxxxxxx-xxxx-4xxx-yxxx-xxxxxxxxxxxx";
    constexpr std::string_view digits = "0123456789abcdef";
    std::string id(form);
    for (char& each : id) {
        if (each == 'x') {
            each = digits[random() & 0xFU];
        } else if (each == 'y') {
            each = digits[8 + (random() & 3U)];
        }
    }
    return id;
}

// How the request has to be written: JSON where that has place for all of it.
template <class Request>
std::optional<accountserver::AroundPassword> encodeAround(const Request& request, ContentType& type,
                                                          std::string& error) {
    for (const ContentType each : {ContentType::JSON, ContentType::PropertyList}) {
        type = each;
        if (auto around = accountserver::encodeAroundPassword(request, each, &error)) {
            return around;
        }
    }
    return std::nullopt;
}

TransferOutcome neverSent(const std::string& why) {
    return {std::nullopt, why, true, false};
}

std::string dayOf(std::int64_t moment) {
    return formatCalendarDate({static_cast<double>(moment)}).value_or("?").substr(0, 10);
}

// What is wrong with the times that a reply tells of.
std::string adviceOn(const Reply& reply, std::int64_t now) {
    if (reply.date && std::abs(*reply.date - now) > kMaximumClockDifference) {
        return "set this machine's clock, or the server's";
    }
    if (reply.certificateUntil && *reply.certificateUntil - now < kSoon * kSecondsOfADay) {
        return "have the server's certificate renewed";
    }
    return "";
}

std::string textOf(const Reply& reply, const accountserver::ServerDescription& description,
                   std::int64_t now) {
    std::string text = "answers: " + excerpt(description.server) + " " + excerpt(description.version);
    if (reply.certificateUntil) {
        text += ", certificate until " + dayOf(*reply.certificateUntil);
    }
    if (!reply.date) {
        return text + ", tells no time";
    }
    const std::int64_t difference = *reply.date - now;
    return text + (std::abs(difference) <= 2 ? ", clocks agree"
                                             : ", its clock is " + std::to_string(std::abs(difference)) +
                                                   " s " + (difference > 0 ? "ahead" : "behind"));
}

} // namespace

platform::SignInAnswer AccountServerClient::answer(const std::string& username, const std::string& password,
                                                   const PropertyList::Dictionary& delegateRequest) const {
    const std::string server = shownServer(_settings);
    const TransferOutcome outcome =
        _post(accountserver::kAuthenticatePath,
              accountserver::AuthenticateRequest{_sender(username), delegateRequest}, password);
    if (!outcome.reply) {
        return accountserver::unavailable(outcome.whyNot);
    }
    if (outcome.reply->status != 200) {
        return readFailure(*outcome.reply, server);
    }
    const auto answer = readAnswer(*outcome.reply);
    if (!answer) {
        return accountserver::unavailable(describeStranger(*outcome.reply, server, answer.error));
    }
    if (answer.message->accountID != username) {
        return accountserver::unavailable(server + " has answered for another user");
    }
    platform::SignInAnswer result = accountserver::signInAnswerOf(*answer.message);
    PropertyList::Dictionary services = accountserver::servicesOf(*answer.message);
    // All of it is kept in property lists.
    if (const auto unwritable = findUnwritableValue(
            PropertyList::Dictionary{{"answer", result.contents}, {"services", services}})) {
        return accountserver::unavailable("what " + server + " answers cannot be kept: " + *unwritable);
    }
    _remember(username, std::move(services));
    return result;
}

platform::SignInAnswer AccountServerClient::acceptTerms(const std::string& username,
                                                        const std::string& password,
                                                        const PropertyList& terms) const {
    const TransferOutcome outcome =
        _post(accountserver::kAcceptTermsPath, accountserver::AcceptTermsRequest{_sender(username), terms},
              password);
    if (!outcome.reply) {
        return accountserver::unavailable(outcome.whyNot);
    }
    return outcome.reply->status == 204 ? platform::SignInAnswer{true, {}, 0}
                                        : readFailure(*outcome.reply, shownServer(_settings));
}

PropertyList::Dictionary AccountServerClient::servicesOfNewAccount(const std::string& username) const {
    const std::lock_guard lock(_mutex);
    const auto found = _services.find(username);
    return found == _services.end() ? accountserver::servicesOf({}) : found->second;
}

AccountServerLook AccountServerClient::look() const {
    const TransferOutcome outcome = _send(accountserver::kServerPath, nullptr);
    constexpr char advice[] = "see welcomer-platform.conf(5) for the settings AccountServer...";
    if (!outcome.reply) {
        return {false, outcome.whyNot, advice};
    }
    const Reply& reply = *outcome.reply;
    const auto description = readDescription(reply);
    if (reply.status != 200 || !description) {
        const std::string why =
            reply.status != 200 ? "HTTP status " + std::to_string(reply.status) : description.error;
        return {false, describeStranger(reply, shownServer(_settings), why), advice};
    }
    const std::int64_t now = std::time(nullptr);
    const std::string wrong = adviceOn(reply, now);
    return {wrong.empty(), textOf(reply, *description.message, now), wrong};
}

template <class Request>
TransferOutcome AccountServerClient::_post(const char* path, const Request& request,
                                           const std::string& password) const {
    if (request.sender.user.empty() || request.sender.user.size() > accountserver::kMaximumUserSize) {
        return neverSent("the user's name is empty or too long");
    }
    ContentType type = ContentType::JSON;
    std::string error;
    auto around = encodeAround(request, type, error);
    if (!around) {
        return neverSent("the request cannot be sent: " + error);
    }
    if (const char* const why = accountserver::whyNotSendable(password, type)) {
        return neverSent(why);
    }
    RequestBody body(*std::move(around), password, type);
    return _send(path, &body);
}

TransferOutcome AccountServerClient::_send(const char* path, RequestBody* body) const {
    const auto end = std::chrono::steady_clock::now() + _settings.limit;
    const std::vector<std::string> proxies = _proxies();
    for (std::size_t tried = 0;; ++tried) {
        const auto left =
            std::chrono::duration_cast<std::chrono::milliseconds>(end - std::chrono::steady_clock::now());
        TransferOutcome outcome = transfer(_settings, proxies[tried % proxies.size()], path, body,
                                           std::max(left, 1ms), _interruption);
        const bool isOver = outcome.reply || !outcome.wasNeverSent || !outcome.mayHelpAgain;
        if (isOver || tried == kWaits.size() || std::chrono::steady_clock::now() + kWaits[tried] >= end ||
            _interruption.isStopped()) {
            return outcome;
        }
        _interruption.wait(kWaits[tried]);
    }
}

// Never empty.
std::vector<std::string> AccountServerClient::_proxies() const {
    std::vector<std::string> proxies;
    if (!isSocket(_settings)) {
        proxies = desktopProxies(_settings.address, std::min(_settings.connectLimit, _settings.limit),
                                 _interruption);
    }
    return proxies.empty() ? std::vector<std::string>(1) : proxies;
}

accountserver::Sender AccountServerClient::_sender(const std::string& username) const {
    return {makeRequestID(), username, _machine};
}

void AccountServerClient::_remember(const std::string& username, PropertyList::Dictionary services) const {
    const std::lock_guard lock(_mutex);
    if (_services.size() >= kMaximumRemembered) {
        _services.clear();
    }
    _services.insert_or_assign(username, std::move(services));
}

} // namespace welcomer::desktop
