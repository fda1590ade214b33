#include "tests/fakes/FakeFileSystem.h"

#include "propertylist/UTF8.h"

#include <algorithm>
#include <cerrno>
#include <deque>
#include <string_view>
#include <system_error>

namespace welcomer::fakes {

namespace {

enum class Kind { File, Directory, SymbolicLink };

constexpr int kMaximumLinks = 40;

std::deque<std::string> componentsOf(std::string_view path) {
    std::deque<std::string> components;
    while (!path.empty()) {
        const std::size_t slash = path.find('/');
        if (slash != 0) {
            components.emplace_back(path.substr(0, slash));
        }
        path = slash == std::string_view::npos ? std::string_view() : path.substr(slash + 1);
    }
    return components;
}

std::string parentOf(const std::string& path) {
    const std::size_t end = path.find_last_not_of('/') + 1; // slashes at the end name nothing
    return path.substr(0, path.substr(0, end).rfind('/'));
}

std::string nameOf(const std::string& path) {
    const std::size_t end = path.find_last_not_of('/') + 1;
    const std::size_t slash = path.substr(0, end).rfind('/') + 1;
    return path.substr(slash, end - slash);
}

platform::Outcome failure(const std::string& what, int number) {
    return platform::Outcome::failure({number, what + ": " + std::generic_category().message(number)});
}

} // namespace

struct FakeFileSystem::Node {
    Kind kind = Kind::Directory;
    mode_t mode = 0755;
    std::string content; // of a symbolic link: its target
    std::vector<std::pair<std::string, std::unique_ptr<Node>>> entries;

    auto entry(const std::string& name) {
        return std::find_if(entries.begin(), entries.end(), [&](auto& each) { return each.first == name; });
    }

