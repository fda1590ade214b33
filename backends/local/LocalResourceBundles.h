// Bundles as folders that hold a folder "Resources", and in it the string table "Localizable.strings", a
// property list of texts. Tables in other languages are in folders named after the language, "de_DE" or "de",
// beside it; the language is the one that the environment names for messages.

#pragma once

#include "backends/posix/RootFolder.h"
#include "platform/ResourceBundle.h"

#include <string>

namespace welcomer::local {

class LocalResourceBundles final : public platform::ResourceBundles {
  public:
    //  mainBundle  the main bundle's folder, a path of this machine: the application is where it is, whatever
    //              the root; empty: it has none
    explicit LocalResourceBundles(posix::RootFolder root, std::string mainBundle = {})
        : _root(std::move(root)),
          _mainBundle(std::move(mainBundle)) {}

    std::unique_ptr<platform::ResourceBundle> open(const std::string& path) override;
    std::unique_ptr<platform::ResourceBundle> openMainBundle() override;

  private:
    const posix::RootFolder _root;
    const std::string _mainBundle;
};

} // namespace welcomer::local
