#include "tools/account-server/AccountHandler.h"

#include "generated/WelcomerConfiguration.h"
#include "propertylist/Characters.h"
#include "tools/account-server/LogLine.h"
#include "tools/account-server/Words.h"

#include <algorithm>
#include <array>
#include <cstdio>
#include <exception>
#include <iterator>
#include <utility>
#include <variant>

namespace welcomer::server {

namespace {

using accountserver::AuthenticateAnswer;
using accountserver::ContentType;
using accountserver::Problem;
using accountserver::ProblemType;
using Clock = std::chrono::steady_clock;

constexpr char kServerName[] = "welcomer-account-server";

struct Resource {
    const char* path;
    const char* method;
    const char* shown; // in log lines and figures
};
constexpr Resource kResources[] = {{accountserver::kAuthenticatePath, "POST", "authenticate"},
                                   {accountserver::kAcceptTermsPath, "POST", "accept-terms"},
                                   {accountserver::kServerPath, "GET", "server"}};

const Resource* resourceAt(std::string_view path) {
    const auto* const found =
        std::ranges::find(kResources, path, [](const Resource& each) { return std::string_view(each.path); });
    return found == std::end(kResources) ? nullptr : found;
}

// Names that a directory takes for one and the same are counted as one.
std::string countedName(std::string_view user) {
    std::string name;
    while (!user.empty()) {
        if (const std::string_view word = takeUntil(user, ' '); !word.empty()) {
            name.append(name.empty() ? "" : " ").append(word);
        }
    }
    std::ranges::transform(name, name.begin(), toLower);
    return name;
}

std::string shortUri(ProblemType type) {
    const std::string_view uri = accountserver::kindOf(type).uri;
    return std::string(uri.substr(uri.rfind(':') + 1));
}

bool isFailedTry(ProblemType type) {
    return type == ProblemType::WrongPassword || type == ProblemType::UnknownUser;
}

} // namespace

// One request on its way through.
struct AccountHandler::Exchange {
    const Request& request;
    const AcceptedForms accepted{request.accepted};
    const Clock::time_point begin = Clock::now();
    accountserver::Sender sender = {};
    std::chrono::seconds retryAfter{0};
    std::chrono::duration<double> delay{0};
    std::optional<Problem> problem = {};

