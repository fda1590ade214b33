// A file system in memory.

#pragma once

#include "platform/FileSystem.h"
#include "tests/fakes/CallRecorder.h"

#include <map>
#include <memory>
#include <mutex>
#include <optional>
#include <string>
#include <utility>
#include <vector>

namespace welcomer::fakes {

// Begins with the root folder alone. A folder lists its entries in the order in which they were made.
// Recorded as "FileSystem.remove /path", "FileSystem.copy /from, /to" and so on. Any thread.
class FakeFileSystem final : public platform::FileSystem {
  public:
    enum class Operation { Exists, Remove, CreateDirectory, Copy, List, ReadText, WriteText };

    explicit FakeFileSystem(CallRecorder& recorder);
    ~FakeFileSystem() override;

    bool exists(const std::string& path) override;
    platform::Outcome remove(const std::string& path) override;
    platform::Outcome createDirectory(const std::string& path, mode_t mode) override;
    platform::Outcome copy(const std::string& source, const std::string& destination) override;
    std::optional<std::vector<std::string>> list(const std::string& path) override;
    std::optional<std::string> readText(const std::string& path) override;
    platform::Outcome writeText(const std::string& path, const std::string& text) override;

    // Each puts something in place with the parents that it needs (mode 0755), in place of what is there.
    // Nothing of this is recorded, and no failure applies.
    void addFile(const std::string& path, const std::string& content, mode_t mode = 0644);
    void addDirectory(const std::string& path, mode_t mode = 0755);
    void addSymbolicLink(const std::string& path, const std::string& target);

    // What is at a path, symbolic links followed; none when there is nothing of that kind.
    std::optional<std::string> content(const std::string& path) const;
    std::optional<mode_t> mode(const std::string& path) const;
    bool isDirectory(const std::string& path) const;

    // Has an operation fail from now on at a path (a copy: at its destination) and change nothing: `exists`
    // says no, `list` and `readText` have no result. The message is the platform's own when none is given.
    void fail(Operation operation, const std::string& path, int number, const std::string& message = {});

    // Ends every failure.
    void clearFailures();

  private:
    struct Node;

    // All with _mutex held. A null result sets the error number.
    Node* find(const std::string& path, bool followLast, int& number) const;
    Node* makeParents(const std::string& path) const;
    const platform::Error* injected(Operation operation, const std::string& path) const;

    CallRecorder& _recorder;
    mutable std::mutex _mutex;
    std::unique_ptr<Node> _root;
    std::map<std::pair<Operation, std::string>, platform::Error> _failures;
};

} // namespace welcomer::fakes
