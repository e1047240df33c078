// Semantic analysis and code generation in one walk over the tree: every expression is
// type-checked as its ops are emitted. User functions are checked once on their own and then
// inlined at each call, after a `functioncall` op.
#pragma once

#include "ast.h"
#include "diagnostics.h"
#include "symbols.h"

#include <map>
#include <memory>
#include <set>

namespace OSL::pvt {

std::string formatFloat(float f);
std::string quoteString(const std::string& s);

// Whether a value of type src may be stored in dst: OSL's assignability, plus any triple into
// any triple (color from point and the like).
bool assignCompatible(const TypeSpec& dst, const TypeSpec& src);

class CodeGen {
public:
    CodeGen(Diagnostics& diag, const std::vector<std::string>& files);
    ~CodeGen();
    // Checks and compiles the declarations (the standard library's first); fills `out` with the
    // one shader found. False when errors were reported.
    bool run(const std::vector<NodePtr>& decls, ShaderUnit& out);

private:
    struct LRef {
        Symbol* sym = nullptr;   // the variable (a struct variable for struct values)
        Symbol* index = nullptr; // array element
        Symbol* comp = nullptr;  // component of a triple, or row of a matrix
        Symbol* comp2 = nullptr; // column of a matrix
        TypeSpec type;
        bool valid() const { return sym != nullptr; }
    };
    struct Scope {
        std::map<std::string, Symbol*> vars;
        std::map<std::string, const Node*> declaredAt;
        int id = 0;
    };
    struct InlineFrame {
        FunctionSymbol* fn;
        Symbol* result;
        std::vector<int> returnOps; // `return` ops whose target is the end of the body
        std::set<int> keptReturns;  // `return` ops oslc keeps even when they end the body
    };
    struct LoopFrame {
        bool any = false;
    };

    // diagnostics
    void error(const Node* at, const std::string& msg);
    void warning(const Node* at, const std::string& msg);
    const std::string& fileOf(const Node* n) const;

    // types and symbols
    TypeSpec resolveType(const TypeName& tn, const Node* at);
    Symbol* newSymbol(const std::string& name, const TypeSpec& t, SymType st);
    Symbol* newStructSymbol(const std::string& name, const TypeSpec& t, SymType st);
    Symbol* temp(const TypeSpec& t);
    void conditionCheck(const TypeSpec& t, const Node* at, const std::string& as, bool closureOk);
    Symbol* viewAs(Symbol* s, const TypeSpec& t); // `s` seen as another triple type
    Symbol* constInt(int v);
    Symbol* constFloat(float v);
    Symbol* constString(const std::string& s);
    Symbol* constant(const TypeSpec& t, const std::vector<int>& iv, const std::vector<float>& fv,
                     const std::vector<std::string>& sv);
    Symbol* lookupVar(const std::string& name);
    Symbol* global(const std::string& name);
    bool isGlobalName(const std::string& name) const;
    void declare(const std::string& name, Symbol* s, const Node* at);
    std::string scopedName(const std::string& name);
    void pushScope();
    void popScope();

    // ops
    int emit(const std::string& name, std::vector<Symbol*> args, std::string rw = "");
    int nextOp() const { return int(m_ops->size()); }

    // declarations
    void declareStruct(const Node* n);
    void declareFunction(const Node* n);
    void warnIfRedefined(const FunctionSymbol& fn, const Node* at);
    void checkFunctionBody(FunctionSymbol* fn);
    void compileShader(const Node* n, ShaderUnit& out);
    void shaderParam(const Node* p, ShaderUnit& out);
    std::string metaHint(const Node* m);
    bool constValue(const Node* e, const TypeSpec& t, std::vector<int>& iv, std::vector<float>& fv,
                    std::vector<std::string>& sv);

    // statements
    void statement(const Node* s);
    void varDecl(const Node* d);
    void initVariable(Symbol* var, const Node* init, const Node* at, bool isDecl);
    Symbol* constArray(const Node* init, const TypeSpec& t);
    void ifStatement(const Node* s);
    void loop(const Node* s);
    void returnStatement(const Node* s);

