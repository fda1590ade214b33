// The figures of the server over HTTP.

#pragma once

#include "tools/account-server/Http.h"
#include "tools/account-server/Metrics.h"

#include <string_view>

namespace welcomer::server {

class MetricsHandler final : public RequestHandler {
  public:
    //  metrics  borrowed
    explicit MetricsHandler(const Metrics& metrics) : _metrics(metrics) {}

    std::optional<Answer> answerAtOnce(const Request& request, std::size_t /*announcedLength*/) override {
        if (request.path != "/metrics") {
            return Answer{404, "text/plain", "There is nothing here but /metrics.\n", {}, {}};
        }
        if (request.method != "GET" && request.method != "HEAD") {
            return Answer{405, "text/plain", "GET reads the figures.\n", {{"Allow", "GET"}}, {}};
        }
        return Answer{200, "text/plain; version=0.0.4; charset=utf-8", _metrics.text(), {}, {}};
    }

    Answer answer(Request& request) override { return *answerAtOnce(request, 0); }
    Answer overloaded(const Request& request) override { return *answerAtOnce(request, 0); }
    Answer tooSlow(const Peer& /*peer*/) override {
        return {408, "text/plain", "The request took too long to arrive.\n", {}, {}};
    }

  private:
    const Metrics& _metrics;
};

} // namespace welcomer::server
