// The float expression controller: a parameter's value computed from a formula of time.
#pragma once

#include <trelm/params/controller.h>

#include <memory>

namespace TrelmSDK {

namespace detail {
class ExprProgram;
} // namespace detail

inline constexpr Class_ID EXPR_FLOAT_CONTROL_CLASS_ID(0x2015, 0);
inline constexpr Interface_ID IID_EXPR_CONTROL(0x15B3E322, 0x6A176AA5);

// The expression interface of an expression controller (GetInterface(IID_EXPR_CONTROL)).
//
// Expressions: decimal numbers; + - * / and ^ (power, right-associative); unary minus;
// parentheses; the variables F (current frame, fractional between frames), S (current time in
// seconds), T (current time in ticks) and pi; the functions sin, cos, tan (radians), abs, sqrt,
// floor, ceil, min(a, b), max(a, b) and pow(a, b). Names are case-sensitive.
class IExprCtrl : public FPInterface {
public:
    Interface_ID GetID() const override { return IID_EXPR_CONTROL; }
    // Parses and installs expr; on a syntax error the previous expression stays, the error text
    // is kept (GetLastError) and, with ReportErrors on, reported. Undoable.
    virtual bool SetExpression(const MSTR& expr) = 0;
    virtual MSTR GetExpression() const = 0;
    // Whether a bad expression is reported through the SDK error channel (on by default); callers
    // that check the result themselves switch it off while they set an expression.
    virtual bool GetReportErrors() const = 0;
    virtual void SetReportErrors(bool on) = 0;
    virtual MSTR GetLastError() const = 0;
    // The expression's value at t.
    virtual float Evaluate(TimeValue t) const = 0;
};

// A float controller whose value is its expression at the evaluated time. An expression that
// uses F, S or T is valid only at that instant; one that does not is valid forever. A new
// controller's expression is "0".
class ExprFloatControl : public Control, public IExprCtrl {
public:
    ExprFloatControl();
    ~ExprFloatControl() override;

    Class_ID ClassID() const override { return EXPR_FLOAT_CONTROL_CLASS_ID; }
    SClass_ID SuperClassID() const override { return CTRL_FLOAT_CLASS_ID; }
    void GetClassName(MSTR& s, bool localized = true) const override;
    BaseInterface* GetInterface(Interface_ID id) override;

    ControlValue GetValue(TimeValue t, Interval& valid) override;
    // Expressions do not take values: false.
    bool SetValue(TimeValue t, const ControlValue& v) override;
    bool IsAnimated() override;

    bool SetExpression(const MSTR& expr) override;
    MSTR GetExpression() const override { return text_; }
    bool GetReportErrors() const override { return reportErrors_; }
    void SetReportErrors(bool on) override { reportErrors_ = on; }
    MSTR GetLastError() const override { return lastError_; }
    float Evaluate(TimeValue t) const override;

    ReferenceTarget* Clone(RemapDir& remap) override;

private:
    class ExprRestore;
    void Install(const MSTR& text, std::shared_ptr<const detail::ExprProgram> program);

    MSTR text_;
    // Shared with undo records; replaced whole (main thread), never changed in place.
    std::shared_ptr<const detail::ExprProgram> program_;
    bool reportErrors_ = true;
    MSTR lastError_;
};

} // namespace TrelmSDK
