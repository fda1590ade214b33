// The Secret Service's client library, with its functions that take the paths of objects.

#pragma once

// The library's own objects of items and collections would be filled with everything that they could ever be
// asked for, at one call each.
#define SECRET_API_SUBJECT_TO_CHANGE
#include <libsecret/secret.h>
