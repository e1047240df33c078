// OSOData: the viewport translator's model of one compiled shader, filled from its OSO text by the
// toolchain's OSO reader: symbols with their defaults, and instructions grouped in code sections.
#pragma once

#include <OSL/osoreader.h>
#include <OSL/typespec.h>

#include <map>
#include <string>
#include <vector>

namespace oslo {

// Symbol kinds as the OSO reader numbers them (OSL's SymType).
enum SymbolKind : int {
    kParam = 0,
    kOutputParam = 1,
    kLocal = 2,
    kTemp = 3,
    kGlobal = 4,
    kConst = 5,
    kFunction = 6,
};

struct OSOSymbol {
    OSL::TypeSpec type;
    int symtype = kParam;
    std::string name;
    // Integer defaults are stored as floats, so values above 2^24 lose precision.
    std::vector<float> floatDefaults;
    // The last string default of a symbol.
    std::string stringDefault;
    // Every string default in order: the elements of a string array constant.
    std::vector<std::string> stringDefaults;
};

struct Instruction {
    std::string opcode;
    std::vector<std::string> args;
    // Jump targets are global instruction indices (section's firstOpIndex + position).
    std::vector<int> jumps;
    int label = -1;
};

struct CodeSection {
    int firstOpIndex = 0;
    std::vector<Instruction> instructions;
};

class OSOData : public OSL::OSOReader {
public:
    OSOData();

    std::map<std::string, OSOSymbol> symbols;
    std::vector<OSOSymbol> symbolList;
    std::map<std::string, CodeSection> sections;

    void symbol(OSL::SymType symtype, OSL::TypeSpec typespec, const char* name) override;
    void symdefault(const char* def) override;
    void symdefault(float def) override;
    void symdefault(int def) override;
    void codemarker(const char* name) override;
    void codeend() override;
    void instruction(int label, const char* opcode) override;
    void instruction_arg(const char* name) override;
    void instruction_jump(int target) override;
    void instruction_end() override;

private:
    void finishPendingSymbol();

    bool m_symbolPending = false;
    OSOSymbol m_pendingSymbol;
    std::string m_currentSection;
    int m_nextOpIndex = 0;
    std::vector<Instruction> m_pendingInstructions;
    Instruction m_instruction;
};

} // namespace oslo