    ContentType form() const {
        return accountserver::contentTypeNamed(request.contentType).value_or(ContentType::JSON);
    }
    std::string_view body() const { return {request.body.data(), request.body.size()}; }
};

AccountHandler::AccountHandler(AccountSource& source, bool tellsUnknownUsers, RequestHistory& history,
                               Metrics& metrics, std::function<void(const std::string&)> log)
    : _source(source),
      _tellsUnknownUsers(tellsUnknownUsers),
      _history(history),
      _metrics(metrics),
      _log(std::move(log)) {}

std::optional<Answer> AccountHandler::answerAtOnce(const Request& request, std::size_t announcedLength) {
    Exchange exchange{request};
    const Resource* const resource = resourceAt(request.path);
    const auto refuse = [&](ProblemType type) {
        exchange.problem = Problem{type, {}, {}, {}};
        return _finish(exchange, {});
    };
    if (!resource) {
        return refuse(ProblemType::NoSuchResource);
    }
    const bool isHead = request.method == "HEAD" && std::string_view(resource->method) == "GET";
    if (request.method != resource->method && !isHead) {
        Answer answer = refuse(ProblemType::MethodNotAllowed);
        answer.fields.emplace_back("Allow", resource->method);
        return answer;
    }
    if (exchange.accepted.isEmpty()) {
        return refuse(ProblemType::NotAcceptable);
    }
    if (std::string_view(resource->method) == "GET") {
        return _finish(
            exchange,
            writeAnswer(accountserver::ServerDescription{kServerName, std::string(configuration::kVersion)},
                        exchange.accepted));
    }
    if (!accountserver::contentTypeNamed(request.contentType)) {
        return refuse(ProblemType::UnsupportedMediaType);
    }
    if (announcedLength > accountserver::kMaximumBodySize) {
        return refuse(ProblemType::ContentTooLarge);
    }
    return std::nullopt;
}

Answer AccountHandler::overloaded(const Request& request) {
    Exchange exchange{request};
    exchange.problem = Problem{ProblemType::Unavailable, "the server has too much to do", {}, {}};
    exchange.retryAfter = std::chrono::seconds(1);
    return _finish(exchange, {});
}

Answer AccountHandler::tooSlow(const Peer& peer) {
    const Request request{{}, {}, {}, {}, peer, {}};
    Exchange exchange{request};
    exchange.problem = Problem{ProblemType::RequestTimeout, {}, {}, {}};
    return _finish(exchange, {});
}

Answer AccountHandler::answer(Request& request) {
    Exchange exchange{request};
    try {
        if (request.path == accountserver::kAuthenticatePath) {
            return _authenticate(exchange);
        }
        return _acceptTerms(exchange);
    } catch (const std::exception& error) {
        _log(LogLine("failure").add("reason", error.what()).text());
        exchange.problem = Problem{ProblemType::ServerError, {}, exchange.sender.requestID, {}};
        return _finish(exchange, {});
    }
}

Answer AccountHandler::_authenticate(Exchange& exchange) {
    auto decoded = accountserver::decodeAuthenticateRequest(exchange.body(), exchange.form());
    if (!decoded) {
        return _refuse(exchange, decoded.error);
    }
    const WipedAtEnd wiped(decoded.message->password);
    exchange.sender = decoded.message->request.sender;
    SourceAnswer answer =
        _check(exchange, decoded.message->password, [this](const auto& user, const auto& password) {
            return _source.authenticate(user, password);
        });
    if (exchange.problem) {
        return _finish(exchange, {});
    }
    auto& content = std::get<AuthenticateAnswer>(answer.content);
    content.accountID = exchange.sender.user;
    return _finish(exchange,
                   writeAnswer(content, exchange.sender.requestID, exchange.accepted, exchange.form()));
}

Answer AccountHandler::_acceptTerms(Exchange& exchange) {
    auto decoded = accountserver::decodeAcceptTermsRequest(exchange.body(), exchange.form());
    if (!decoded) {
        return _refuse(exchange, decoded.error);
    }
    const WipedAtEnd wiped(decoded.message->password);
    exchange.sender = decoded.message->request.sender;
    _check(exchange, decoded.message->password, [&](const auto& user, const auto& password) {
        return _source.acceptTerms(user, password, decoded.message->request.terms);
    });
    return _finish(exchange, {204, {}, {}, {}, {}});
}

Answer AccountHandler::_refuse(Exchange& exchange, const std::string& why) {
    exchange.problem = Problem{ProblemType::InvalidRequest, why, {}, {}};
    return _finish(exchange, {});
}

SourceAnswer AccountHandler::_check(Exchange& exchange, const std::string& password,
                                    const Question& question) {
    const std::string& user = exchange.sender.user;
    const std::string name = countedName(user);
    const std::string& address = exchange.request.peer.counted;
    SourceAnswer answer{Problem{ProblemType::WrongPassword, {}, {}, {}}, {}, {}};
    exchange.retryAfter = _history.failedTries.wait(name, address);
    if (exchange.retryAfter.count() == 0 && !password.empty()) {
        const Clock::time_point begin = Clock::now();
        answer = question(user, password);
        _metrics.countQuestion(Clock::now() - begin);
        exchange.delay = answer.delay;
    }
    const std::string identity = answer.identity.empty() ? name : answer.identity;
    const auto* const problem = std::get_if<Problem>(&answer.content);
    // Others may have failed in the meantime: what they were not told, nobody is.
    exchange.retryAfter = std::max(exchange.retryAfter, _history.failedTries.wait(identity, address));
    const bool isFailure = problem && isFailedTry(problem->type);
    if (exchange.retryAfter.count() == 0 && (isFailure || !problem) &&
        _history.seenRequests.add(exchange.body())) {
        if (isFailure) {
            exchange.retryAfter = _history.failedTries.add(name, address);
            if (identity != name) {
                exchange.retryAfter =
                    std::max(exchange.retryAfter, _history.failedTries.add(identity, address));
            }
        } else {
            ++_metrics.signIns;
        }
    }
    if (exchange.retryAfter.count() > 0) {
        exchange.problem = Problem{ProblemType::TooManyTries, {}, exchange.sender.requestID, {}};
    } else if (problem) {
        exchange.problem = *problem;
        exchange.problem->requestID = exchange.sender.requestID;
        if (isFailure && !_tellsUnknownUsers) {
            exchange.problem->type = ProblemType::WrongCredentials;
        }
    }
    return answer;
}

Answer AccountHandler::_finish(Exchange& exchange, Answer answer) {
    const std::chrono::duration<double> took = Clock::now() - exchange.begin;
    if (const auto& problem = exchange.problem) {
        answer = writeProblem(*problem, exchange.accepted);
        if (answer.status == 401) {
            answer.fields.emplace_back("WWW-Authenticate", "Welcomer");
        }
        if (exchange.retryAfter.count() > 0) {
            answer.fields.emplace_back("Retry-After", std::to_string(exchange.retryAfter.count()));
        }
        if (problem->type == ProblemType::Unavailable) {
            ++_metrics.unavailable;
        }
    }
    answer.delay = exchange.delay;
    const Resource* const resource = resourceAt(exchange.request.path);
    const char* const shown = resource ? resource->shown : "other";
    _metrics.countAnswer(shown, answer.status);
    LogLine line(shown);
    line.add("status", std::to_string(answer.status)).add("from", exchange.request.peer.shown);
    if (!exchange.sender.user.empty()) {
        line.add("user", exchange.sender.user).add("request", exchange.sender.requestID);
        line.add("product", exchange.sender.machine.product).add("version", exchange.sender.machine.version);
    }
    if (exchange.problem) {
        line.add("problem", shortUri(exchange.problem->type));
        if (!exchange.problem->detail.empty()) {
            line.add("detail", exchange.problem->detail);
        }
    }
    std::array<char, 32> seconds{};
    std::snprintf(seconds.data(), seconds.size(), "%.3f", took.count());
    _log(line.add("seconds", seconds.data()).text());
    return answer;
}

} // namespace welcomer::server
