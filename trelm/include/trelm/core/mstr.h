// Host text: wide strings as the SDK passes them, and their conversion to and from UTF-8.
#pragma once

#include <string>
#include <string_view>

namespace TrelmSDK {

// The SDK's character and string types: names, labels and string parameters are wide text.
using MCHAR = wchar_t;
using MSTR = std::wstring;
using TSTR = MSTR;

// UTF-8 to wide text; malformed bytes become U+FFFD.
MSTR FromUTF8(std::string_view utf8);
// Wide text to UTF-8; code points outside Unicode become U+FFFD.
std::string ToUTF8(std::wstring_view text);

} // namespace TrelmSDK

using TrelmSDK::MCHAR;
using TrelmSDK::MSTR;
using TrelmSDK::TSTR;
