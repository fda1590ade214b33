// The stamp that makes starting the agents once per login, whoever tries.

#pragma once

#include <string>

namespace welcomer::launch {

// An empty file in the folder that lives as long as the user's login.
class LoginStamp {
  public:
    // What became of an attempt to set the stamp.
    enum class Result { Set, WasThere, Impossible };

    //  runtimeFolder  the login's own folder, or empty when it has none
    explicit LoginStamp(std::string runtimeFolder);

    // Sets the stamp. Of several processes at once, one sets it and the others find it there. When it is
    // impossible, the reason is logged.
    Result set() const;

    // Takes the stamp away, at the end of the login: the folder stays where the user's services may linger.
    void remove() const;

  private:
    std::string _runtimeFolder;
    std::string _path;
};

} // namespace welcomer::launch
