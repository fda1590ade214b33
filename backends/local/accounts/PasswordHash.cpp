#include "backends/local/accounts/PasswordHash.h"

#include <array>
#include <crypt.h>
#include <cstring>
#include <dlfcn.h>
#include <memory>
#include <string_view>

namespace welcomer::local {

namespace {

constexpr char kLibrary[] = "libcrypt.so.1";
constexpr char kYescryptPrefix[] = "$y$";
constexpr unsigned long kDefaultCost = 0;

// Loaded when the first password is at hand: the agent, which never sees one, starts without it.
struct CryptLibrary {
    CryptLibrary() {
        void* const library = ::dlopen(kLibrary, RTLD_NOW | RTLD_LOCAL);
        if (library) {
            hash = reinterpret_cast<decltype(hash)>(::dlsym(library, "crypt_rn"));
            makeSetting = reinterpret_cast<decltype(makeSetting)>(::dlsym(library, "crypt_gensalt_rn"));
        }
    }

    decltype(&::crypt_rn) hash = nullptr;
    decltype(&::crypt_gensalt_rn) makeSetting = nullptr;
};

const CryptLibrary& cryptLibrary() {
    static const CryptLibrary library;
    return library;
}

// The hash, or none when the setting is no good or the password too long.
std::optional<std::string> hashWithSetting(const std::string& password, const std::string& setting) {
    const auto hash = cryptLibrary().hash;
    if (!hash) {
        return std::nullopt;
    }
    const auto scratch = std::make_unique<crypt_data>(); // too large for a stack
    const char* const text = hash(password.c_str(), setting.c_str(), scratch.get(), sizeof(crypt_data));
    std::optional<std::string> result = text ? std::optional<std::string>(text) : std::nullopt;
    ::explicit_bzero(scratch.get(), sizeof(crypt_data)); // what it was worked out from
    return result;
}

bool isEqual(std::string_view a, std::string_view b) {
    if (a.size() != b.size()) {
        return false;
    }
    unsigned difference = 0;
    for (std::size_t i = 0; i < a.size(); ++i) {
        difference |= static_cast<unsigned char>(a[i] ^ b[i]);
    }
    return difference == 0;
}

bool holdsNUL(const std::string& text) {
    return text.find('\0') != std::string::npos; // crypt(3) would ignore what follows it
}

} // namespace

bool passwordMatches(const std::string& password, const std::string& hash) {
    if (holdsNUL(password) || holdsNUL(hash)) {
        return false;
    }
    const std::optional<std::string> computed = hashWithSetting(password, hash);
    return computed && isEqual(*computed, hash);
}

std::optional<std::string> makePasswordHash(const std::string& password) {
    const auto makeSetting = cryptLibrary().makeSetting;
    std::array<char, CRYPT_GENSALT_OUTPUT_SIZE> setting = {};
    if (holdsNUL(password) || !makeSetting ||
        !makeSetting(kYescryptPrefix, kDefaultCost, nullptr, 0, setting.data(),
                     static_cast<int>(setting.size()))) {
        return std::nullopt;
    }
    return hashWithSetting(password, setting.data());
}

} // namespace welcomer::local
