#include "tools/welcomer/login/LoginReport.h"

#include "handoff/LaunchAgentFile.h"

#include <array>
#include <ctime>
#include <iomanip>
#include <sstream>

namespace welcomer::tool {

namespace {

double seconds(std::chrono::nanoseconds time) {
    return std::chrono::duration<double>(time).count();
}

Json secondsOrNull(std::optional<std::chrono::nanoseconds> time) {
    return time ? Json(seconds(*time)) : Json();
}

std::string formatted(const std::tm& fields, const char* format) {
    std::array<char, 64> text{};
    return {text.data(), std::strftime(text.data(), text.size(), format, &fields)};
}

const char* kindName(DelegateOutcome::Kind kind, bool isRunning) {
    switch (kind) {
    case DelegateOutcome::Kind::NoResponse:
        return "no-response";
    case DelegateOutcome::Kind::Completed:
        return "completed";
    case DelegateOutcome::Kind::Refused:
        return "refused";
    case DelegateOutcome::Kind::Raised:
        return "raised";
    case DelegateOutcome::Kind::Working:
        break;
    }
    return isRunning ? "working" : "never-answered";
}

const char* kindName(ServiceOutcome::Kind kind) {
    switch (kind) {
    case ServiceOutcome::Kind::Enabled:
        return "enabled";
    case ServiceOutcome::Kind::PutOff:
        return "put-off";
    case ServiceOutcome::Kind::Refused:
        return "refused";
    case ServiceOutcome::Kind::OfSetup:
        break;
    }
    return "left-to-setup";
}

const char* endName(const LoginRecord& record, bool isRunning) {
    if (isRunning) {
        return "running";
    }
    switch (record.end()) {
    case LoginRecord::End::Ended:
        return "ended";
    case LoginRecord::End::Broken:
        return "broken";
    case LoginRecord::End::Unfinished:
        break;
    }
    return "unfinished";
}

Json toJson(const DelegateOutcome& delegate, bool isRunning) {
    return {{"identifier", delegate.identifier},
            {"outcome", kindName(delegate.kind, isRunning)},
            {"reason", delegate.reason.empty() ? Json() : Json(delegate.reason)},
            {"progress", delegate.progress.empty() ? Json() : Json(delegate.progress)},
            {"seconds", delegate.seconds.empty() ? Json() : Json(std::stod(delegate.seconds))}};
}

Json toJson(const ServiceOutcome& service) {
    return {{"identifier", service.identifier},
            {"outcome", kindName(service.kind)},
            {"reason", service.reason.empty() ? Json() : Json(service.reason)},
            {"seconds", seconds(service.settled)}};
}

} // namespace

std::string timedLine(std::chrono::nanoseconds time, const std::string& message) {
    std::ostringstream line;
    line << std::setw(11) << std::fixed << std::setprecision(3) << seconds(time) << "  " << message;
    return line.str();
}

std::string utcTime(std::chrono::microseconds time) {
    const auto whole = std::chrono::floor<std::chrono::seconds>(time);
    const std::time_t moment = whole.count();
    std::tm fields{};
    ::gmtime_r(&moment, &fields);
    std::ostringstream text;
    text << formatted(fields, "%Y-%m-%dT%H:%M:%S.") << std::setw(6) << std::setfill('0')
         << (time - whole).count() << 'Z';
    return text.str();
}

std::string localTime(std::chrono::microseconds time) {
    const std::time_t moment = std::chrono::floor<std::chrono::seconds>(time).count();
    std::tm fields{};
    ::localtime_r(&moment, &fields);
    return formatted(fields, "%Y-%m-%d %H:%M:%S");
}

std::string shownMessage(const LogLine& line) {
    const bool isAgents = line.program == kAgentProgramName && !line.isOutput;
    return isAgents ? line.message : "[" + line.program + (line.isOutput ? " output] " : "] ") + line.message;
}

Json toJson(const Login& login, const LogLine& line) {
    return {{"seconds", seconds(sinceBeginning(login, line))},
            {"time", utcTime(line.wallClock)},
            {"program", line.program},
            {"output", line.isOutput},
            {"message", line.message}};
}

Json toJson(const Login& login) {
    Json lines = Json::array();
    for (const LogLine& line : login.lines) {
        lines.push_back(toJson(login, line));
    }
    return {{"begin", utcTime(beginning(login).wallClock)}, {"lines", lines}};
}

Json toJson(const LoginRecord& record, bool isRunning) {
    Json delegates = Json::array();
    for (const DelegateOutcome& delegate : record.delegates()) {
        delegates.push_back(toJson(delegate, isRunning));
    }
    Json services = Json::array();
    for (const ServiceOutcome& service : record.services()) {
        services.push_back(toJson(service));
    }
    return {{"account", record.account().empty() ? Json() : Json(record.account())},
            {"end", endName(record, isRunning)},
            {"endReason", record.endReason().empty() ? Json() : Json(record.endReason())},
            {"seconds", seconds(record.last())},
            {"waiting", secondsOrNull(record.waiting())},
            {"lingering", secondsOrNull(record.lingering())},
            {"itemStatus", record.itemStatus() ? Json(*record.itemStatus()) : Json()},
            {"failures", record.failures()},
            {"delegates", delegates},
            {"services", services}};
}

std::string endText(const LoginRecord& record, bool isRunning) {
    if (isRunning) {
        return "still runs";
    }
    std::ostringstream after;
    after << " after " << std::fixed << std::setprecision(1) << seconds(record.last()) << " s";
    switch (record.end()) {
    case LoginRecord::End::Ended:
        return "ended" + after.str();
    case LoginRecord::End::Broken:
        return record.endReason() + "," + after.str();
    case LoginRecord::End::Unfinished:
        break;
    }
    return "never logged its end; its last line came" + after.str();
}

std::string outcomeText(const DelegateOutcome& delegate, bool isRunning) {
    if (delegate.working()) {
        const std::string progress = delegate.progress.empty() ? "" : ", at " + delegate.progress;
        return (isRunning ? "has not answered yet" : "never answered") + progress;
    }
    return (delegate.kind == DelegateOutcome::Kind::Refused ? "refused: " : "") + delegate.text();
}

} // namespace welcomer::tool
