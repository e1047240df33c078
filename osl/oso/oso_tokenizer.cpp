// The OSO line tokenizer: identifiers (symbol names carry '$' and '.'), numbers, quoted strings
// with C escapes, `%hint{...}` groups, and the punctuation of labels and array lengths.
#include "oso_tokenizer.h"

#include <OpenImageIO/strutil.h>

#include <cerrno>
#include <charconv>
#include <cmath>
#include <cstdlib>
#include <limits>

namespace OSL::oso {

namespace {

bool is_ident_start(char c) {
    return (c >= 'a' && c <= 'z') || (c >= 'A' && c <= 'Z') || c == '_' || c == '$';
}

bool is_ident_char(char c) {
    return is_ident_start(c) || (c >= '0' && c <= '9') || c == '.';
}

bool is_digit(char c) {
    return c >= '0' && c <= '9';
}

// Length of the quoted string starting at s[pos] (which is '"'), quotes included; 0 when the
// closing quote is missing.
size_t quoted_length(std::string_view s, size_t pos) {
    for (size_t i = pos + 1; i < s.size(); ++i) {
        if (s[i] == '\\')
            ++i;
        else if (s[i] == '"')
            return i + 1 - pos;
    }
    return 0;
}

// Length of the number starting at s[pos]: [+-]digits[.digits][(e|E)[+-]digits], or [+-].digits;
// 0 when there is none. Sets is_float when it has a fraction or an exponent.
size_t number_length(std::string_view s, size_t pos, bool& is_float) {
    size_t i = pos;
    is_float = false;
    if (i < s.size() && (s[i] == '-' || s[i] == '+')) ++i;
    const size_t int_start = i;
    while (i < s.size() && is_digit(s[i])) ++i;
    bool digits = i > int_start;
    if (i < s.size() && s[i] == '.') {
        const size_t frac_start = ++i;
        while (i < s.size() && is_digit(s[i])) ++i;
        digits = digits || i > frac_start;
        is_float = true;
    }
    if (!digits) return 0;
    if (i < s.size() && (s[i] == 'e' || s[i] == 'E')) {
        size_t j = i + 1;
        if (j < s.size() && (s[j] == '-' || s[j] == '+')) ++j;
        if (j < s.size() && is_digit(s[j])) {
            while (j < s.size() && is_digit(s[j])) ++j;
            i = j;
            is_float = true;
        }
    }
    return i - pos;
}

} // namespace

bool special_float(std::string_view word, float& value) {
    std::string_view w = word;
    const bool negative = !w.empty() && (w[0] == '-' || w[0] == '+') ? (w[0] == '-') : false;
    if (!w.empty() && (w[0] == '-' || w[0] == '+')) w.remove_prefix(1);
    if (OIIO::Strutil::iequals(w, "inf") || OIIO::Strutil::iequals(w, "infinity")) {
        value = negative ? -std::numeric_limits<float>::infinity()
                         : std::numeric_limits<float>::infinity();
        return true;
    }
    if (OIIO::Strutil::iequals(w, "nan")) {
        value = negative ? -std::numeric_limits<float>::quiet_NaN()
                         : std::numeric_limits<float>::quiet_NaN();
        return true;
    }
    return false;
}

bool tokenize_line(std::string_view line, std::vector<Token>& tokens, std::string& error) {
    tokens.clear();
    size_t i = 0;
    while (i < line.size()) {
        const char c = line[i];
        if (c == ' ' || c == '\t' || c == '\r' || c == '\v' || c == '\f') {
            ++i;
            continue;
        }
        if (c == '#') break;
        Token tok;
        size_t len = 0;
        if (c == '"') {
            len = quoted_length(line, i);
            if (!len) {
                error = "unterminated string";
                return false;
            }
            tok.kind = TokenKind::String;
            tok.str = OIIO::Strutil::unescape_chars(line.substr(i + 1, len - 2));
        } else if (c == '%') {
            size_t j = i + 1;
            while (j < line.size() && is_ident_char(line[j])) ++j;
            if (j == i + 1) {
                error = "'%' not followed by a hint name";
                return false;
            }
            if (j < line.size() && line[j] == '{') {
                int depth = 0;
                for (; j < line.size(); ++j) {
                    if (line[j] == '"') {
                        const size_t q = quoted_length(line, j);
                        if (!q) break;
                        j += q - 1;
                    } else if (line[j] == '{') {
                        ++depth;
                    } else if (line[j] == '}' && --depth == 0) {
                        break;
                    }
                }
                if (j >= line.size() || depth != 0) {
                    error = "unterminated hint";
                    return false;
                }
                ++j;
            }
            len = j - i;
            tok.kind = TokenKind::Hint;
        } else if (c == ':' || c == '[' || c == ']') {
            len = 1;
            tok.kind = c == ':'   ? TokenKind::Colon
                       : c == '[' ? TokenKind::LeftBracket
                                  : TokenKind::RightBracket;
        } else {
            bool is_float = false;
            len = number_length(line, i, is_float);
            if (len && !(i + len < line.size() && is_ident_char(line[i + len]))) {
                const std::string text(line.substr(i, len));
                if (is_float) {
                    tok.kind = TokenKind::Float;
                    tok.fval = std::strtof(text.c_str(), nullptr);
                } else {
                    long long v = 0;
                    const auto res = std::from_chars(text.data() + (text[0] == '+'),
                                                     text.data() + text.size(), v);
                    if (res.ec != std::errc() || v < std::numeric_limits<int>::min() ||
                        v > std::numeric_limits<int>::max()) {
                        error = "integer " + text + " out of range";
                        return false;
                    }
                    tok.kind = TokenKind::Int;
                    tok.ival = (int)v;
                    tok.fval = (float)v;
                }
            } else {
                size_t j = i;
                if (line[j] == '-' || line[j] == '+') ++j;
                if (j >= line.size() || !is_ident_start(line[j])) {
                    error = std::string("unexpected character '") + line[i] + "'";
                    return false;
                }
                while (j < line.size() && is_ident_char(line[j])) ++j;
                len = j - i;
                if (line[i] != '-' && line[i] != '+') {
                    tok.kind = TokenKind::Identifier;
                } else if (special_float(line.substr(i, len), tok.fval)) {
                    tok.kind = TokenKind::Float;
                } else {
                    error = std::string("unexpected character '") + line[i] + "'";
                    return false;
                }
            }
        }
        tok.text = line.substr(i, len);
        tokens.push_back(std::move(tok));
        i += len;
    }
    return true;
}

} // namespace OSL::oso
