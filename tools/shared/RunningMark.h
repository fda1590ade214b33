// What tells other programs that the service runs, and how its work goes.

#pragma once

#include <string>

namespace welcomer::resolver {

// The service's own folder, while it runs, and the mark in it.
inline constexpr const char* kRuntimeFolder = "/run/welcomer-resolver-sync";
inline constexpr const char* kRunningMark = "/run/welcomer-resolver-sync/state";

// A file that the service holds locked as long as it lives, so that a service that was killed is not taken
// for one that runs. Everybody may read it, and so may lock it for reading: it is made anew by each service,
// and locked before anybody else can open it. It is removed at the service's own end.
class RunningMark {
  public:
    // Throws std::system_error when the file cannot be made, or when another service holds it.
    explicit RunningMark(const std::string& path);
    ~RunningMark();
    RunningMark(const RunningMark&) = delete;
    RunningMark& operator=(const RunningMark&) = delete;

    // Notes what keeps the overrides from having an effect, in one line; empty when nothing does.
    void note(const std::string& trouble);

  private:
    const std::string _path;
    const int _file;
    std::string _trouble;
};

struct RunningState {
    bool runs = false;
    std::string trouble; // as noted last
};

// How the service that is marked by this file fares. Any process, any user, any thread.
RunningState readRunningMark(const std::string& path);

} // namespace welcomer::resolver
