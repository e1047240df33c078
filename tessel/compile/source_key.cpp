// SourceKey computation.
#include "compile/source_key.h"

SourceKey SourceKeyOf(std::string_view text) {
    SourceKey h = 0;
    for (char c : text) {
        // Sign extension is intended: bytes 0x80-0xFF subtract from the hash.
        const auto signedByte = static_cast<std::int64_t>(static_cast<signed char>(c));
        h = h * 65599u + static_cast<SourceKey>(signedByte);
    }
    return h;
}

std::string ShaderNameOf(SourceKey key) {
    return "shader" + std::to_string(key);
}
