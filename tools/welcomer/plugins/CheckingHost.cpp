#include "tools/welcomer/plugins/CheckingHost.h"

#include "plugins/PropertyListHandles.h"
#include "tools/welcomer/plugins/HandleBook.h"

#include <atomic>
#include <cstddef>

namespace welcomer::tool {

namespace {

constexpr std::uint64_t kContext = 0x5e7c0de1a2b3c4d5; // a number that nobody comes upon
std::atomic<bool> calledBeyondFirst{false};

HandleBook& book() {
    return HandleBook::instance();
}

// What a reading function of the host gives, asked for the value behind a handle.
template <auto Member, class... Arguments>
auto readFor(const char* function, const wl_value* value, Arguments... arguments) {
    return (delegatePluginHost().*Member)(book().read(value, function), arguments...);
}

template <auto Member, class... Arguments>
wl_value* makeFor(const char* function, Arguments... arguments) {
    return book().own((delegatePluginHost().*Member)(arguments...), function);
}

extern "C" {

static void checkedRaise(wl_error_slot* slot, const char* message) {
    if (book().isOpen(slot)) {
        delegatePluginHost().raise(slot, message);
    }
}

static wl_value_type checkedValueType(const wl_value* value) {
    return readFor<&wl_host::value_type>("value_type", value);
}

static bool checkedGetBoolean(const wl_value* value, bool* result) {
    return readFor<&wl_host::get_boolean>("get_boolean", value, result);
}

static bool checkedGetInteger(const wl_value* value, std::int64_t* result) {
    return readFor<&wl_host::get_integer>("get_integer", value, result);
}

static bool checkedGetUnsigned(const wl_value* value, std::uint64_t* result) {
    return readFor<&wl_host::get_unsigned>("get_unsigned", value, result);
}

static bool checkedGetReal(const wl_value* value, double* result) {
    return readFor<&wl_host::get_real>("get_real", value, result);
}

static bool checkedGetDate(const wl_value* value, double* result) {
    return readFor<&wl_host::get_date>("get_date", value, result);
}

static const char* checkedGetString(const wl_value* value, std::size_t* length) {
    return readFor<&wl_host::get_string>("get_string", value, length);
}

static const void* checkedGetData(const wl_value* value, std::size_t* length) {
    return readFor<&wl_host::get_data>("get_data", value, length);
}

static std::size_t checkedCount(const wl_value* value) {
    return readFor<&wl_host::count>("count", value);
}

static const wl_value* checkedArrayAt(const wl_value* array, std::size_t index) {
    return book().lend(readFor<&wl_host::array_at>("array_at", array, index), array, "array_at");
}

static const wl_value* checkedDictionaryGet(const wl_value* dictionary, const char* key, std::size_t length) {
    return book().lend(readFor<&wl_host::dictionary_get>("dictionary_get", dictionary, key, length),
                       dictionary, "dictionary_get");
}

static bool checkedDictionaryNext(const wl_value* dictionary, const char** key, std::size_t* length,
                                  const wl_value** value) {
    const bool hasNext =
        readFor<&wl_host::dictionary_next>("dictionary_next", dictionary, key, length, value);
    if (hasNext) {
        *value = book().lend(*value, dictionary, "dictionary_next");
    }
    return hasNext;
}

static wl_value* checkedNewDictionary() {
    return makeFor<&wl_host::new_dictionary>("new_dictionary");
}

static wl_value* checkedNewArray() {
    return makeFor<&wl_host::new_array>("new_array");
}

static wl_value* checkedNewString(const char* text, std::size_t length) {
    return makeFor<&wl_host::new_string>("new_string", text, length);
}

static wl_value* checkedNewInteger(std::int64_t value) {
    return makeFor<&wl_host::new_integer>("new_integer", value);
}

static wl_value* checkedNewUnsigned(std::uint64_t value) {
    return makeFor<&wl_host::new_unsigned>("new_unsigned", value);
}

static wl_value* checkedNewReal(double value) {
    return makeFor<&wl_host::new_real>("new_real", value);
}

static wl_value* checkedNewBoolean(bool value) {
    return makeFor<&wl_host::new_boolean>("new_boolean", value);
}

static wl_value* checkedNewData(const void* bytes, std::size_t length) {
    return makeFor<&wl_host::new_data>("new_data", bytes, length);
}

static wl_value* checkedNewDate(double seconds) {
    return makeFor<&wl_host::new_date>("new_date", seconds);
}

static wl_value* checkedCopy(const wl_value* value) {
    return book().own(readFor<&wl_host::copy>("copy", value), "copy");
}

// A container that is its own element keeps itself.
static bool checkedArrayAppend(wl_value* array, wl_value* element) {
    wl_value* const into = book().change(array, "array_append");
    return array != element && delegatePluginHost().array_append(into, book().pass(element, "array_append"));
}

static bool checkedDictionarySet(wl_value* dictionary, const char* key, std::size_t length, wl_value* entry) {
    wl_value* const into = book().change(dictionary, "dictionary_set");
    return dictionary != entry &&
           delegatePluginHost().dictionary_set(into, key, length, book().pass(entry, "dictionary_set"));
}

static void checkedRelease(wl_value* value) {
    book().release(value);
}

static const void* calledBeyond(const char* /*identifier*/) {
    calledBeyondFirst = true;
    return nullptr;
}

static void noteHandlerCall(std::uint64_t context, bool succeeded, std::int32_t /*errorNumber*/,
                            const char* message) {
    CheckedHandler::instance().note(context, succeeded, message);
}
}

wl_host tableWith(std::uint32_t size, const void* (*getExtension)(const char*)) {
    return {
        .abi_version = WL_DELEGATE_PLUGIN_ABI_VERSION,
        .size = size,
        .raise = checkedRaise,
        .value_type = checkedValueType,
        .get_boolean = checkedGetBoolean,
        .get_integer = checkedGetInteger,
        .get_unsigned = checkedGetUnsigned,
        .get_real = checkedGetReal,
        .get_date = checkedGetDate,
        .get_string = checkedGetString,
        .get_data = checkedGetData,
        .count = checkedCount,
        .array_at = checkedArrayAt,
        .dictionary_get = checkedDictionaryGet,
        .dictionary_next = checkedDictionaryNext,
        .new_dictionary = checkedNewDictionary,
        .new_array = checkedNewArray,
        .new_string = checkedNewString,
        .new_integer = checkedNewInteger,
        .new_unsigned = checkedNewUnsigned,
        .new_real = checkedNewReal,
        .new_boolean = checkedNewBoolean,
        .new_data = checkedNewData,
        .new_date = checkedNewDate,
        .copy = checkedCopy,
        .array_append = checkedArrayAppend,
        .dictionary_set = checkedDictionarySet,
        .release = checkedRelease,
        .get_extension = getExtension,
    };
}

} // namespace

const wl_host& checkingHost() {
    static const wl_host host = tableWith(sizeof(wl_host), delegatePluginHost().get_extension);
    return host;
}

const wl_host& firstCheckingHost() {
    static const wl_host host = tableWith(offsetof(wl_host, get_extension), calledBeyond);
    return host;
}

bool wasCalledBeyondFirst() {
    return calledBeyondFirst;
}

CheckedHandler& CheckedHandler::instance() {
    static auto* const handler = new CheckedHandler; // as the book
    return *handler;
}

wl_completion_handler CheckedHandler::handler() const {
    return {noteHandlerCall, kContext};
}

void CheckedHandler::note(std::uint64_t context, bool succeeded, const char* message) {
    const std::lock_guard lock(_mutex);
    _calls.push_back({context == kContext, succeeded, message != nullptr, message ? message : ""});
}

std::vector<HandlerCall> CheckedHandler::calls() const {
    const std::lock_guard lock(_mutex);
    return _calls;
}

} // namespace welcomer::tool