    Node* add(const std::string& name, Node node) {
        const auto present = entry(name);
        if (present != entries.end()) {
            *present->second = std::move(node);
            return present->second.get();
        }
        entries.emplace_back(name, std::make_unique<Node>(std::move(node)));
        return entries.back().second.get();
    }
};

FakeFileSystem::FakeFileSystem(CallRecorder& recorder)
    : _recorder(recorder),
      _root(std::make_unique<Node>()) {}

FakeFileSystem::~FakeFileSystem() = default;

FakeFileSystem::Node* FakeFileSystem::find(const std::string& path, bool followLast, int& number) const {
    std::deque<std::string> rest = componentsOf(path);
    std::vector<Node*> trail{_root.get()};
    int links = 0;
    while (!rest.empty()) {
        const std::string name = rest.front();
        rest.pop_front();
        if (trail.back()->kind != Kind::Directory) {
            number = ENOTDIR;
            return nullptr;
        }
        if (name == ".") {
            continue;
        }
        if (name == "..") {
            if (trail.size() > 1) {
                trail.pop_back();
            }
            continue;
        }
        const auto found = trail.back()->entry(name);
        if (found == trail.back()->entries.end()) {
            number = ENOENT;
            return nullptr;
        }
        Node* node = found->second.get();
        if (node->kind != Kind::SymbolicLink || (rest.empty() && !followLast)) {
            trail.push_back(node);
            continue;
        }
        if (++links > kMaximumLinks) {
            number = ELOOP;
            return nullptr;
        }
        if (node->content.starts_with('/')) {
            trail = {_root.get()};
        }
        const std::deque<std::string> target = componentsOf(node->content);
        rest.insert(rest.begin(), target.begin(), target.end());
    }
    return trail.back();
}

FakeFileSystem::Node* FakeFileSystem::makeParents(const std::string& path) const {
    Node* node = _root.get();
    for (const std::string& name : componentsOf(parentOf(path))) {
        const auto found = node->entry(name);
        node = found == node->entries.end() ? node->add(name, {}) : found->second.get();
    }
    return node;
}

const platform::Error* FakeFileSystem::injected(Operation operation, const std::string& path) const {
    const auto found = _failures.find({operation, path});
    return found == _failures.end() ? nullptr : &found->second;
}

bool FakeFileSystem::exists(const std::string& path) {
    _recorder.record("FileSystem.exists " + path);
    const std::lock_guard lock(_mutex);
    int number = 0;
    return !injected(Operation::Exists, path) && find(path, true, number);
}

platform::Outcome FakeFileSystem::remove(const std::string& path) {
    _recorder.record("FileSystem.remove " + path);
    const std::lock_guard lock(_mutex);
    if (const platform::Error* error = injected(Operation::Remove, path)) {
        return platform::Outcome::failure(*error);
    }
    int number = 0;
    if (!find(path, false, number)) {
        return failure("cannot remove " + path, number);
    }
    if (nameOf(path).empty()) {
        return failure("cannot remove " + path, EBUSY);
    }
    Node* parent = find(parentOf(path), true, number);
    parent->entries.erase(parent->entry(nameOf(path)));
    return platform::Outcome::success();
}

platform::Outcome FakeFileSystem::createDirectory(const std::string& path, mode_t mode) {
    _recorder.record("FileSystem.createDirectory " + path);
    const std::lock_guard lock(_mutex);
    if (const platform::Error* error = injected(Operation::CreateDirectory, path)) {
        return platform::Outcome::failure(*error);
    }
    const std::string what = "cannot create " + path;
    int number = 0;
    if (find(path, false, number)) {
        return failure(what, EEXIST);
    }
    Node* parent = find(parentOf(path), true, number);
    if (!parent || parent->kind != Kind::Directory) {
        return failure(what, parent ? ENOTDIR : number);
    }
    parent->add(nameOf(path), {Kind::Directory, mode, {}, {}});
    return platform::Outcome::success();
}

platform::Outcome FakeFileSystem::copy(const std::string& source, const std::string& destination) {
    _recorder.record("FileSystem.copy " + source + ", " + destination);
    const std::lock_guard lock(_mutex);
    if (const platform::Error* error = injected(Operation::Copy, destination)) {
        return platform::Outcome::failure(*error);
    }
    const std::string what = "cannot copy " + source + " to " + destination;
    int number = 0;
    const Node* from = find(source, true, number);
    if (!from) {
        return failure(what, number);
    }
    if (from->kind != Kind::File) {
        return failure(what, EISDIR);
    }
    if (find(destination, false, number)) {
        return failure(what, EEXIST);
    }
    Node* parent = find(parentOf(destination), true, number);
    if (!parent || parent->kind != Kind::Directory) {
        return failure(what, parent ? ENOTDIR : number);
    }
    parent->add(nameOf(destination), {Kind::File, from->mode, from->content, {}});
    return platform::Outcome::success();
}

std::optional<std::vector<std::string>> FakeFileSystem::list(const std::string& path) {
    _recorder.record("FileSystem.list " + path);
    const std::lock_guard lock(_mutex);
    int number = 0;
    const Node* node = injected(Operation::List, path) ? nullptr : find(path, true, number);
    if (!node || node->kind != Kind::Directory) {
        return std::nullopt;
    }
    std::vector<std::string> names;
    for (const auto& [name, entry] : node->entries) {
        names.push_back(name);
    }
    return names;
}

std::optional<std::string> FakeFileSystem::readText(const std::string& path) {
    _recorder.record("FileSystem.readText " + path);
    const std::lock_guard lock(_mutex);
    int number = 0;
    const Node* node = injected(Operation::ReadText, path) ? nullptr : find(path, true, number);
    if (!node || node->kind != Kind::File || node->content.size() > platform::kMaximumTextSize ||
        findInvalidUTF8(node->content) != std::string::npos) {
        return std::nullopt;
    }
    return node->content;
}

platform::Outcome FakeFileSystem::writeText(const std::string& path, const std::string& text) {
    _recorder.record("FileSystem.writeText " + path);
    const std::lock_guard lock(_mutex);
    if (const platform::Error* error = injected(Operation::WriteText, path)) {
        return platform::Outcome::failure(*error);
    }
    const std::string what = "cannot write " + path;
    int number = 0;
    if (Node* node = find(path, true, number)) {
        if (node->kind != Kind::File) {
            return failure(what, EISDIR);
        }
        node->content = text;
        return platform::Outcome::success();
    }
    if (find(path, false, number)) {
        return failure(what, ENOENT); // a dangling link
    }
    Node* parent = find(parentOf(path), true, number);
    if (!parent || parent->kind != Kind::Directory) {
        return failure(what, parent ? ENOTDIR : number);
    }
    parent->add(nameOf(path), {Kind::File, 0644, text, {}});
    return platform::Outcome::success();
}

void FakeFileSystem::addFile(const std::string& path, const std::string& content, mode_t mode) {
    const std::lock_guard lock(_mutex);
    makeParents(path)->add(nameOf(path), {Kind::File, mode, content, {}});
}

void FakeFileSystem::addDirectory(const std::string& path, mode_t mode) {
    const std::lock_guard lock(_mutex);
    makeParents(path)->add(nameOf(path), {Kind::Directory, mode, {}, {}});
}

void FakeFileSystem::addSymbolicLink(const std::string& path, const std::string& target) {
    const std::lock_guard lock(_mutex);
    makeParents(path)->add(nameOf(path), {Kind::SymbolicLink, 0777, target, {}});
}

std::optional<std::string> FakeFileSystem::content(const std::string& path) const {
    const std::lock_guard lock(_mutex);
    int number = 0;
    const Node* node = find(path, true, number);
    return node && node->kind == Kind::File ? std::optional(node->content) : std::nullopt;
}

std::optional<mode_t> FakeFileSystem::mode(const std::string& path) const {
    const std::lock_guard lock(_mutex);
    int number = 0;
    const Node* node = find(path, true, number);
    return node ? std::optional(node->mode) : std::nullopt;
}

bool FakeFileSystem::isDirectory(const std::string& path) const {
    const std::lock_guard lock(_mutex);
    int number = 0;
    const Node* node = find(path, true, number);
    return node && node->kind == Kind::Directory;
}

void FakeFileSystem::fail(Operation operation, const std::string& path, int number,
                          const std::string& message) {
    const std::lock_guard lock(_mutex);
    _failures[{operation, path}] = {
        number, message.empty() ? path + ": " + std::generic_category().message(number) : message};
}

void FakeFileSystem::clearFailures() {
    const std::lock_guard lock(_mutex);
    _failures.clear();
}

} // namespace welcomer::fakes
