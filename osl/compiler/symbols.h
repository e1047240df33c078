// What code generation produces: symbols (with their values, hints and use ranges), ops, and the
// functions the program may call. The OSO writer prints these.
#pragma once

#include "ast.h"

#include <climits>
#include <map>
#include <string>
#include <vector>

namespace OSL::pvt {

struct Symbol {
    std::string name; // as written to the OSO (scoped names mangled)
    TypeSpec type;
    SymType symtype = SymTypeLocal;
    // Constant values, and shader-parameter defaults, flattened in element order.
    std::vector<int> ivals;
    std::vector<float> fvals;
    std::vector<std::string> svals;
    bool initexpr = false;              // parameter default computed by code
    int initBegin = -1, initEnd = -1;   // that code's op range
    std::vector<std::string> metaHints; // "%meta{type,name,values}" per metadata entry
    Symbol* structParent = nullptr;     // field symbols name their struct variable
    int fieldIndex = -1;
    std::vector<Symbol*> fields; // struct variables list their field symbols
    int readFirst = INT_MAX, readLast = -1, writeFirst = INT_MAX, writeLast = -1;
    bool derivs = false;
    int bornAt = -1;             // for temporaries: the op count when created
    Symbol* renamedTo = nullptr; // a temporary whose op now writes this variable instead
    bool unsizedParam = false;   // a `T name[]` parameter: sized by its default, written as T[]
    // A function parameter bound to an argument of another triple type: the function body sees
    // the parameter's type, the ops use the argument itself. Never written to the OSO.
    Symbol* aliasOf = nullptr;

    bool isConst() const { return symtype == SymTypeConst; }
    void markRead(int op) {
        readFirst = std::min(readFirst, op);
        readLast = std::max(readLast, op);
    }
    void markWrite(int op) {
        writeFirst = std::min(writeFirst, op);
        writeLast = std::max(writeLast, op);
    }
    bool everUsed() const { return readLast >= 0 || writeLast >= 0; }
};

struct Op {
    std::string name;
    std::vector<Symbol*> args;
    std::vector<int> jumps;
    std::string rw;             // one 'r', 'w' or 'W' (read and written) per argument
    std::vector<int> argDerivs; // arguments whose derivatives the op reads
    int file = 0;
    int line = 0;
};

struct FunctionSymbol {
    struct Param {
        TypeSpec type;
        std::string name;
        bool output = false;
    };
    std::string name;
    TypeSpec ret;
    std::vector<Param> params;
    bool variadic = false;  // trailing `...`: any further arguments
    bool builtin = false;   // no body: becomes an op of the same name
    bool isClosure = false; // a closure constructor: emitted as `closure RESULT "name" ARGS`
    std::string opname;     // the op a built-in becomes, when not its own name
    const Node* decl = nullptr;
    std::string file;
    int line = 0;
    std::string signature() const; // "float name (int, color)"
};

// The compiled shader, ready for the OSO writer.
struct ShaderUnit {
    std::string shaderType, shaderName;
    std::vector<std::string> metaHints;
    std::vector<Symbol*> symbols; // in OSO order
    std::vector<Op> ops;
    std::vector<std::string> files;
    int mainBegin = 0; // first op of ___main___
};

} // namespace OSL::pvt
