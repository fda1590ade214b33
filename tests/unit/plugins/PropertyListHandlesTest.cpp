#include "plugins/PropertyListHandles.h"

#include <gtest/gtest.h>
#include <limits>
#include <string>

namespace welcomer {
namespace {

const wl_host& host = delegatePluginHost();

PropertyList everyType() {
    return PropertyList::Dictionary{
        {"array", PropertyList::Array{"a", 2}},
        {"boolean", true},
        {"data", PropertyList::Data{std::string("\0\1", 2)}},
        {"date", PropertyList::Date{1.5}},
        {"dictionary", PropertyList::Dictionary{{"k", "v"}}},
        {"integer", -7},
        {"large", std::numeric_limits<std::uint64_t>::max()},
        {"real", 2.5},
        {"string", std::string("a\0b", 3)},
    };
}

const wl_value* get(const PropertyList& value, const char* key) {
    return host.dictionary_get(borrowedHandle(value), key, WL_NUL_TERMINATED);
}

TEST(PropertyListHandles, HostSaysItsVersionAndSize) {
    EXPECT_EQ(host.abi_version, WL_DELEGATE_PLUGIN_ABI_VERSION);
    EXPECT_EQ(host.size, sizeof(wl_host));
}

TEST(PropertyListHandles, GiveTheTypeOfEachValue) {
    const PropertyList value = everyType();
    EXPECT_EQ(host.value_type(borrowedHandle(value)), WL_VALUE_DICTIONARY);
    EXPECT_EQ(host.value_type(get(value, "array")), WL_VALUE_ARRAY);
    EXPECT_EQ(host.value_type(get(value, "boolean")), WL_VALUE_BOOLEAN);
    EXPECT_EQ(host.value_type(get(value, "data")), WL_VALUE_DATA);
    EXPECT_EQ(host.value_type(get(value, "date")), WL_VALUE_DATE);
    EXPECT_EQ(host.value_type(get(value, "integer")), WL_VALUE_INTEGER);
    EXPECT_EQ(host.value_type(get(value, "large")), WL_VALUE_INTEGER);
    EXPECT_EQ(host.value_type(get(value, "real")), WL_VALUE_REAL);
    EXPECT_EQ(host.value_type(get(value, "string")), WL_VALUE_STRING);
    EXPECT_EQ(host.value_type(get(value, "missing")), WL_VALUE_NONE);
}

TEST(PropertyListHandles, GiveContents) {
    const PropertyList value = everyType();
    bool boolean = false;
    EXPECT_TRUE(host.get_boolean(get(value, "boolean"), &boolean));
    EXPECT_TRUE(boolean);
    std::int64_t integer = 0;
    EXPECT_TRUE(host.get_integer(get(value, "integer"), &integer));
    EXPECT_EQ(integer, -7);
    std::uint64_t large = 0;
    EXPECT_TRUE(host.get_unsigned(get(value, "large"), &large));
    EXPECT_EQ(large, std::numeric_limits<std::uint64_t>::max());
    double real = 0;
    EXPECT_TRUE(host.get_real(get(value, "real"), &real));
    EXPECT_EQ(real, 2.5);
    EXPECT_TRUE(host.get_date(get(value, "date"), &real));
    EXPECT_EQ(real, 1.5);
    std::size_t length = 0;
    const char* text = host.get_string(get(value, "string"), &length);
    EXPECT_EQ(std::string(text, length), std::string("a\0b", 3));
    const void* bytes = host.get_data(get(value, "data"), &length);
    EXPECT_EQ(std::string(static_cast<const char*>(bytes), length), std::string("\0\1", 2));
    EXPECT_NE(host.get_data(get(value, "data"), nullptr), nullptr);
    EXPECT_EQ(host.count(borrowedHandle(value)), value.dictionary()->size());
    EXPECT_EQ(host.count(get(value, "array")), 2U);
    EXPECT_EQ(host.count(get(value, "string")), 0U);
    EXPECT_STREQ(host.get_string(host.array_at(get(value, "array"), 0), nullptr), "a");
    EXPECT_EQ(host.array_at(get(value, "array"), 2), nullptr);
}

TEST(PropertyListHandles, KeepTypesApartAndLeaveTheResultAlone) {
    const PropertyList value = everyType();
    bool boolean = false;
    EXPECT_FALSE(host.get_boolean(get(value, "integer"), &boolean));
    std::int64_t integer = 3;
    EXPECT_FALSE(host.get_integer(get(value, "boolean"), &integer));
    EXPECT_FALSE(host.get_integer(get(value, "real"), &integer));
    EXPECT_FALSE(host.get_integer(get(value, "large"), &integer));
    EXPECT_EQ(integer, 3);
    std::uint64_t number = 3;
    EXPECT_FALSE(host.get_unsigned(get(value, "integer"), &number));
    EXPECT_EQ(number, 3U);
    double real = 3;
    EXPECT_FALSE(host.get_real(get(value, "integer"), &real));
    EXPECT_FALSE(host.get_date(get(value, "real"), &real));
    EXPECT_EQ(real, 3);
    EXPECT_EQ(host.get_string(get(value, "data"), nullptr), nullptr);
    EXPECT_EQ(host.get_data(get(value, "string"), nullptr), nullptr);
}

TEST(PropertyListHandles, WalkADictionaryInKeyOrder) {
    const PropertyList value = PropertyList::Dictionary{{"b", 2},
                                                        {"a", 1},
                                                        {std::string("a\0z", 3), 3},
                                                        {"", 0}}; // keys that a C string could not tell apart
    const char* key = nullptr;
    std::size_t length = 0;
    const wl_value* entry = nullptr;
    std::vector<std::string> keys;
    while (host.dictionary_next(borrowedHandle(value), &key, &length, &entry)) {
        keys.emplace_back(key, length);
        EXPECT_EQ(host.value_type(entry), WL_VALUE_INTEGER);
    }
    EXPECT_EQ(keys, (std::vector<std::string>{"", "a", std::string("a\0z", 3), "b"}));
}

TEST(PropertyListHandles, BuildEveryType) {
    wl_value* array = host.new_array();
    EXPECT_TRUE(host.array_append(array, host.new_string("a", WL_NUL_TERMINATED)));
    EXPECT_TRUE(host.array_append(array, host.new_integer(2)));
    wl_value* inner = host.new_dictionary();
    EXPECT_TRUE(host.dictionary_set(inner, "k", 1, host.new_string("value", 1)));
    wl_value* value = host.new_dictionary();
    const auto set = [&](const char* key, wl_value* entry) {
        EXPECT_TRUE(host.dictionary_set(value, key, WL_NUL_TERMINATED, entry)) << key;
    };
    set("array", array);
    set("boolean", host.new_boolean(true));
    set("data", host.new_data("\0\1", 2));
    set("date", host.new_date(1.5));
    set("dictionary", inner);
    set("integer", host.new_integer(-7));
    set("large", host.new_unsigned(std::numeric_limits<std::uint64_t>::max()));
    set("real", host.new_real(0));
    set("real", host.new_real(2.5)); // in place of the one before
    set("string", host.new_string("a\tb", 3));
    PropertyList expected = everyType();
    expected.dictionary()->insert_or_assign("string", "a\tb"); // a plug-in cannot build a NUL
    EXPECT_EQ(takeHandle(value), expected);
}

TEST(PropertyListHandles, CopyEverythingBelowAValue) {
    const PropertyList value = everyType();
    EXPECT_EQ(takeHandle(host.copy(borrowedHandle(value))), value);
}

TEST(PropertyListHandles, TolerateNullEverywhere) {
    bool boolean = false;
    std::int64_t integer = 0;
    std::uint64_t number = 0;
    double real = 0;
    EXPECT_EQ(host.value_type(nullptr), WL_VALUE_NONE);
    EXPECT_FALSE(host.get_boolean(nullptr, &boolean));
    EXPECT_FALSE(host.get_integer(nullptr, &integer));
    EXPECT_FALSE(host.get_unsigned(nullptr, &number));
    EXPECT_FALSE(host.get_real(nullptr, &real));
    EXPECT_FALSE(host.get_date(nullptr, &real));
    EXPECT_EQ(host.get_string(nullptr, nullptr), nullptr);
    EXPECT_EQ(host.get_data(nullptr, nullptr), nullptr);
    EXPECT_EQ(host.count(nullptr), 0U);
    EXPECT_EQ(host.array_at(nullptr, 0), nullptr);
    EXPECT_EQ(host.dictionary_get(nullptr, "k", 1), nullptr);
    EXPECT_FALSE(host.dictionary_next(nullptr, nullptr, nullptr, nullptr));
    EXPECT_EQ(host.copy(nullptr), nullptr);
    EXPECT_FALSE(host.array_append(nullptr, nullptr));
    EXPECT_FALSE(host.dictionary_set(nullptr, nullptr, 0, nullptr));
    EXPECT_EQ(host.new_string(nullptr, 0), nullptr);
    EXPECT_EQ(host.new_data(nullptr, 3), nullptr);
    EXPECT_FALSE(takeHandle(nullptr));
    host.release(nullptr);
    host.raise(nullptr, "nowhere");

    const PropertyList value = everyType();
    EXPECT_EQ(host.dictionary_get(borrowedHandle(value), nullptr, 0), nullptr);
    EXPECT_FALSE(host.get_boolean(get(value, "boolean"), nullptr));
    EXPECT_FALSE(host.get_date(get(value, "date"), nullptr));
    const char* key = nullptr;
    std::size_t length = 0;
    const wl_value* entry = nullptr;
    EXPECT_FALSE(host.dictionary_next(nullptr, &key, &length, &entry));
    EXPECT_FALSE(host.dictionary_next(borrowedHandle(value), nullptr, &length, &entry));
    EXPECT_FALSE(host.dictionary_next(borrowedHandle(value), &key, nullptr, &entry));
    EXPECT_FALSE(host.dictionary_next(borrowedHandle(value), &key, &length, nullptr));
}

TEST(PropertyListHandles, TakeNoBytesFromNowhereAndOneFromSomewhere) {
    std::size_t length = 7;
    wl_value* empty = host.new_data(nullptr, 0);
    ASSERT_NE(empty, nullptr);
    EXPECT_NE(host.get_data(empty, &length), nullptr);
    EXPECT_EQ(length, 0U);
    host.release(empty);
    EXPECT_EQ(host.new_data(nullptr, 1), nullptr);
    wl_value* one = host.new_data("x", 1);
    EXPECT_EQ(takeHandle(one), PropertyList(PropertyList::Data{"x"}));
}

TEST(PropertyListHandles, ReleaseWhatAContainerRefuses) { // the leak check of a sanitizer build looks here
    wl_value* text = host.new_string("text", WL_NUL_TERMINATED);
    EXPECT_FALSE(host.array_append(text, host.new_integer(1)));
    EXPECT_FALSE(host.dictionary_set(text, "k", 1, host.new_integer(1)));
    EXPECT_FALSE(host.array_append(nullptr, host.new_integer(1)));
    wl_value* dictionary = host.new_dictionary();
    EXPECT_FALSE(host.dictionary_set(dictionary, nullptr, 0, host.new_integer(1)));
    EXPECT_FALSE(host.dictionary_set(dictionary, "\xFF", 1, host.new_integer(1)));
    EXPECT_FALSE(host.array_append(dictionary, host.new_integer(1)));
    EXPECT_FALSE(host.dictionary_set(dictionary, "k", 1, nullptr));
    EXPECT_FALSE(host.dictionary_set(dictionary, "k", 1, dictionary)); // and keeps itself
    EXPECT_EQ(host.count(dictionary), 0U);
    host.release(dictionary);
    host.release(text);
}

TEST(PropertyListHandles, RefuseTextThatIsNoUtf8) {
    EXPECT_EQ(host.new_string("\xC3", 1), nullptr);
    EXPECT_EQ(host.new_string("\xED\xA0\x80", WL_NUL_TERMINATED), nullptr);
}

TEST(PropertyListHandles, RefuseTextThatCannotBeWritten) {
    for (const std::string& text : {std::string(1, '\0'), std::string("a\x01"), std::string("\x1B[2J"),
                                    std::string("\xEF\xBF\xBE"), std::string("\xEF\xBF\xBF")}) {
        EXPECT_EQ(host.new_string(text.data(), text.size()), nullptr) << text;
        wl_value* dictionary = host.new_dictionary();
        EXPECT_FALSE(host.dictionary_set(dictionary, text.data(), text.size(), host.new_integer(1))) << text;
        EXPECT_EQ(host.count(dictionary), 0U);
        host.release(dictionary);
    }
    wl_value* text = host.new_string("\t\r\n\x7F\xC2\x9B", WL_NUL_TERMINATED);
    EXPECT_NE(text, nullptr);
    host.release(text);
}

TEST(PropertyListHandles, RefuseDatesThatCannotBeWritten) {
    using Limits = std::numeric_limits<double>;
    for (const double seconds :
         {1e15, -1e15, 253402300800.0, -62167219201.0, Limits::infinity(), Limits::quiet_NaN()}) {
        EXPECT_EQ(host.new_date(seconds), nullptr) << seconds;
    }
    for (const double seconds : {-62167219200.0, 0.0, 253402300799.0}) {
        wl_value* date = host.new_date(seconds);
        EXPECT_NE(date, nullptr) << seconds;
        host.release(date);
    }
}

TEST(PropertyListHandles, GiveAndCopyWhatCouldNotBeBuilt) { // a response may hold anything
    const PropertyList response =
        PropertyList::Dictionary{{"text", "a\x01"}, {"date", PropertyList::Date{1e15}}};
    std::size_t length = 0;
    EXPECT_STREQ(host.get_string(get(response, "text"), &length), "a\x01");
    double seconds = 0;
    EXPECT_TRUE(host.get_date(get(response, "date"), &seconds));
    EXPECT_EQ(takeHandle(host.copy(borrowedHandle(response))), response);
}

TEST(PropertyListHandles, BoundTheNesting) {
    wl_value* value = host.new_array();
    for (int depth = 1; depth < WL_VALUE_DEPTH_LIMIT; ++depth) {
        wl_value* outer = host.new_array();
        ASSERT_TRUE(host.array_append(outer, value)) << depth;
        value = outer;
    }
    wl_value* copy = host.copy(value);
    EXPECT_NE(copy, nullptr);
    wl_value* outer = host.new_dictionary();
    EXPECT_FALSE(host.dictionary_set(outer, "k", 1, value));
    EXPECT_FALSE(host.dictionary_set(outer, "k", 1, copy)); // a copy knows its depth as well
    host.release(outer);
}

TEST(PropertyListHandles, CountTheDeepestElementOfAContainer) {
    wl_value* deep = host.new_array();
    for (int depth = 1; depth < WL_VALUE_DEPTH_LIMIT - 1; ++depth) {
        wl_value* outer = host.new_array();
        ASSERT_TRUE(host.array_append(outer, deep));
        deep = outer;
    }
    wl_value* container = host.new_array();
    EXPECT_TRUE(host.array_append(container, deep));
    EXPECT_TRUE(host.array_append(container, host.new_integer(1))); // makes it no shallower
    wl_value* outer = host.new_array();
    EXPECT_FALSE(host.array_append(outer, container));
    host.release(outer);
}

TEST(PropertyListHandles, RefuseToCopyWhatIsNestedTooDeep) {
    PropertyList value = PropertyList::Array{};
    for (int depth = 0; depth < WL_VALUE_DEPTH_LIMIT; ++depth) {
        PropertyList outer = PropertyList::Array{};
        outer.array()->push_back(std::move(value));
        value = std::move(outer);
    }
    EXPECT_EQ(host.copy(borrowedHandle(value)), nullptr);
}

// How often a value can be put into another one.
int wrapsOf(wl_value* value) {
    for (int wraps = 0;; ++wraps) {
        wl_value* outer = host.new_array();
        if (!host.array_append(outer, value)) {
            host.release(outer);
            return wraps;
        }
        value = outer;
    }
}

TEST(PropertyListHandles, AContainerIsOneDeeperThanWhatIsNone) {
    const int wraps = wrapsOf(host.new_array());
    EXPECT_EQ(wrapsOf(host.new_dictionary()), wraps);
    for (wl_value* value :
         {host.new_string("text", 4), host.new_integer(1), host.new_unsigned(1), host.new_real(1),
          host.new_boolean(true), host.new_data("x", 1), host.new_date(1)}) {
        EXPECT_EQ(wrapsOf(value), wraps + 1);
    }
}

TEST(PropertyListHandles, ACopyIsAsDeepAsWhatIsBuiltTheSame) {
    wl_value* array = host.new_array();
    EXPECT_TRUE(host.array_append(array, host.new_integer(1)));
    wl_value* dictionary = host.new_dictionary();
    EXPECT_TRUE(host.dictionary_set(dictionary, "k", 1, array));
    EXPECT_TRUE(host.dictionary_set(dictionary, "z", 1, host.new_integer(1)));
    const PropertyList original(PropertyList::Dictionary{{"k", PropertyList::Array{1}}, {"z", 1}});
    EXPECT_EQ(wrapsOf(host.copy(borrowedHandle(original))), wrapsOf(dictionary));
    const PropertyList number(1);
    EXPECT_EQ(wrapsOf(host.copy(borrowedHandle(number))), wrapsOf(host.new_integer(1)));
}

TEST(ErrorSlot, KeepsTheFirstMessage) {
    ErrorSlot slot;
    EXPECT_FALSE(slot.raised());
    host.raise(slot.handle(), "first \xFF");
    host.raise(slot.handle(), "second");
    EXPECT_TRUE(slot.raised());
    EXPECT_EQ(slot.message(), "first \xEF\xBF\xBD");
}

TEST(ErrorSlot, RaisesWithoutAMessage) {
    ErrorSlot slot;
    host.raise(slot.handle(), nullptr);
    EXPECT_TRUE(slot.raised());
    EXPECT_EQ(slot.message(), "no reason given");
}

} // namespace
} // namespace welcomer
