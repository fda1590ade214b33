/* The layout of version 1, member by member, as every plug-in that was ever built knows it. What is new stands behind it;
 * a line that is here is never changed. */

#include <welcomer/delegate_plugin.h>

#include <stddef.h>

#if defined(__LP64__)
#define AT(structure, member, offset)                                                                        \
    _Static_assert(offsetof(structure, member) == (offset), #structure "." #member " has moved")

AT(wl_host, abi_version, 0);
AT(wl_host, size, 4);
AT(wl_host, raise, 8);
AT(wl_host, value_type, 16);
AT(wl_host, get_boolean, 24);
AT(wl_host, get_integer, 32);
AT(wl_host, get_unsigned, 40);
AT(wl_host, get_real, 48);
AT(wl_host, get_date, 56);
AT(wl_host, get_string, 64);
AT(wl_host, get_data, 72);
AT(wl_host, count, 80);
AT(wl_host, array_at, 88);
AT(wl_host, dictionary_get, 96);
AT(wl_host, dictionary_next, 104);
AT(wl_host, new_dictionary, 112);
AT(wl_host, new_array, 120);
AT(wl_host, new_string, 128);
AT(wl_host, new_integer, 136);
AT(wl_host, new_unsigned, 144);
AT(wl_host, new_real, 152);
AT(wl_host, new_boolean, 160);
AT(wl_host, new_data, 168);
AT(wl_host, new_date, 176);
AT(wl_host, copy, 184);
AT(wl_host, array_append, 192);
AT(wl_host, dictionary_set, 200);
AT(wl_host, release, 208);

AT(wl_completion_handler, call, 0);
AT(wl_completion_handler, context, 8);
_Static_assert(sizeof(wl_completion_handler) == 16, "it is passed by value, and can never grow");

AT(wl_delegate, size, 0);
AT(wl_delegate, plugin_data, 8);
AT(wl_delegate, delegate_identifier, 16);
AT(wl_delegate, delegate_setup_request, 24);
AT(wl_delegate, complete_setup_with_response, 32);
AT(wl_delegate, terminate_setup_completion, 40);
AT(wl_delegate, complete_setup_with_response_chosen_aliases, 48);
AT(wl_delegate, messaging_aliases_from_response, 56);

AT(wl_delegate_plugin_descriptor, abi_version, 0);
AT(wl_delegate_plugin_descriptor, size, 4);
AT(wl_delegate_plugin_descriptor, protocol, 8);
AT(wl_delegate_plugin_descriptor, class_name, 16);
AT(wl_delegate_plugin_descriptor, create, 24);
AT(wl_delegate_plugin_descriptor, destroy, 32);
#endif

_Static_assert(WL_DELEGATE_PLUGIN_ABI_VERSION == 1, "another version has a layout of its own");
_Static_assert(WL_VALUE_NONE == 0 && WL_VALUE_DICTIONARY == 1 && WL_VALUE_ARRAY == 2 &&
                   WL_VALUE_STRING == 3 && WL_VALUE_INTEGER == 4 && WL_VALUE_REAL == 5 &&
                   WL_VALUE_BOOLEAN == 6 && WL_VALUE_DATA == 7 && WL_VALUE_DATE == 8,
               "the numbers of the types are part of it");
_Static_assert(sizeof(wl_value_type) == 4, "as a plug-in passes it");
_Static_assert(WL_VALUE_DEPTH_LIMIT >= 512, "what could be built can be built");
