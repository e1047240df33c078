// Where the SDK reports misuse (a bad index, a wrong value type, an unknown tag) instead of
// throwing.
#pragma once

#include <trelm/core/mstr.h>

#include <functional>

namespace TrelmSDK {

// Receives every SDK error text. The host installs one at start-up (for example the system log);
// without one, errors go to standard error. May be called from any thread: the handler is called
// under the SDK's error lock, so it must not report SDK errors itself.
using SDKErrorHandler = std::function<void(const MSTR& text)>;

// Installs a handler and returns the previous one (an empty handler restores standard error).
SDKErrorHandler SetSDKErrorHandler(SDKErrorHandler handler);

// Reports one error text through the installed handler.
void ReportSDKError(const MSTR& text);

// The message of the host's table range error, reported when a list is read past its end.
inline constexpr const MCHAR* kTabRangeError =
    L"Invalid index passed into a Trelm SDK Tab::operator[]";

} // namespace TrelmSDK
