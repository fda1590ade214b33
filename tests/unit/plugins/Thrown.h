// What a call of a plug-in throws.

#pragma once

#include "plugins/AbiDelegatePlugin.h"

#include <functional>
#include <gtest/gtest.h>
#include <string>

namespace welcomer {

// A failure when it is of another kind than callers may expect.
//  result  its text, or "nothing thrown"
inline std::string thrown(const std::function<void()>& call) {
    try {
        call();
    } catch (const DelegatePluginException& exception) {
        return exception.what();
    } catch (...) {
        ADD_FAILURE() << "threw something else";
    }
    return "nothing thrown";
}

} // namespace welcomer
