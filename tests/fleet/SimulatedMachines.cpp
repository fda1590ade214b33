// Machines whose users sign in with an account server, many at once, over the client that every machine has. What each
// is answered goes to the standard output; whether that is right is for others to say.
//
//   fleet-machines ADDRESS AUTHORITY AT_ONCE TRIES < PLAN
//
//   ADDRESS    as the setting AccountServer has it
//   AUTHORITY  as AccountServerAuthority has it; may be empty
//   AT_ONCE    how many sign in at the same time at the most
//   TRIES      how often a user tries who is told that the server cannot be asked
//   PLAN       a line for each machine, with tabs between: seconds from the beginning at which somebody comes to it,
//              their name, their password
//
// A line is written for each try, with tabs between: user, try, seconds from the beginning, seconds that it took,
// "completed" or the account error, the address of the account's mail service, the alias, and the text of a failure.

#include "backends/desktop/accountserver/AccountServerClient.h"
#include "platform/AccountService.h"
#include "propertylist/Lookup.h"

#include <algorithm>
#include <atomic>
#include <chrono>
#include <cstdio>
#include <cstdlib>
#include <iostream>
#include <sstream>
#include <string>
#include <thread>
#include <vector>

using namespace welcomer;

namespace {

using Clock = std::chrono::steady_clock;
using Seconds = std::chrono::duration<double>;

constexpr char kChatter[] = "com.corvid.chatter";

struct Visit {
    Seconds at{0};
    std::string user;
    std::string password;
};

std::vector<Visit> readPlan(std::istream& plan) {
    std::vector<Visit> visits;
    for (std::string line; std::getline(plan, line);) {
        std::istringstream fields(line);
        std::string at;
        Visit visit;
        std::getline(fields, at, '\t');
        std::getline(fields, visit.user, '\t');
        std::getline(fields, visit.password, '\t');
        visit.at = Seconds(std::strtod(at.c_str(), nullptr));
        visits.push_back(std::move(visit));
    }
    std::ranges::stable_sort(visits, {}, &Visit::at);
    return visits;
}

class Fleet {
  public:
    Fleet(desktop::AccountServerSettings settings, int tries, std::vector<Visit> visits)
        : _arguments{[settings] { return settings; },
                     [] {
                         return accountserver::Machine{"Debian GNU/Linux", "12", "C.UTF-8"};
                     }},
          _tries(tries),
          _visits(std::move(visits)) {}

    void run(std::size_t atOnce) {
        _begin = Clock::now();
        std::vector<std::jthread> threads;
        for (std::size_t i = 0; i < std::min(atOnce, _visits.size()); ++i) {
            threads.emplace_back([this] {
                for (std::size_t next = _next++; next < _visits.size(); next = _next++) {
                    _visit(_visits[next]);
                }
            });
        }
    }

  private:
    void _visit(const Visit& visit) {
        std::this_thread::sleep_until(_begin + std::chrono::duration_cast<Clock::duration>(visit.at));
        for (int number = 1; number <= _tries; ++number) {
            if (_signIn(visit, number) != platform::kSKAccountErrorServerUnavailable) {
                return;
            }
            std::this_thread::sleep_for(std::chrono::seconds(number)); // whoever reads it, and tries again
        }
    }

    // Gives the account error, or 0.
    std::int64_t _signIn(const Visit& visit, int number) {
        const desktop::AccountServerClient client(_arguments); // each machine has its own
        const PropertyList::Dictionary request{
            {platform::kDelegatesKey,
             PropertyList::Dictionary{{kChatter, PropertyList::Dictionary{{"wantsAliases", true}}}}}};
        const Clock::time_point begin = Clock::now();
        const platform::SignInAnswer answer = client.answer(visit.user, visit.password, request);
        const Seconds took = Clock::now() - begin;

        const PropertyList* const error = valueIn(answer.contents, platform::kSKPropertyAccountError);
        const std::int64_t code = answer.isCompleted ? 0 : error ? error->integer().value_or(-1) : -1;
        const auto* const why = textIn(answer.contents, platform::kSKPropertyAccountErrorInfo);
        const PropertyList::Dictionary services = client.servicesOfNewAccount(visit.user);
        const auto* const mail =
            textIn(dictionaryIn(dictionaryIn(services, platform::kSKServiceIDMail), "Properties"),
                   platform::kSKPropertyMailEmailAddress);
        const auto* const delegates = dictionaryIn(answer.contents, platform::kDelegatesKey);
        const auto aliases = textsIn(dictionaryIn(delegates, kChatter), "aliases");
        std::ostringstream line;
        line << visit.user << '\t' << number << '\t' << Seconds(begin - _begin).count() << '\t'
             << took.count() << '\t' << (code == 0 ? "completed" : std::to_string(code)) << '\t'
             << (mail ? *mail : "") << '\t' << (aliases && !aliases->empty() ? aliases->front() : "") << '\t'
             << (why ? *why : "") << '\n';
        std::fputs(line.str().c_str(), stdout);
        return code;
    }

    const desktop::AccountServerModule::Arguments _arguments;
    const int _tries;
    const std::vector<Visit> _visits;
    Clock::time_point _begin;
    std::atomic<std::size_t> _next = 0;
};

} // namespace

int main(int argc, char** argv) {
    if (argc != 5) {
        std::fputs("usage: fleet-machines ADDRESS AUTHORITY AT_ONCE TRIES < PLAN\n", stderr);
        return 2;
    }
    std::setvbuf(stdout, nullptr, _IOLBF, 0); // who reads along does something at the right time
    desktop::AccountServerSettings settings;
    settings.address = argv[1];
    settings.authority = argv[2];
    Fleet(std::move(settings), std::atoi(argv[4]), readPlan(std::cin))
        .run(std::strtoul(argv[3], nullptr, 10));
    return 0;
}
