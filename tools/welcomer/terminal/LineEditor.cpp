#include "tools/welcomer/terminal/LineEditor.h"

#include "tools/welcomer/terminal/TerminalRestorer.h"
#include "tools/welcomer/terminal/UTF8Characters.h"

#include <cstdio>
#include <dlfcn.h>
#include <fcntl.h>
#include <histedit.h>
#include <memory>

namespace welcomer::tool {

namespace {

struct Library {
    decltype(&el_init) init;
    decltype(&el_end) end;
    decltype(&el_set) set;
    decltype(&el_get) get;
    decltype(&el_gets) gets;
};

template <typename Function>
bool find(void* handle, const char* name, Function& function) {
    function = reinterpret_cast<Function>(dlsym(handle, name));
    return function != nullptr;
}

std::optional<Library> load() {
    void* const handle = dlopen("libedit.so.2", RTLD_NOW | RTLD_LOCAL);
    Library found{};
    const bool isWhole = handle && find(handle, "el_init", found.init) && find(handle, "el_end", found.end) &&
                         find(handle, "el_set", found.set) && find(handle, "el_get", found.get) &&
                         find(handle, "el_gets", found.gets);
    return isWhole ? std::optional(found) : std::nullopt;
}

// Loaded once, and for as long as the program runs.
const std::optional<Library>& library() {
    static const std::optional<Library> loaded = load();
    return loaded;
}

char* promptOf(EditLine* editor) {
    void* prompt = nullptr;
    library()->get(editor, EL_CLIENTDATA, &prompt);
    return static_cast<char*>(prompt);
}

} // namespace

LineEditor::LineEditor(int terminal) : _terminal(terminal) {}

bool LineEditor::isThere() const {
    return library().has_value();
}

std::optional<std::string> LineEditor::readLine(const std::string& prompt) const {
    const UTF8Characters characters;
    const std::unique_ptr<FILE, int (*)(FILE*)> terminal(fdopen(fcntl(_terminal, F_DUPFD_CLOEXEC, 0), "r+"),
                                                         std::fclose);
    if (!terminal) {
        return std::nullopt;
    }
    const TerminalRestorer restorer(_terminal);
    const std::unique_ptr<EditLine, decltype(&el_end)> editor(
        library()->init("welcomer", terminal.get(), terminal.get(), terminal.get()), library()->end);
    if (!editor) {
        return std::nullopt;
    }
    std::string shown = prompt;
    library()->set(editor.get(), EL_CLIENTDATA, shown.data());
    library()->set(editor.get(), EL_PROMPT, promptOf);
    library()->set(editor.get(), EL_EDITOR, "emacs");
    library()->set(editor.get(), EL_SIGNAL, 1);
    // Before the prompt: what is typed at once would still be the terminal's own, and Ctrl-D would be lost.
    library()->set(editor.get(), EL_PREP_TERM, 1);
    int count = 0;
    const char* const line = library()->gets(editor.get(), &count);
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