    // expressions
    Symbol* expr(const Node* e, const TypeSpec* expected = nullptr);
    Symbol* binary(const Node* e, const TypeSpec* expected = nullptr, Symbol* dest = nullptr);
    Symbol* logical(const Node* e);
    Symbol* unary(const Node* e, Symbol* dest = nullptr);
    Symbol* incdec(const Node* e);
    Symbol* assign(const Node* e);
    Symbol* ternary(const Node* e, Symbol* dest = nullptr);
    Symbol* typeCtor(const Node* e);
    Symbol* construct(const Node* e, const TypeSpec& t, std::vector<Symbol*> args);
    Symbol* foldTriple(const TypeSpec& t, const std::vector<Symbol*>& args);
    Symbol* call(const Node* e, const TypeSpec* expected, Symbol* dest = nullptr);
    Symbol* structCtor(const Node* e, int structId, Symbol* dest = nullptr);
    bool structInto(const Node* e, const LRef& dst);
    void storeFields(const Node* e, const LRef& dst);
    bool mentions(const Node* e, const Symbol* root);
    Symbol* initList(const Node* e, const TypeSpec& t);
    Symbol* indexRead(const Node* e);
    Symbol* fieldRead(const Node* e);
    LRef lvalue(const Node* e, bool forWrite);
    Symbol* load(const LRef& r, const Node* at);
    void store(const LRef& r, Symbol* value, const Node* at, bool checkWrite = true);
    Symbol* convert(Symbol* v, const TypeSpec& to, const Node* at);
    Symbol* arrayElement(Symbol* value, const TypeSpec& et, const Node* at);
    void assignInto(Symbol* dst, Symbol* src, const Node* at);
    bool retarget(Symbol* dst, Symbol* src);
    void checkWritable(Symbol* s, const Node* at, const std::string& context = "",
                       bool plainAssign = false);
    Symbol* voidValue();
    Symbol* operatorCall(const std::string& opname, const std::vector<Symbol*>& args,
                         const Node* at, Symbol* dest = nullptr);
    Symbol* inlineCall(FunctionSymbol* fn, const Node* e, std::vector<Symbol*>& args,
                       std::vector<LRef>& argRefs, Symbol* dest = nullptr);
    Symbol* exprInto(const Node* e, Symbol* dest, const TypeSpec* expected);
    bool canTarget(const Symbol* dest, const TypeSpec& t) const;
    FunctionSymbol* resolveOverload(const std::string& name, const std::vector<TypeSpec>& argTypes,
                                    const Node* at, const TypeSpec* expected, bool report = true);
    Symbol* builtinCall(FunctionSymbol* fn, const Node* e, std::vector<Symbol*>& args,
                        std::vector<LRef>& refs, const TypeSpec* expected,
                        bool formatChecked = false);
    bool checkFormatCall(FunctionSymbol* fn, const Node* e, const std::vector<TypeSpec>& types);

    Diagnostics& m_diag;
    const std::vector<std::string>& m_files;
    std::vector<std::unique_ptr<Symbol>> m_pool;
    std::vector<Symbol*> m_symbols; // those that go to the OSO, in creation order
    std::vector<Op> m_mainOps;
    std::vector<Op>* m_ops = &m_mainOps;
    std::vector<Scope> m_scopes;
    int m_nextScopeId = 0;
    int m_shaderScopeDepth = -1;
    std::map<std::string, Symbol*> m_globals;
    std::map<std::string, int> m_structs;
    std::map<std::string, std::vector<std::unique_ptr<FunctionSymbol>>> m_functions;
    std::vector<InlineFrame> m_inline;
    std::vector<LoopFrame> m_loops;
    std::map<std::string, Symbol*> m_constCache;
    int m_tmpCount = 0, m_constCount = 0;
    int m_curFile = 0, m_curLine = 0;
    int m_lastFile = -1, m_lastLine = -1;
    int m_silent = 0; // >0 while re-walking code already checked (inlining)
    bool m_checkOnly = false;
    std::set<std::string> m_nonWritableGlobals;
    std::set<const Node*> m_declaredFunctions;
    Symbol* m_void = nullptr; // the value of a void call
    FunctionSymbol* m_currentFunction = nullptr;
    bool m_sawReturn = false;
};

} // namespace OSL::pvt
