/*
 * What a delegate plug-in and its host agree on. C11 and C++17 or later; needs no other header of the system.
 * C++ authors will prefer DelegatePlugin.hpp, which stands on this one.
 *
 * A plug-in is a shared library, named "Something.ncdplugin", that exports one data symbol,
 * wl_delegate_plugin (below). It may also be a folder of that name that holds the library and an "Info.plist"
 * whose "Executable" names it.
 *
 * Rules for both sides
 *  - Threads. Each function below says on which thread it is called; "any thread" is any number of threads at
 *    once. A plug-in is loaded once per process and never unloaded, so its threads may run on. A thread must
 *    not be cancelled, and must not exit, while it is inside a function of the other side.
 *  - Ownership. A `const wl_value *` and a `const char *` are borrowed: the receiver reads them until its
 *    call returns, or until the time that is given, and copies what it needs longer. A `wl_value *` is owned
 *    by who holds it, and returning it or giving it to a function that says so passes it on.
 *  - Text is UTF-8. What a plug-in builds can be written as an XML property list: its text has no control
 *    characters but tab, line feed and carriage return, and neither U+FFFE nor U+FFFF; its dates lie in the
 *    years 0000 to 9999. A borrowed value can hold anything.
 *  - Failure. No C++ exception, and no other kind of unwinding, may leave a function of either side. A
 *    plug-in raises through the error slot that it is given. The host catches C++ exceptions that leave a
 *    plug-in's function all the same and takes them as raised; a plug-in written in C++ does better to catch
 *    them itself.
 *  - Growth. Every structure begins with its version or its size, as its maker knew it. New members are only
 *    ever added at the end, and a reader looks at no member that lies beyond the maker's size. A change that
 *    cannot be made like this takes a new WL_DELEGATE_PLUGIN_ABI_VERSION, which a host of another version
 *    refuses.
 */

#ifndef WELCOMER_DELEGATE_PLUGIN_H
#define WELCOMER_DELEGATE_PLUGIN_H

#include <stdbool.h>
#include <stddef.h>
#include <stdint.h>

