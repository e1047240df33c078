// A recursive-descent parser that compiles expressions to stack code, and the stack machine.
#include "expr_program.h"

#include <charconv>
#include <cmath>
#include <cwctype>
#include <numbers>
#include <optional>
#include <string>

namespace TrelmSDK::detail {

namespace {
struct Function1 {
    const wchar_t* name;
    double (*fn)(double);
};
struct Function2 {
    const wchar_t* name;
    double (*fn)(double, double);
};

const Function1 kFunctions1[] = {
    {L"sin", [](double x) { return std::sin(x); }},
    {L"cos", [](double x) { return std::cos(x); }},
    {L"tan", [](double x) { return std::tan(x); }},
    {L"abs", [](double x) { return std::fabs(x); }},
    {L"sqrt", [](double x) { return std::sqrt(x); }},
    {L"floor", [](double x) { return std::floor(x); }},
    {L"ceil", [](double x) { return std::ceil(x); }},
};
const Function2 kFunctions2[] = {
    {L"min", [](double a, double b) { return std::fmin(a, b); }},
    {L"max", [](double a, double b) { return std::fmax(a, b); }},
    {L"pow", [](double a, double b) { return std::pow(a, b); }},
};
} // namespace

// Grammar (lowest precedence first):
//   sum     := product (('+' | '-') product)*
//   product := unary (('*' | '/') unary)*
//   unary   := ('-' | '+') unary | power
//   power   := primary ('^' unary)?
//   primary := number | name | name '(' sum (',' sum)* ')' | '(' sum ')'
class ExprParser {
public:
    ExprParser(std::wstring_view text, ExprProgram& out) : s_(text), out_(out) {}

    bool Parse(MSTR& error) {
        Skip();
        if (pos_ == s_.size()) return Fail(L"the expression is empty", error);
        if (!Sum()) return Fail(problem_, error);
        Skip();
        if (pos_ != s_.size()) return Fail(Unexpected(), error);
        return true;
    }

private:
    bool Fail(const MSTR& what, MSTR& error) {
        error = what;
        return false;
    }
    void Skip() {
        while (pos_ < s_.size() && std::iswspace(s_[pos_])) ++pos_;
    }
    bool Peek(wchar_t c) {
        Skip();
        return pos_ < s_.size() && s_[pos_] == c;
    }
    MSTR Unexpected() {
        if (pos_ >= s_.size()) return L"the expression ends too early";
        return L"unexpected '" + MSTR(1, s_[pos_]) + L"' at position " + std::to_wstring(pos_ + 1);
    }
    bool Error(const MSTR& what) {
        if (problem_.empty()) problem_ = what;
        return false;
    }
    void Emit(ExprProgram::Instr i, int stackChange) {
        out_.code_.push_back(i);
        depth_ += stackChange;
        if (depth_ > out_.maxDepth_) out_.maxDepth_ = depth_;
    }

