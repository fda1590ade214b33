#include "tools/welcomer/terminal/LineEditor.h"

#include "tools/welcomer/terminal/UTF8Characters.h"

#include <cstdio>
#include <cstdlib>
#include <dlfcn.h>
#include <fcntl.h>
#include <histedit.h>
#include <memory>
#include <type_traits>

namespace welcomer::tool {

namespace {

struct Library {
    decltype(&el_init) init = nullptr;
    decltype(&el_end) end = nullptr;
    decltype(&el_set) set = nullptr;
    decltype(&el_get) get = nullptr;
    decltype(&el_gets) gets = nullptr;

    bool isWhole() const { return init && end && set && get && gets; }
};

// Loaded once, and for as long as the program runs.
const Library& library() {
    static const Library loaded = [] {
        Library found;
        if (void* const handle = dlopen("libedit.so.2", RTLD_NOW | RTLD_LOCAL)) {
            const auto find = [handle](auto& function, const char* name) {
                function = reinterpret_cast<std::remove_reference_t<decltype(function)>>(dlsym(handle, name));
            };
            find(found.init, "el_init");
            find(found.end, "el_end");
            find(found.set, "el_set");
            find(found.get, "el_get");
            find(found.gets, "el_gets");
        }
        return found;
    }();
    return loaded;
}

char* promptOf(EditLine* editor) {
    void* prompt = nullptr;
    library().get(editor, EL_CLIENTDATA, &prompt);
    return static_cast<char*>(prompt);
}

} // namespace

LineEditor::LineEditor(int terminal) : _terminal(terminal) {}

bool LineEditor::isThere() const {
    return library().isWhole();
}

std::optional<std::string> LineEditor::readLine(const std::string& prompt) const {
    const UTF8Characters characters;
    const std::unique_ptr<FILE, int (*)(FILE*)> terminal(fdopen(fcntl(_terminal, F_DUPFD_CLOEXEC, 0), "r+"),
                                                         std::fclose);
    if (!terminal) {
        return std::nullopt;
    }
    const std::unique_ptr<EditLine, decltype(&el_end)> editor(
        library().init("welcomer", terminal.get(), terminal.get(), terminal.get()), library().end);
    if (!editor) {
        return std::nullopt;
    }
    std::string shown = prompt;
    library().set(editor.get(), EL_CLIENTDATA, shown.data());
    library().set(editor.get(), EL_PROMPT, promptOf);
    library().set(editor.get(), EL_EDITOR, "emacs");
    library().set(editor.get(), EL_SIGNAL, 1);
    // Before the prompt: what is typed at once would still be the terminal's own, and Ctrl-D would be lost.
    library().set(editor.get(), EL_PREP_TERM, 1);
    int count = 0;
    const char* const line = library().gets(editor.get(), &count);
    if (!line || count <= 0) {
        return std::nullopt;
    }
    std::string text(line, static_cast<std::size_t>(count));
    if (text.ends_with('\n')) {
        text.pop_back();
    }
    return text;
}

} // namespace welcomer::tool
