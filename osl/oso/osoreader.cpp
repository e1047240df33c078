// OSOReader's entry points: reading the text from a file or taking it from memory, then handing
// it to the parser.
#include <OSL/osoreader.h>

#include "oso_parser.h"

#include <OpenImageIO/filesystem.h>

namespace OSL {

OSOReader::OSOReader(ErrorHandler* errhandler)
    : m_err(errhandler ? errhandler : &ErrorHandler::default_handler()) {}

OSOReader::~OSOReader() = default;

bool OSOReader::parse_file(const std::string& filename) {
    std::string text;
    if (!OIIO::Filesystem::read_text_file(filename, text)) {
        m_err->error("File \"" + filename + "\" could not be read");
        return false;
    }
    m_lineno = 1;
    return OSOParser(*this, text, filename).parse();
}

bool OSOReader::parse_memory(const std::string& buffer) {
    m_lineno = 1;
    return OSOParser(*this, buffer, "<buffer>").parse();
}

} // namespace OSL
