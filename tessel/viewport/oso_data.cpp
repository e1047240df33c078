// Builds OSOData from the OSO reader's callbacks; everything the translator does not need (shader
// type and name, version, hints) is left to the base class, which ignores it.
#include "oso_data.h"

#include <OpenImageIO/errorhandler.h>

namespace oslo {

OSOData::OSOData() : OSL::OSOReader(&OIIO::ErrorHandler::default_handler()) {}

void OSOData::finishPendingSymbol() {
    if (!m_symbolPending) return;
    OSOSymbol& stored = symbols[m_pendingSymbol.name];
    stored = m_pendingSymbol;
    symbolList.push_back(m_pendingSymbol);
    m_symbolPending = false;
    m_pendingSymbol = OSOSymbol{};
}

void OSOData::symbol(OSL::SymType symtype, OSL::TypeSpec typespec, const char* name) {
    finishPendingSymbol();
    m_pendingSymbol.name = name;
    m_pendingSymbol.type = typespec;
    m_pendingSymbol.symtype = static_cast<int>(symtype);
    m_symbolPending = true;
}

void OSOData::symdefault(const char* def) {
    m_pendingSymbol.stringDefault = def;
    m_pendingSymbol.stringDefaults.push_back(def);
}

void OSOData::symdefault(float def) {
    m_pendingSymbol.floatDefaults.push_back(def);
}

void OSOData::symdefault(int def) {
    m_pendingSymbol.floatDefaults.push_back(static_cast<float>(def));
}

void OSOData::codemarker(const char* name) {
    finishPendingSymbol();
    codeend();
    m_currentSection = name;
}

void OSOData::codeend() {
    if (!m_currentSection.empty()) {
        CodeSection& section = sections[m_currentSection];
        section.firstOpIndex = m_nextOpIndex;
        section.instructions = m_pendingInstructions;
    }
    m_nextOpIndex += static_cast<int>(m_pendingInstructions.size());
    m_pendingInstructions.clear();
    m_currentSection.clear();
}

void OSOData::instruction(int label, const char* opcode) {
    m_instruction.opcode = opcode;
    m_instruction.label = label;
}

void OSOData::instruction_arg(const char* name) {
    m_instruction.args.emplace_back(name);
}

void OSOData::instruction_jump(int target) {
    m_instruction.jumps.push_back(target);
}

void OSOData::instruction_end() {
    m_pendingInstructions.push_back(std::move(m_instruction));
    m_instruction = Instruction{};
}

} // namespace oslo