    bool Sum() {
        if (!Product()) return false;
        while (Peek(L'+') || Peek(L'-')) {
            wchar_t op = s_[pos_++];
            if (!Product()) return false;
            Emit({op == L'+' ? ExprProgram::Op::Add : ExprProgram::Op::Sub}, -1);
        }
        return true;
    }
    bool Product() {
        if (!Unary()) return false;
        while (Peek(L'*') || Peek(L'/')) {
            wchar_t op = s_[pos_++];
            if (!Unary()) return false;
            Emit({op == L'*' ? ExprProgram::Op::Mul : ExprProgram::Op::Div}, -1);
        }
        return true;
    }
    bool Unary() {
        if (Peek(L'-')) {
            ++pos_;
            if (!Unary()) return false;
            Emit({ExprProgram::Op::Neg}, 0);
            return true;
        }
        if (Peek(L'+')) {
            ++pos_;
            return Unary();
        }
        return Power();
    }
    bool Power() {
        if (!Primary()) return false;
        if (Peek(L'^')) {
            ++pos_;
            if (!Unary()) return false;
            Emit({ExprProgram::Op::Pow}, -1);
        }
        return true;
    }
    bool Primary() {
        Skip();
        if (pos_ >= s_.size()) return Error(L"the expression ends too early");
        wchar_t c = s_[pos_];
        if (c == L'(') {
            ++pos_;
            if (!Sum()) return false;
            if (!Peek(L')')) return Error(L"missing ')' at position " + std::to_wstring(pos_ + 1));
            ++pos_;
            return true;
        }
        if (std::iswdigit(c) || c == L'.') return Number();
        if (std::iswalpha(c) || c == L'_') return Name();
        return Error(Unexpected());
    }
    bool Number() {
        size_t start = pos_;
        while (pos_ < s_.size() && std::iswdigit(s_[pos_])) ++pos_;
        if (pos_ < s_.size() && s_[pos_] == L'.') ++pos_;
        while (pos_ < s_.size() && std::iswdigit(s_[pos_])) ++pos_;
        if (pos_ < s_.size() && (s_[pos_] == L'e' || s_[pos_] == L'E')) {
            size_t save = pos_++;
            if (pos_ < s_.size() && (s_[pos_] == L'+' || s_[pos_] == L'-')) ++pos_;
            if (pos_ < s_.size() && std::iswdigit(s_[pos_])) {
                while (pos_ < s_.size() && std::iswdigit(s_[pos_])) ++pos_;
            } else {
                pos_ = save;
            }
        }
        std::wstring text(s_.substr(start, pos_ - start));
        if (text == L".") return Error(L"a lone '.' at position " + std::to_wstring(start + 1));
        // from_chars reads the decimal point whatever the user's locale.
        std::string narrow(text.begin(), text.end());
        double v = 0;
        std::from_chars(narrow.data(), narrow.data() + narrow.size(), v);
        Emit({ExprProgram::Op::Push, v}, 1);
        return true;
    }
    bool Name() {
        size_t start = pos_;
        while (pos_ < s_.size() && (std::iswalnum(s_[pos_]) || s_[pos_] == L'_')) ++pos_;
        std::wstring name(s_.substr(start, pos_ - start));
        if (Peek(L'(')) return Call(name, start);
        if (name == L"F") {
            Emit({ExprProgram::Op::Frame}, 1);
            out_.usesTime_ = true;
        } else if (name == L"S") {
            Emit({ExprProgram::Op::Seconds}, 1);
            out_.usesTime_ = true;
        } else if (name == L"T") {
            Emit({ExprProgram::Op::Ticks}, 1);
            out_.usesTime_ = true;
        } else if (name == L"pi") {
            Emit({ExprProgram::Op::Push, std::numbers::pi}, 1);
        } else {
            return Error(L"unknown name '" + name + L"' at position " + std::to_wstring(start + 1));
        }
        return true;
    }
    bool Call(const std::wstring& name, size_t start) {
        ++pos_; // '('
        int args = 0;
        if (!Peek(L')')) {
            do {
                if (args > 0) ++pos_; // ','
                if (!Sum()) return false;
                ++args;
            } while (Peek(L','));
        }
        if (!Peek(L')')) return Error(L"missing ')' at position " + std::to_wstring(pos_ + 1));
        ++pos_;
        for (auto& f : kFunctions1)
            if (name == f.name) {
                if (args != 1) return Error(L"function '" + name + L"' takes 1 argument");
                ExprProgram::Instr i{ExprProgram::Op::Call1};
                i.fn1 = f.fn;
                Emit(i, 0);
                return true;
            }
        for (auto& f : kFunctions2)
            if (name == f.name) {
                if (args != 2) return Error(L"function '" + name + L"' takes 2 arguments");
                ExprProgram::Instr i{ExprProgram::Op::Call2};
                i.fn2 = f.fn;
                Emit(i, -1);
                return true;
            }
        return Error(L"unknown function '" + name + L"' at position " + std::to_wstring(start + 1));
    }

    std::wstring_view s_;
    size_t pos_ = 0;
    ExprProgram& out_;
    int depth_ = 0;
    MSTR problem_;
};

std::shared_ptr<const ExprProgram> ExprProgram::Compile(std::wstring_view text, MSTR& error) {
    auto program = std::make_shared<ExprProgram>();
    ExprParser parser(text, *program);
    if (!parser.Parse(error)) return nullptr;
    error.clear();
    return program;
}

double ExprProgram::Run(const ExprTime& time) const {
    // Expressions are short; a fixed stack avoids allocation on render threads.
    constexpr int kInline = 32;
    double inlineStack[kInline];
    std::vector<double> heapStack;
    double* stack = inlineStack;
    if (maxDepth_ > kInline) {
        heapStack.resize(maxDepth_);
        stack = heapStack.data();
    }
    int sp = 0;
    for (const Instr& i : code_) {
        switch (i.op) {
        case Op::Push:
            stack[sp++] = i.value;
            break;
        case Op::Frame:
            stack[sp++] = time.frame;
            break;
        case Op::Seconds:
            stack[sp++] = time.seconds;
            break;
        case Op::Ticks:
            stack[sp++] = time.ticks;
            break;
        case Op::Neg:
            stack[sp - 1] = -stack[sp - 1];
            break;
        case Op::Add:
            --sp, stack[sp - 1] += stack[sp];
            break;
        case Op::Sub:
            --sp, stack[sp - 1] -= stack[sp];
            break;
        case Op::Mul:
            --sp, stack[sp - 1] *= stack[sp];
            break;
        case Op::Div:
            --sp, stack[sp - 1] /= stack[sp];
            break;
        case Op::Pow:
            --sp, stack[sp - 1] = std::pow(stack[sp - 1], stack[sp]);
            break;
        case Op::Call1:
            stack[sp - 1] = i.fn1(stack[sp - 1]);
            break;
        case Op::Call2:
            --sp, stack[sp - 1] = i.fn2(stack[sp - 1], stack[sp]);
            break;
        }
    }
    return sp == 1 ? stack[0] : 0.0;
}

} // namespace TrelmSDK::detail
