#include "backends/local/LocalPluginBundle.h"

#include "tests/contract/TemporaryRoot.h"

#include <gtest/gtest.h>

#include <dlfcn.h>
#include <filesystem>
#include <sys/stat.h>

namespace welcomer::local {

namespace {

constexpr char kSymbol[] = "wl_contract_number";

std::string info(const std::string& executable) {
    return "<?xml version=\"1.0\"?><plist version=\"1.0\"><dict><key>Executable</key><string>" + executable +
           "</string></dict></plist>";
}

class LocalPluginBundleTest : public testing::Test {
  protected:
    void addLibrary(const std::string& path) {
        std::filesystem::create_directories(std::filesystem::path(root.locate(path)).parent_path());
        std::filesystem::copy_file(WELCOMER_CONTRACT_LIBRARY, root.locate(path));
    }

    platform::PluginSymbol load(const std::string& path) { return bundles.load(path, kSymbol); }

    TemporaryRoot root;
    LocalPluginBundle bundles{posix::RootFolder(root.path())};
};

} // namespace

TEST_F(LocalPluginBundleTest, AFoldersExecutableIsLoaded) {
    addLibrary("/folder.ncdplugin/library.so");
    root.addFile("/folder.ncdplugin/Info.plist", info("library.so"));
    addLibrary("/deep.ncdplugin/Contents/library.so");
    root.addFile("/deep.ncdplugin/Info.plist", info("Contents/library.so"));

    for (const char* path : {"/folder.ncdplugin", "/deep.ncdplugin", "/folder.ncdplugin/"}) {
        const platform::PluginSymbol symbol = load(path);
        ASSERT_NE(symbol.address, nullptr) << path << ": " << symbol.reason;
        EXPECT_EQ(*static_cast<const int*>(symbol.address), 42);
    }
}

TEST_F(LocalPluginBundleTest, AnExecutableOutsideOfItsFolderIsRefused) {
    addLibrary("/outside.so");
    addLibrary("/folder.ncdplugin-too/library.so");
    std::filesystem::create_directory(root.locate("/folder.ncdplugin"));
    std::filesystem::create_symlink("../outside.so", root.locate("/folder.ncdplugin/link.so"));

    for (const std::string& executable : {std::string("../outside.so"), std::string("link.so"),
                                          std::string("../folder.ncdplugin-too/library.so"),
                                          std::string("../../../../../../../../../outside.so")}) {
        root.addFile("/folder.ncdplugin/Info.plist", info(executable));
        const platform::PluginSymbol symbol = load("/folder.ncdplugin");
        EXPECT_EQ(symbol.address, nullptr) << executable;
        EXPECT_NE(symbol.reason.find("outside"), std::string::npos) << symbol.reason;
    }
}

TEST_F(LocalPluginBundleTest, AFolderThatIsASymbolicLinkIsWhatItPointsTo) {
    addLibrary("/folder/library.so");
    root.addFile("/folder/Info.plist", info("library.so"));
    std::filesystem::create_symlink("folder", root.locate("/link.ncdplugin"));

    EXPECT_NE(load("/link.ncdplugin").address, nullptr);
}

TEST_F(LocalPluginBundleTest, AFolderSaysWhatItLacks) {
    std::filesystem::create_directory(root.locate("/folder.ncdplugin"));
    const std::string path = root.locate("/folder.ncdplugin/Info.plist");
    EXPECT_EQ(load("/folder.ncdplugin").reason, "cannot read " + path + ": No such file or directory");

    root.addFile("/folder.ncdplugin/Info.plist", "<?xml version=\"1.0\"?><plist version=\"1.0\"><dict>");
    EXPECT_TRUE(load("/folder.ncdplugin").reason.starts_with(path + ": line 1"));

    root.addFile("/folder.ncdplugin/Info.plist", "{ Other = value; }");
    EXPECT_EQ(load("/folder.ncdplugin").reason, path + ": no Executable");

    root.addFile("/folder.ncdplugin/Info.plist", "{ Executable = (); }");
    EXPECT_EQ(load("/folder.ncdplugin").reason, path + ": no Executable");

    root.addFile("/folder.ncdplugin/Info.plist", info("missing.so"));
    EXPECT_EQ(load("/folder.ncdplugin").reason,
              root.locate("/folder.ncdplugin") + ": its Executable is missing");

    root.addFile("/folder.ncdplugin/missing.so", "text");
    EXPECT_NE(load("/folder.ncdplugin").reason, "");
    EXPECT_EQ(load("/folder.ncdplugin").address, nullptr);

    root.addFile("/folder.ncdplugin/Info.plist", info("missing.so") + std::string(1 << 20, ' '));
    EXPECT_EQ(load("/folder.ncdplugin").reason, "cannot read " + path + ": File too large");
}

TEST_F(LocalPluginBundleTest, AnInfoFileThatIsAPipeDoesNotBlock) {
    std::filesystem::create_directory(root.locate("/folder.ncdplugin"));
    ASSERT_EQ(::mkfifo(root.locate("/folder.ncdplugin/Info.plist").c_str(), 0600), 0);

    EXPECT_EQ(load("/folder.ncdplugin").address, nullptr);
}

TEST_F(LocalPluginBundleTest, ALibraryThatIsAPipeDoesNotBlock) {
    ASSERT_EQ(::mkfifo(root.locate("/pipe.ncdplugin").c_str(), 0600), 0);

    EXPECT_EQ(load("/pipe.ncdplugin").reason, root.locate("/pipe.ncdplugin") + " is no regular file");
}

TEST_F(LocalPluginBundleTest, ALibraryIsNotMappedUntilAllOfItIsThere) {
    addLibrary("/half.ncdplugin");
    const std::filesystem::path half = root.locate("/half.ncdplugin");
    const auto size = std::filesystem::file_size(half);
    for (const auto length : {size - 1, size / 2, std::uintmax_t{70}}) {
        std::filesystem::resize_file(half, length);
        EXPECT_TRUE(load("/half.ncdplugin")
                        .reason.starts_with(half.string() + " is not whole: it has " +
                                            std::to_string(length) + " of "))
            << load("/half.ncdplugin").reason;
    }
    // So short that it is no library at all, which is the loader's to tell.
    std::filesystem::resize_file(half, 10);
    EXPECT_NE(load("/half.ncdplugin").reason, "");
}

TEST_F(LocalPluginBundleTest, WhatOthersMayWriteIsRefused) {
    addLibrary("/library.ncdplugin");
    ASSERT_EQ(::chmod(root.locate("/library.ncdplugin").c_str(), 0646), 0);

    EXPECT_EQ(load("/library.ncdplugin").reason, "everybody may write " + root.locate("/library.ncdplugin"));
}

TEST_F(LocalPluginBundleTest, ALibraryStaysLoadedAndKeepsItsSymbolsToItself) {
    addLibrary("/library.ncdplugin");

    const platform::PluginSymbol symbol = load("/library.ncdplugin");

    ASSERT_NE(symbol.address, nullptr);
    void* const again = ::dlopen(root.locate("/library.ncdplugin").c_str(), RTLD_NOW | RTLD_NOLOAD);
    EXPECT_NE(again, nullptr);
    ::dlclose(again);
    EXPECT_EQ(*static_cast<const int*>(symbol.address), 42);
    EXPECT_EQ(::dlsym(RTLD_DEFAULT, kSymbol), nullptr);
}

TEST_F(LocalPluginBundleTest, AFoldersLibraryStaysLoadedAndKeepsItsSymbolsToItselfToo) {
    addLibrary("/folder.ncdplugin/library.so");
    root.addFile("/folder.ncdplugin/Info.plist", info("library.so"));

    const platform::PluginSymbol symbol = load("/folder.ncdplugin");

    ASSERT_NE(symbol.address, nullptr);
    void* const again = ::dlopen(root.locate("/folder.ncdplugin/library.so").c_str(), RTLD_NOW | RTLD_NOLOAD);
    EXPECT_NE(again, nullptr);
    ::dlclose(again);
    EXPECT_EQ(*static_cast<const int*>(symbol.address), 42);
    EXPECT_EQ(::dlsym(RTLD_DEFAULT, kSymbol), nullptr);
}

TEST_F(LocalPluginBundleTest, AFoldersLibraryWithUnresolvedSymbolsIsRefusedWhenItIsLoadedToo) {
    std::filesystem::create_directory(root.locate("/folder.ncdplugin"));
    std::filesystem::copy_file(WELCOMER_UNRESOLVED_LIBRARY, root.locate("/folder.ncdplugin/library.so"));
    root.addFile("/folder.ncdplugin/Info.plist", info("library.so"));

    const platform::PluginSymbol symbol = load("/folder.ncdplugin");

    EXPECT_EQ(symbol.address, nullptr);
    EXPECT_NE(symbol.reason.find("wl_defined_nowhere"), std::string::npos) << symbol.reason;
}

TEST_F(LocalPluginBundleTest, ALibraryWithUnresolvedSymbolsIsRefusedWhenItIsLoaded) {
    const platform::PluginSymbol symbol =
        LocalPluginBundle(posix::RootFolder("/")).load(WELCOMER_UNRESOLVED_LIBRARY, kSymbol);

    EXPECT_EQ(symbol.address, nullptr);
    EXPECT_NE(symbol.reason.find("wl_defined_nowhere"), std::string::npos) << symbol.reason;
}

} // namespace welcomer::local
