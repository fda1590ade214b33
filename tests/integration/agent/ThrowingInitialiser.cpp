// A library whose initialisers throw, which nothing around its loading can catch.

#include <stdexcept>

namespace {

struct Thrower {
    Thrower() { throw std::runtime_error("thrown\nwhile loading"); }
};

[[maybe_unused]] const Thrower thrower;

} // namespace
