// An INI text held line by line, so that rewriting it keeps comments, blank lines, unknown and
// malformed lines exactly as the user wrote them; only the lines of changed keys are replaced.
#pragma once

#include <cstddef>
#include <optional>
#include <string>
#include <string_view>
#include <vector>

namespace TrelmSDK {

// A line that could not be understood; it is kept in the text and otherwise ignored.
struct IniIssue {
    std::size_t line = 0; // 1-based line number in the parsed text
    std::string message;
};

// Section and key names compare case-insensitively (ASCII), as in Windows INI files, and keep
// their spelling. Keys before the first section header belong to the section with the empty
// name. When a section name appears several times, its blocks read as one section and new keys
// go to the first block; when a key repeats, the first occurrence wins.
//
// Values are the text after the first '=', with surrounding blanks removed; a value enclosed in
// double quotes loses the quotes (so that a value may keep leading or trailing blanks). A ';' or
// '#' starts a comment only at the start of a line: values may contain both.
//
// Not thread-safe: ConfigManager serialises access.
class IniDocument {
public:
    IniDocument() = default;

    // Replaces the whole document with the parsed text. Never fails: lines that are neither
    // blank, comment, section header nor "key = value" are kept verbatim and listed in Issues().
    void Parse(std::string_view text);
    // The text to write back: the original lines, changed values, appended sections and keys.
    std::string Serialize() const;

    const std::vector<IniIssue>& Issues() const { return issues_; }

    bool HasSection(std::string_view section) const;
    bool HasKey(std::string_view section, std::string_view key) const;
    // The value as written in the file (quotes removed), or nothing when the key is missing.
    std::optional<std::string> Get(std::string_view section, std::string_view key) const;
    // Sets the value, replacing the key's line in place or adding it at the end of its section
    // (creating the section at the end of the document when needed). Values with line breaks are
    // refused (returns false), since they cannot be written back as one line.
    bool Set(std::string_view section, std::string_view key, std::string_view value);
    // Removes the key's line; returns whether there was one.
    bool Remove(std::string_view section, std::string_view key);

    // Section names in document order (first spelling of each), and the keys of one section.
    std::vector<std::string> Sections() const;
    std::vector<std::string> Keys(std::string_view section) const;

    // Whether a name can be used as a section or key: not empty, no line breaks, no '=' in keys,
    // no ']' in sections, no leading ';', '#' or '[' in keys, no surrounding blanks.
    static bool IsValidSectionName(std::string_view name);
    static bool IsValidKeyName(std::string_view name);

private:
    enum class LineKind { Other, Section, Key };
    struct Line {
        LineKind kind = LineKind::Other;
        std::string raw;            // the line as read (without its line break), or as rewritten
        std::string name;           // section name or key name
        std::string section;        // the section a key line belongs to
        std::size_t valueStart = 0; // Key lines: where the value begins in raw
    };

    const Line* findKey(std::string_view section, std::string_view key) const;
    Line* findKey(std::string_view section, std::string_view key);
    static std::string formatValue(std::string_view value);

    std::vector<Line> lines_;
    std::vector<IniIssue> issues_;
    bool crlf_ = false; // the text's line breaks are CR LF
    bool bom_ = false;
};

} // namespace TrelmSDK
