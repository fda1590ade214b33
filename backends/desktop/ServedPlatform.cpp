#include "backends/desktop/ServedPlatform.h"

namespace welcomer::desktop {

namespace {

PlatformOptions standingOn(PlatformOptions options, platform::SignInDirectory& signIn) {
    options.signInDirectory = &signIn;
    return options;
}

} // namespace

ServedPlatform::ServedPlatform(const PlatformOptions& options)
    : _modules{options.systemLog ? options.systemLog : &_systemLog},
      _nimbusDirectory(posix::RootFolder(options.root)),
      _signIn(_nimbusDirectory,
              {[address = options.accountServer] { return AccountServerSettings{address}; },
               [this] {
                   return accountserver::Machine{
                       _local.productName().value_or(""),
                       _local.platform().systemVersionInfo.productVersion().value_or(""), messagesLocale()};
               }},
              _modules),
      _local(standingOn(options, _signIn)) {}

std::vector<platform::BackendReport> ServedPlatform::backendReports() {
    std::vector<platform::BackendReport> reports = _local.backendReports();
    reports.push_back(*_signIn.report()); // a server is named
    return reports;
}

} // namespace welcomer::desktop
