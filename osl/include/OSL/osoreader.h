// The OSO reader: parses compiled OSL bytecode text (OSO 1.00) and hands every part of it, in
// file order, to virtual callbacks that a subclass overrides to build its own model.
#pragma once

#include <OSL/oslconfig.h>
#include <OSL/typespec.h>

#include <string>

namespace OSL {

/// Base class of every OSO consumer. parse_file/parse_memory drive the callbacks below; all of
/// them do nothing by default. The whole text is checked before the first callback: malformed or
/// truncated text (the code must finish with its `end` instruction) is reported to the error
/// handler as "SOURCE:LINE: error: message" (SOURCE is the file name, or "<buffer>") and makes the
/// parse return false without any callback.
///
/// Callback order: version, shader, the shader line's hints, then for every symbol line: symbol,
/// its symdefaults, its hints, and parameter_done for params and oparams; then for every
/// "code NAME" line: codemarker, and for every instruction: instruction, its instruction_args,
/// its instruction_jumps, its hints, instruction_end; finally codeend once.
///
/// Struct-typed symbols carry the id of a struct registered (or found) in the TypeSpec registry
/// under "SHADERNAME_STRUCTNAME", with the fields the symbol's %structfields and
/// %structfieldtypes hints give.
///
/// A reader holds no shared state: different readers may parse on different threads at once.
class OSOReader {
public:
    /// Errors go to errhandler, or to OpenImageIO's default handler when it is null.
    explicit OSOReader(ErrorHandler* errhandler = nullptr);
    virtual ~OSOReader();

    // A subclass holding a filled model may be copied or moved; the copy reports to the same
    // error handler.
    OSOReader(const OSOReader&) = default;
    OSOReader& operator=(const OSOReader&) = default;

    /// Reads and parses the named file. False when it cannot be read or does not parse.
    virtual bool parse_file(const std::string& filename);

    /// Parses OSO text held in memory. False when it does not parse.
    virtual bool parse_memory(const std::string& buffer);

    /// The "OpenShadingLanguage 1.00" header line.
    virtual void version(const char* specid, int major, int minor) {
        (void)specid, (void)major, (void)minor;
    }

    /// The shader line: its type ("surface", "shader", ...) and name.
    virtual void shader(const char* shadertype, const char* name) { (void)shadertype, (void)name; }

    /// A new symbol; the defaults and hints that follow belong to it.
    virtual void symbol(SymType symtype, TypeSpec typespec, const char* name) {
        (void)symtype, (void)typespec, (void)name;
    }

    /// A default value of the last symbol, in the order written.
    virtual void symdefault(int def) { (void)def; }
    virtual void symdefault(float def) { (void)def; }
    virtual void symdefault(const char* def) { (void)def; }

    /// All information about the last parameter (param or oparam) has been given.
    virtual void parameter_done() {}

    /// Readers that only want the parameters return true: the callbacks then stop (and the parse
    /// succeeds) at the first temp symbol.
    virtual bool stop_parsing_at_temp_symbols() { return false; }

    /// One hint of the shader line, of the last symbol or of the last instruction, exactly as
    /// written (e.g. `%meta{float,min,0}`, `%line{12}`).
    virtual void hint(string_view hintstring) { (void)hintstring; }

    /// Readers that need no code return false: the callbacks then stop (and the parse succeeds)
    /// at the first "code" line, without a codeend.
    virtual bool parse_code_section() { return true; }

    /// A "code NAME" line: the instructions that follow belong to section NAME.
    virtual void codemarker(const char* name) { (void)name; }

    /// The end of the code (called once, after the last instruction).
    virtual void codeend() {}

    /// A new instruction: its label (-1 when none is written) and op name.
    virtual void instruction(int label, const char* opcode) { (void)label, (void)opcode; }

    /// An argument symbol of the last instruction.
    virtual void instruction_arg(const char* name) { (void)name; }

    /// A jump target of the last instruction.
    virtual void instruction_jump(int target) { (void)target; }

    /// All arguments, jump targets and hints of the last instruction have been given.
    virtual void instruction_end() {}

    /// The line being parsed (1-based), for messages of subclasses.
    int lineno() const { return m_lineno; }

    /// The handler errors are reported to.
    ErrorHandler& errhandler() { return *m_err; }

private:
    friend class OSOParser;
    ErrorHandler* m_err;
    int m_lineno = 1;
};

namespace pvt {
using OSL::OSOReader;
} // namespace pvt

} // namespace OSL
