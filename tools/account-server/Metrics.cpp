#include "tools/account-server/Metrics.h"

#include <algorithm>
#include <string_view>

namespace welcomer::server {

namespace {

// What is told about one figure, in front of its values.
void appendHead(std::string& text, std::string_view name, std::string_view kind, std::string_view help) {
    text.append("# HELP welcomer_account_").append(name).append(" ").append(help).append("\n");
    text.append("# TYPE welcomer_account_").append(name).append(" ").append(kind).append("\n");
}

template <class Number>
void appendValue(std::string& text, std::string_view name, Number value) {
    text.append("welcomer_account_").append(name).append(" ").append(std::to_string(value)).append("\n");
}

template <class Number>
void appendFigure(std::string& text, std::string_view name, std::string_view kind, std::string_view help,
                  Number value) {
    appendHead(text, name, kind, help);
    appendValue(text, name, value);
}

// Shortest: 0.005, not 0.005000.
std::string boundText(double bound) {
    std::string text = std::to_string(bound);
    text.erase(text.find_last_not_of('0') + 1);
    return text.ends_with('.') ? text.substr(0, text.size() - 1) : text;
}

} // namespace

void Metrics::countAnswer(const std::string& resource, unsigned status) {
    const std::lock_guard lock(_mutex);
    ++_answers[{resource, status}];
}

void Metrics::countQuestion(std::chrono::duration<double> took) {
    const auto* const bound = std::ranges::lower_bound(kBounds, took.count());
    const std::lock_guard lock(_mutex);
    ++_questions[static_cast<std::size_t>(bound - kBounds.begin())];
    _questionSeconds += took.count();
}

std::string Metrics::text() const {
    std::string text;
    const std::lock_guard lock(_mutex);
    appendHead(text, "answers_total", "counter", "Answers, by resource and status.");
    for (const auto& [key, count] : _answers) {
        appendValue(text,
                    "answers_total{resource=\"" + key.first + "\",status=\"" + std::to_string(key.second) +
                        "\"}",
                    count);
    }
    appendHead(text, "question_seconds", "histogram", "How long the source of users took to answer.");
    std::uint64_t total = 0;
    for (std::size_t i = 0; i < _questions.size(); ++i) {
        total += _questions[i];
        const std::string bound = i < kBounds.size() ? boundText(kBounds[i]) : "+Inf";
        appendValue(text, "question_seconds_bucket{le=\"" + bound + "\"}", total);
    }
    appendValue(text, "question_seconds_sum", _questionSeconds);
    appendValue(text, "question_seconds_count", total);
    appendFigure(text, "connections", "gauge", "Open connections.", connections.load());
    appendFigure(text, "requests_under_way", "gauge", "Requests that wait for an answer.", underWay.load());
    appendFigure(text, "connections_broken_off_total", "counter",
                 "Connections that took too long or sent too much.", brokenOff.load());
    appendFigure(text, "sign_ins_total", "counter", "Users whose password was right; repetitions count once.",
                 signIns.load());
    appendFigure(text, "unavailable_total", "counter", "Requests that nobody could answer or had time for.",
                 unavailable.load());
    appendFigure(text, "reloads_total", "counter", "Times that the settings were read again.",
                 reloads.load());
    return text;
}

} // namespace welcomer::server
