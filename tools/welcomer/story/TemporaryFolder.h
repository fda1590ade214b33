// A fresh folder that is removed with all that is in it.

#pragma once

#include <filesystem>

namespace welcomer::tool {

class TemporaryFolder {
  public:
    // Makes it in the machine's folder for temporary files. Throws CommandFailure.
    TemporaryFolder();
    ~TemporaryFolder();
    TemporaryFolder(const TemporaryFolder&) = delete;
    TemporaryFolder& operator=(const TemporaryFolder&) = delete;

    const std::filesystem::path& path() const { return _path; }

  private:
    std::filesystem::path _path;
};

} // namespace welcomer::tool
