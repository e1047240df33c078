// Splits one line of OSO text into tokens. OSO is line-oriented: every construct (header, shader,
// symbol, code marker, instruction) is one line, and a '#' outside a string starts a comment.
#pragma once

#include <string>
#include <string_view>
#include <vector>

namespace OSL::oso {

enum class TokenKind { Identifier, Int, Float, String, Hint, Colon, LeftBracket, RightBracket };

struct Token {
    TokenKind kind;
    std::string_view text; ///< as written (for a hint: the whole hint, '%' to closing brace)
    std::string str;       ///< String: the unescaped value
    int ival = 0;          ///< Int: the value
    float fval = 0.0f;     ///< Float: the value; Int: the value as float
};

/// Infinity and NaN as printf writes float constants (inf, -inf, nan, -nan, any case). A signed
/// one is a Float token; an unsigned one is an Identifier (it may name a symbol) that reads as a
/// float where a value is expected.
bool special_float(std::string_view word, float& value);

/// Tokenizes `line` (no line break in it) into `tokens`. Returns false and sets `error` on text
/// that is not OSO (an unterminated string or hint, a character that starts no token, an integer
/// out of range).
bool tokenize_line(std::string_view line, std::vector<Token>& tokens, std::string& error);

} // namespace OSL::oso
