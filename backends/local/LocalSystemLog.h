// The system log of the C library.

#pragma once

#include "platform/SystemLog.h"

namespace welcomer::local {

// The log is never opened with an identity: the records carry the program's name. A NUL in a message is
// written as "\0", since the C library's text would end there.
class LocalSystemLog final : public platform::SystemLog {
  public:
    void write(int priority, const std::string& message) override;
};

} // namespace welcomer::local
