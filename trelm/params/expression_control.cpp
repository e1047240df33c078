// The float expression controller.
#include "expr_program.h"

#include <trelm/core/hold.h>
#include <trelm/core/remap_dir.h>
#include <trelm/core/sdk_errors.h>
#include <trelm/params/expression_control.h>

namespace TrelmSDK {

// Undo record of an expression change.
class ExprFloatControl::ExprRestore : public RestoreObj {
public:
    using Program = std::shared_ptr<const detail::ExprProgram>;
    ExprRestore(ExprFloatControl* c, MSTR beforeText, Program before, MSTR afterText, Program after)
        : c_(c), beforeText_(std::move(beforeText)), afterText_(std::move(afterText)),
          before_(std::move(before)), after_(std::move(after)) {
        c_->HoldLock();
    }
    ~ExprRestore() override { c_->HoldUnlock(); }
    void Restore(bool) override { c_->Install(beforeText_, before_); }
    void Redo() override { c_->Install(afterText_, after_); }
    MSTR Description() const override { return L"Expression change"; }
    bool RefersTo(const void* object) const override { return object == c_; }

private:
    ExprFloatControl* c_;
    MSTR beforeText_, afterText_;
    Program before_, after_;
};

ExprFloatControl::ExprFloatControl() {
    MSTR error;
    text_ = L"0";
    program_ = detail::ExprProgram::Compile(text_, error);
}

ExprFloatControl::~ExprFloatControl() = default;

void ExprFloatControl::GetClassName(MSTR& s, bool) const {
    s = L"Float Expression";
}

BaseInterface* ExprFloatControl::GetInterface(Interface_ID id) {
    if (id == IID_EXPR_CONTROL) return static_cast<IExprCtrl*>(this);
    return Control::GetInterface(id);
}

float ExprFloatControl::Evaluate(TimeValue t) const {
    detail::ExprTime time{TicksToFrames(t), TicksToSec(t), static_cast<double>(t)};
    return static_cast<float>(program_->Run(time));
}

ControlValue ExprFloatControl::GetValue(TimeValue t, Interval& valid) {
    if (program_->UsesTime()) valid &= Interval(t, t);
    return Evaluate(t);
}

bool ExprFloatControl::SetValue(TimeValue, const ControlValue&) {
    return false;
}

bool ExprFloatControl::IsAnimated() {
    return program_->UsesTime();
}

bool ExprFloatControl::SetExpression(const MSTR& expr) {
    MSTR error;
    auto program = detail::ExprProgram::Compile(expr, error);
    if (!program) {
        lastError_ = error;
        if (reportErrors_) ReportSDKError(L"Expression \"" + expr + L"\": " + error);
        return false;
    }
    lastError_.clear();
    if (theHold.Holding()) theHold.Put(new ExprRestore(this, text_, program_, expr, program));
    Install(expr, std::move(program));
    return true;
}

void ExprFloatControl::Install(const MSTR& text,
                               std::shared_ptr<const detail::ExprProgram> program) {
    text_ = text;
    program_ = std::move(program);
    NotifyDependents(FOREVER, PART_ALL, REFMSG_CHANGE);
}

ReferenceTarget* ExprFloatControl::Clone(RemapDir& remap) {
    auto* c = new ExprFloatControl();
    c->text_ = text_;
    c->program_ = program_;
    c->reportErrors_ = reportErrors_;
    BaseClone(this, c, remap);
    return c;
}

} // namespace TrelmSDK
