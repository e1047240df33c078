// Strings and shader output: printf/format/error/warning/fprintf and the string library.
#include "kernels_registry.h"
#include "osl_format.h"

#include <OpenImageIO/strutil.h>

#include <algorithm>
#include <cstdio>
#include <cstdlib>
#include <fstream>

namespace OSL {

namespace {

void kPrintf(ExecState& st, const Instr& in) {
    oslFormat(st, *st.s(in.args[0]), in.args + 1, in.nargs - 1, st.ctx->output);
}
void kFormat(ExecState& st, const Instr& in) {
    std::string& buf = st.ctx->scratch;
    buf.clear();
    oslFormat(st, *st.s(in.args[1]), in.args + 2, in.nargs - 2, buf);
    *st.s(in.args[0]) = ustring(buf);
}
// error() and warning() text goes to the error handler with the shader's name; with
// error_repeats off, a context reports each distinct message once.
void reportFromShader(ExecState& st, const Instr& in, bool isError) {
    std::string& buf = st.ctx->scratch;
    buf.clear();
    oslFormat(st, *st.s(in.args[0]), in.args + 1, in.nargs - 1, buf);
    reportContextError(*st.ctx,
                       std::string(isError ? "Shader error [" : "Shader warning [") +
                           st.prog->group->layers[size_t(in.layer)].master->name.string() +
                           "]: " + buf,
                       isError);
}
void kError(ExecState& st, const Instr& in) {
    reportFromShader(st, in, true);
}
void kWarning(ExecState& st, const Instr& in) {
    reportFromShader(st, in, false);
}
void kFprintf(ExecState& st, const Instr& in) {
    std::string text;
    oslFormat(st, *st.s(in.args[1]), in.args + 2, in.nargs - 2, text);
    std::ofstream f(st.s(in.args[0])->string(), std::ios::app);
    f << text;
}

void kConcat(ExecState& st, const Instr& in) {
    std::string& buf = st.ctx->scratch;
    buf.clear();
    for (int a = 1; a < in.nargs; ++a) buf += st.s(in.args[a])->string();
    *st.s(in.args[0]) = ustring(buf);
}
void kStrlen(ExecState& st, const Instr& in) {
    *st.i(in.args[0]) = int(st.s(in.args[1])->length());
}
void kSubstr(ExecState& st, const Instr& in) {
    const ustring s = *st.s(in.args[1]);
    const int len = int(s.length());
    int start = st.integer(in.args[2]);
    int n = in.nargs > 3 ? st.integer(in.args[3]) : len;
    if (start < 0) start += len;
    start = std::clamp(start, 0, len);
    n = std::clamp(n, 0, len - start);
    *st.s(in.args[0]) = ustring(s.string().substr(size_t(start), size_t(n)));
}
void kStartswith(ExecState& st, const Instr& in) {
    *st.i(in.args[0]) = OIIO::Strutil::starts_with(*st.s(in.args[1]), *st.s(in.args[2]));
}
void kEndswith(ExecState& st, const Instr& in) {
    *st.i(in.args[0]) = OIIO::Strutil::ends_with(*st.s(in.args[1]), *st.s(in.args[2]));
}
void kStoi(ExecState& st, const Instr& in) {
    *st.i(in.args[0]) = int(std::strtol(st.s(in.args[1])->c_str(), nullptr, 10));
}
void kStof(ExecState& st, const Instr& in) {
    *st.f(in.args[0]) = std::strtof(st.s(in.args[1])->c_str(), nullptr);
    st.zeroDerivs(in.args[0]);
}
void kGetchar(ExecState& st, const Instr& in) {
    const ustring s = *st.s(in.args[1]);
    const int i = st.integer(in.args[2]);
    *st.i(in.args[0]) = (i >= 0 && i < int(s.length())) ? int((unsigned char)s.c_str()[i]) : 0;
}
void kHash(ExecState& st, const Instr& in) {
    *st.i(in.args[0]) = int(st.s(in.args[1])->hash());
}

} // namespace

int selectStringKernel(KernelChoice& k) {
    const std::string_view op = k.op.string();
    const int n = k.nargs();
    if (op == "printf" && n >= 1) return k.in.fn = kPrintf, 1;
    if (op == "format" && n >= 2) return k.in.fn = kFormat, 1;
    if (op == "error" && n >= 1) return k.in.fn = kError, 1;
    if (op == "warning" && n >= 1) return k.in.fn = kWarning, 1;
    if (op == "fprintf" && n >= 2) return k.in.fn = kFprintf, 1;
    if (op == "concat") return k.in.fn = kConcat, 1;
    if (op == "strlen" && n == 2) return k.in.fn = kStrlen, 1;
    if (op == "substr" && (n == 3 || n == 4)) return k.in.fn = kSubstr, 1;
    if (op == "startswith" && n == 3) return k.in.fn = kStartswith, 1;
    if (op == "endswith" && n == 3) return k.in.fn = kEndswith, 1;
    if (op == "stoi" && n == 2) return k.in.fn = kStoi, 1;
    if (op == "stof" && n == 2) return k.in.fn = kStof, 1;
    if (op == "getchar" && n == 3) return k.in.fn = kGetchar, 1;
    if (op == "hash" && n == 2 && k.arg(1).isString) return k.in.fn = kHash, 1;
    return 0;
}

} // namespace OSL
