// Watching a folder that comes and goes.

#pragma once

#include <string>

namespace welcomer::resolver {

// Tells of changes in a folder and of its own coming and going. Everything between two calls of `rearm` is
// told of, so whoever looks at the folder after `rearm`, and again after each change, ends with what is
// there.
class FolderWatch {
  public:
    // Throws std::system_error when the folder above cannot be watched.
    explicit FolderWatch(const std::string& folder);
    ~FolderWatch();
    FolderWatch(const FolderWatch&) = delete;
    FolderWatch& operator=(const FolderWatch&) = delete;

    // Readable when something has changed.
    int descriptor() const { return _inotify; }

    // Watches the folder that is there now.
    void rearm();

    // Takes what has been told so far; whether any of it is about the folder. Never blocks.
    bool drain();

  private:
    std::string _folder;
    std::string _name; // the folder's own name in the folder above
    int _inotify;
    int _above = -1;
    int _inside = -1; // negative while there is no folder
};

} // namespace welcomer::resolver
