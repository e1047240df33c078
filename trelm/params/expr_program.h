// Compiled arithmetic expressions of time, as the expression controller evaluates them.
#pragma once

#include <trelm/core/mstr.h>

#include <memory>
#include <string_view>
#include <vector>

namespace TrelmSDK::detail {

// The time variables an expression may read.
struct ExprTime {
    double frame;   // F
    double seconds; // S
    double ticks;   // T
};

// An expression compiled to a stack program. Immutable once compiled.
class ExprProgram {
public:
    // The program of text; none, with error set to a one-line description, on a syntax error.
    static std::shared_ptr<const ExprProgram> Compile(std::wstring_view text, MSTR& error);
    double Run(const ExprTime& time) const;
    // Whether the value depends on the time variables.
    bool UsesTime() const { return usesTime_; }

    enum class Op { Push, Frame, Seconds, Ticks, Neg, Add, Sub, Mul, Div, Pow, Call1, Call2 };
    struct Instr {
        Op op;
        double value = 0; // Push
        double (*fn1)(double) = nullptr;
        double (*fn2)(double, double) = nullptr;
    };

private:
    friend class ExprParser;
    std::vector<Instr> code_;
    int maxDepth_ = 0;
    bool usesTime_ = false;
};

} // namespace TrelmSDK::detail
