// A delegate that loses its handler. How, says the response: "at once", "on another thread", "when it throws", "in a
// copy", or not at all: "called". With "throws in its thread" a thread ends the process; with
// "leaves things running" it completes.

#include <welcomer/DelegatePlugin.hpp>

#include <dlfcn.h>
#include <functional>
#include <optional>
#include <stdexcept>
#include <string>
#include <sys/prctl.h>
#include <thread>
#include <unistd.h>
#include <utility>

namespace sdk = welcomer::sdk;

namespace {

// The part of this library's file name before the first point.
std::string ownName() {
    Dl_info library{};
    if (::dladdr(reinterpret_cast<const void*>(&ownName), &library) == 0) {
        return "";
    }
    const std::string path = library.dli_fname;
    const std::string name = path.substr(path.rfind('/') + 1);
    return name.substr(0, name.find('.'));
}

// A thread and a process, each with a name of its own. They end by themselves.
void leaveThingsRunning() {
    if (::fork() == 0) {
        ::prctl(PR_SET_NAME, "left-process");
        ::sleep(20);
        ::_exit(0);
    }
    std::thread([] {
        ::prctl(PR_SET_NAME, "left-thread");
        ::sleep(20);
    }).detach();
}

class Dropping : public sdk::WLFirstRunDelegateConfiguration {
  public:
    std::optional<std::string> delegateIdentifier() override { return "org.example." + ownName(); }
    std::optional<sdk::Value> delegateSetupRequest() override { return std::nullopt; }

    void completeSetupWithResponseHandler(sdk::ValueView response, sdk::CompletionHandler handler) override {
        const std::string how = response.string().value_or("");
        if (how == "on another thread") {
            std::thread([moved = std::move(handler)] { static_cast<void>(moved); }).detach();
        } else if (how == "when it throws") {
            const std::function<void()> kept = [handler] {
                handler(true);
            };
            throw std::runtime_error("thrown with the handler");
        } else if (how == "in a copy") {
            _kept = handler;
            _kept.reset();
        } else if (how == "throws in its thread") {
            std::thread([handler] { throw std::runtime_error("thrown in a thread"); }).detach();
        } else if (how == "leaves things running") {
            leaveThingsRunning();
            handler(true);
        } else if (how == "called") {
            handler(true);
        }
    }

  private:
    std::optional<sdk::CompletionHandler> _kept;
};

} // namespace

WL_EXPORT_DELEGATE_PLUGIN(Dropping)