#ifdef __cplusplus
extern "C" {
#endif

/* The version that this header describes. */
#define WL_DELEGATE_PLUGIN_ABI_VERSION 1u

/* The protocol that a delegate plug-in conforms to. */
#define WL_DELEGATE_PLUGIN_PROTOCOL "WLFirstRunDelegateConfiguration"

/* The name of the exported symbol. */
#define WL_DELEGATE_PLUGIN_SYMBOL "wl_delegate_plugin"

/* What the one exported symbol is marked with; the rest of a plug-in is best compiled with
 * -fvisibility=hidden. */
#define WL_DELEGATE_PLUGIN_EXPORT __attribute__((visibility("default")))

/* A length that stands for "up to the terminating NUL". */
#define WL_NUL_TERMINATED ((size_t)-1)

/* A property-list value: a dictionary with string keys, an array, a string, a number, a boolean, data or a
 * date. */
typedef struct wl_value wl_value;

/* Where an operation says that it raises. It lives for the one call that it is given to. */
typedef struct wl_error_slot wl_error_slot;

/* What a value is. */
typedef int32_t wl_value_type;
enum {
    WL_VALUE_NONE = 0, /* no value: a null pointer */
    WL_VALUE_DICTIONARY = 1,
    WL_VALUE_ARRAY = 2,
    WL_VALUE_STRING = 3,
    WL_VALUE_INTEGER = 4, /* signed or unsigned, 64 bits */
    WL_VALUE_REAL = 5,
    WL_VALUE_BOOLEAN = 6,
    WL_VALUE_DATA = 7,
    WL_VALUE_DATE = 8
};

/* The deepest nesting that a plug-in may build, containers within containers; empty ones count too. A request
 * and a response that are nested as deep can be sent, stored and read back. */
#define WL_VALUE_DEPTH_LIMIT 512

/*
 * What the host does for a plug-in. It lives until the process ends, and so may a plug-in's copy of the
 * pointer. Every function may be called on any thread; one owned value, however, is changed by one thread at
 * a time. A null value is allowed everywhere and is no value of any type.
 */
typedef struct wl_host {
    uint32_t abi_version; /* the host's WL_DELEGATE_PLUGIN_ABI_VERSION; the same in every version */
    uint32_t size;        /* in bytes, as the host knows this structure */

    /* Fills an error slot: the operation raises as soon as it returns, and what it returns does not count.
     * The message is one line for the system log, copied; null and bytes that are no UTF-8 are tolerated. Of
     * two messages the first one stays. */
    void (*raise)(wl_error_slot* slot, const char* message);

    /* Reading. A getter gives true and the content when the value is of exactly that type (a boolean is no
     * integer, an integer no real), else it gives false and leaves the result alone. What is returned or
     * given is borrowed and lives as long as the value that was asked, unchanged. */
    wl_value_type (*value_type)(const wl_value* value);
    bool (*get_boolean)(const wl_value* value, bool* result);
    bool (*get_integer)(const wl_value* value, int64_t* result);   /* false also when it does not fit */
    bool (*get_unsigned)(const wl_value* value, uint64_t* result); /* false also when it does not fit */
    bool (*get_real)(const wl_value* value, double* result);
    bool (*get_date)(const wl_value* value, double* result); /* seconds since 1970-01-01T00:00:00Z */
    /* The text, NUL-terminated, or null. `length` may be null; it is the only one to show a NUL inside the
     * text. */
    const char* (*get_string)(const wl_value* value, size_t* length);
    /* The bytes, or null; never null for data, however short. `length` may be null. */
    const void* (*get_data)(const wl_value* value, size_t* length);

    /* How many elements or entries; 0 for what is no container. */
    size_t (*count)(const wl_value* value);
    /* An element, or null beyond the end. */
    const wl_value* (*array_at)(const wl_value* array, size_t index);
    /* The value of a key, or null. `key_length` may be WL_NUL_TERMINATED. */
    const wl_value* (*dictionary_get)(const wl_value* dictionary, const char* key, size_t key_length);
    /* The entry whose key follows `*key`, in the order of the keys' bytes; the first one when `*key` is null.
     * Gives the key, its length (which must be given back unchanged) and the value, or false after the last
     * one:
     *
     *     const char *key = NULL;
     *     size_t length = 0;
     *     const wl_value *value = NULL;
     *     while (host->dictionary_next(dictionary, &key, &length, &value)) { ... }
     */
    bool (*dictionary_next)(const wl_value* dictionary, const char** key, size_t* key_length,
                            const wl_value** value);

    /* Building. Each gives a new value that the caller owns, or null when the content is not allowed or there
     * is no memory. A length may be WL_NUL_TERMINATED for strings. */
    wl_value* (*new_dictionary)(void);
    wl_value* (*new_array)(void);
    /* Null when the text is no UTF-8 or holds a character that XML cannot hold. */
    wl_value* (*new_string)(const char* text, size_t length);
    wl_value* (*new_integer)(int64_t value);
    wl_value* (*new_unsigned)(uint64_t value);
    wl_value* (*new_real)(double value);
    wl_value* (*new_boolean)(bool value);
    wl_value* (*new_data)(const void* bytes, size_t length);
    wl_value* (*new_date)(
        double seconds_since_1970); /* null outside the years 0000 to 9999, and for no number */
    /* Everything below the value is copied too, also what could not be built; a request or aliases that hold
     * such a copy count as raising. Null also for a value that is nested too deep. */
    wl_value* (*copy)(const wl_value* value);

    /* Adds an element, or an entry in place of one with the same key. The element or entry becomes the
     * container's whatever the result, so that a builder's result can be given at once; its pointer is no
     * longer valid. False when the container is of another type, the element or key is null, the key is no
     * text that new_string() takes, the container is its own element (which is then not released), or it
     * would be nested too deep.
     */
    bool (*array_append)(wl_value* array, wl_value* element);
    bool (*dictionary_set)(wl_value* dictionary, const char* key, size_t key_length, wl_value* entry);

    /* Ends an owned value that is passed on to nobody; null is allowed. */
    void (*release)(wl_value* value);
} wl_host;

/*
 * How a plug-in reports that a setup has ended. Copied freely; it needs no release and stays valid until the
 * process ends. The first call counts and any other does nothing, as does any call after the operation has
 * raised. Any thread, during the operation or at any later time.
 */
typedef struct wl_completion_handler {
    /* `context`       the one below
     * `succeeded`     whether the setup is complete
     * `error_number`  an errno value where there is one, else 0
     * `error_message` why it failed, one line for the system log, borrowed; null for no error object */
    void (*call)(uint64_t context, bool succeeded, int32_t error_number, const char* error_message);
    uint64_t context;
} wl_completion_handler;

/*
 * One delegate, made by `create`. The first three operations are required: one that is null raises when it is
 * called. A setup application may ask for the identifier, requests and aliases on several threads at once;
 * completions come one after the other.
 */
typedef struct wl_delegate wl_delegate;
struct wl_delegate {
    uint32_t size;     /* in bytes, as the plug-in knows this structure */
    void* plugin_data; /* the plug-in's own; the host never looks at it */

    /* The delegate's identifier in reverse-domain form, the same at every call, or null for none: the plug-in
     * is then not used. Borrowed by the host until this is called again on the same thread. Any thread; the
     * first time on the thread of `create`. Optional: no. */
    const char* (*delegate_identifier)(wl_delegate* self, wl_error_slot* slot);

    /* This delegate's part of the account setup request: a dictionary that passes to the host, or null when
     * the delegate leaves itself out of setup. Another type of value, and one that cannot be written, counts
     * as raising. The thread of the setup application that builds the request. Optional: no. */
    wl_value* (*delegate_setup_request)(wl_delegate* self, wl_error_slot* slot);

    /* Finishes the delegate's setup from the server's response, which is handed over as it stands, whatever
     * its type, and is borrowed for the call. `handler` is to be called exactly once. The call may return
     * before that. A queue of this delegate's own, never the main thread. Optional: no. */
    void (*complete_setup_with_response)(wl_delegate* self, const wl_value* response,
                                         wl_completion_handler handler, wl_error_slot* slot);

    /* Stops a running completion, whose handler is still to be called.
     * Any thread, also during the completion. Optional: null does nothing. */
    void (*terminate_setup_completion)(wl_delegate* self, wl_error_slot* slot);

    /* As complete_setup_with_response, with the aliases that the user chose: an array of strings, borrowed
     * for the call, or null when there are none. Only the video-calling and the messaging delegate are called
     * here, and only here, both on one queue, one after the other. A queue, never the main thread. Optional:
     * null raises. */
    void (*complete_setup_with_response_chosen_aliases)(wl_delegate* self, const wl_value* response,
                                                        const wl_value* aliases,
                                                        wl_completion_handler handler, wl_error_slot* slot);

    /* The aliases that the server offers this delegate in its response, which is borrowed for the call: an
     * array of strings that passes to the host, or null for none. Anything else counts as raising. The thread
     * of the setup application that asks. Optional: null raises. */
    wl_value* (*messaging_aliases_from_response)(wl_delegate* self, const wl_value* response,
                                                 wl_error_slot* slot);
};

/* What a plug-in exports. It is read once, when the plug-in is loaded, and stays where it is. */
typedef struct wl_delegate_plugin_descriptor {
    uint32_t abi_version;   /* WL_DELEGATE_PLUGIN_ABI_VERSION; the first member in every version */
    uint32_t size;          /* in bytes, as the plug-in knows this structure */
    const char* protocol;   /* WL_DELEGATE_PLUGIN_PROTOCOL */
    const char* class_name; /* what the plug-in is called in messages */

    /* Makes an instance, which is the host's until it gives it to `destroy`; null for none. `host` may be
     * kept. Raising comes to the same as null, and an instance that is returned all the same is destroyed.
     * The thread that scans for plug-ins, in the agent the main thread. */
    wl_delegate* (*create)(const wl_host* host, wl_error_slot* slot);

    /* Ends an instance that the host does not use: one without an identifier of its own, or whose scan was
     * only to list the plug-ins. One that is used lives until the process ends and is never destroyed. Null
     * does nothing. Any thread, with no other call on the instance. */
    void (*destroy)(wl_delegate* self);
} wl_delegate_plugin_descriptor;

/* Defined by the plug-in. */
extern WL_DELEGATE_PLUGIN_EXPORT const wl_delegate_plugin_descriptor wl_delegate_plugin;

#ifdef __cplusplus
}
#endif

#endif
