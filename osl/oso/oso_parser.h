// The OSO grammar: turns OSO text into checked lines, registers the structs it declares, then
// drives an OSOReader's callbacks.
#pragma once

#include <OSL/osoreader.h>

#include <string>
#include <string_view>

namespace OSL {

/// Parses one OSO text for one reader. The whole text is checked before the first callback, so a
/// reader sees either a complete, well-formed shader or (on error) no callbacks at all.
class OSOParser {
public:
    /// `source` names the text in messages: a file name, or "<buffer>".
    OSOParser(OSOReader& reader, std::string_view text, std::string source);

    /// Checks the text and drives the callbacks; false (after reporting) when it is not OSO.
    bool parse();

private:
    OSOReader& m_reader;
    std::string_view m_text;
    std::string m_source;
};

} // namespace OSL
