// The syntax tree the parser builds and the later passes annotate. One node type with a kind
// keeps the passes simple: each pass switches on the kind and reads the fields that kind uses.
#pragma once

#include <OSL/typespec.h>

#include <memory>
#include <string>
#include <vector>

namespace OSL::pvt {

struct Symbol;
struct FunctionSymbol;

// A type as written in the source, resolved to a TypeSpec by the semantic pass.
struct TypeName {
    std::string name;      // "float", "color", "void", or a struct's name
    bool closure = false;  // `closure color`
    bool isOutput = false; // `output` qualifier on a parameter
    int arraylen = 0;      // 0: not an array, -1: unsized `[]`, else the declared length
    bool valid() const { return !name.empty(); }
};

enum class NodeKind {
    // expressions
    IntLit,
    FloatLit,
    StringLit,
    VarRef,
    Index,
    Field,
    Unary,
    PreIncDec,
    PostIncDec,
    Binary,
    Ternary,
    Assign,
    Call,
    TypeCtor,
    InitList,
    Comma,
    // statements
    Block,
    ExprStmt,
    VarDecl,
    Declarator,
    If,
    Loop,
    Break,
    Continue,
    Return,
    Empty,
    // top level
    StructDecl,
    FunctionDecl,
    ShaderDecl,
    Param,
    Metadata
};

enum class LoopKind { For, While, DoWhile };

struct Node {
    NodeKind kind;
    int file = 0;
    int line = 0;
    std::string op;   // operator spelling, or the shader type for ShaderDecl
    std::string name; // identifier: variable, field, function, declarator
    long long intValue = 0;
    double floatValue = 0;
    std::string stringValue;
    TypeName typeName; // declarations, constructors, casts, metadata
    LoopKind loop = LoopKind::For;
    bool isCast = false; // TypeCtor written as `(type) expr`
    bool parenthesized = false;
    std::vector<std::unique_ptr<Node>> kids;     // operands, statements, declarators, params
    std::vector<std::unique_ptr<Node>> metadata; // [[ ... ]] entries (Metadata nodes)
    std::unique_ptr<Node> body;                  // FunctionDecl / ShaderDecl body (a Block)

    // Filled in by the semantic pass.
    TypeSpec type;
    Symbol* sym = nullptr;
    FunctionSymbol* func = nullptr;

    Node(NodeKind k, int f, int l) : kind(k), file(f), line(l) {}
    Node* kid(size_t i) const { return i < kids.size() ? kids[i].get() : nullptr; }
};

using NodePtr = std::unique_ptr<Node>;

} // namespace OSL::pvt
