#include "backends/local/PasswordHash.h"

#include <array>
#include <crypt.h>
#include <memory>
#include <string_view>

namespace welcomer::local {

namespace {

constexpr char kYescryptPrefix[] = "$y$";
constexpr unsigned long kDefaultCost = 0;

// The hash, or none when the setting is no good or the password too long.
std::optional<std::string> hashWithSetting(const std::string& password, const std::string& setting) {
    const auto scratch = std::make_unique<crypt_data>(); // too large for a stack
    const char* hash = ::crypt_rn(password.c_str(), setting.c_str(), scratch.get(), sizeof(crypt_data));
    return hash ? std::optional<std::string>(hash) : std::nullopt;
}

bool isEqual(std::string_view a, std::string_view b) {
    if (a.size() != b.size()) {
        return false;
    }
    unsigned difference = 0;
    for (std::size_t i = 0; i < a.size(); ++i) {
        difference |= static_cast<unsigned char>(a[i]) ^ static_cast<unsigned char>(b[i]);
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
    std::array<char, CRYPT_GENSALT_OUTPUT_SIZE> setting = {};
    if (holdsNUL(password) || !::crypt_gensalt_rn(kYescryptPrefix, kDefaultCost, nullptr, 0, setting.data(),
                                                  static_cast<int>(setting.size()))) {
        return std::nullopt;
    }
    return hashWithSetting(password, setting.data());
}

} // namespace welcomer::local
