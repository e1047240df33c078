// Coordinate-system conversions used by constructors and transform ops.
#include "transforms.h"
#include "shading_system_impl.h"

#include <cmath>

namespace OSL {

bool getSpaceMatrix(ExecState& st, ustring space, Matrix44& m, bool toCommon) {
    static const ustring common("common"), shader("shader"), object("object");
    ShadingSystemImpl& sys = *st.ctx->system;
    if (space == common || space.string() == "world") {
        m.makeIdentity();
        return true;
    }
    RendererServices* rs = sys.renderer;
    ShaderGlobals* sg = st.sg;
    bool ok = false;
    if (rs) {
        if (space == shader || space == object) {
            TransformationPtr x = space == shader ? sg->shader2common : sg->object2common;
            ok = toCommon ? rs->get_matrix(sg, m, x, sg->time)
                          : rs->get_inverse_matrix(sg, m, x, sg->time);
        } else {
            ok = toCommon ? rs->get_matrix(sg, m, space, sg->time)
                          : rs->get_inverse_matrix(sg, m, space, sg->time);
        }
    }
    if (!ok) m.makeIdentity();
    return ok;
}

bool sameFixedSpace(const Program& prog, const Operand& from, const Operand& to) {
    auto fixed = [&](const Operand& o, ustring& space) {
        if (!o.isString || !o.isConst) return false;
        space = *reinterpret_cast<const ustring*>(prog.initImage.data() + o.offset);
        if (space == "world") space = ustring("common");
        return true;
    };
    ustring a, b;
    return fixed(from, a) && fixed(to, b) && a == b;
}

void kTransformIdentity(ExecState& st, const Instr& in) {
    st.storeVec(in.args[0], st.dvec(in.args[in.nargs - 1]));
}

Dual2<Vec3> transformDual(const Matrix44& m, const Dual2<Vec3>& v, int kind) {
    Dual2<Vec3> r;
    if (kind == 0) {
        // A point goes through the full projective transform; its derivatives follow the
        // division by w, and a point sent to infinity (w == 0) comes out as the origin.
        using D = Dual2<float>;
        const D x(v.val().x, v.dx().x, v.dy().x), y(v.val().y, v.dx().y, v.dy().y),
            z(v.val().z, v.dx().z, v.dy().z);
        D out[3];
        const D w = x * m[0][3] + y * m[1][3] + z * m[2][3] + D(m[3][3]);
        for (int c = 0; c < 3; ++c) {
            const D a = x * m[0][c] + y * m[1][c] + z * m[2][c] + D(m[3][c]);
            out[c] = w.val() != 0.0f ? a / w : D(0.0f);
        }
        r.val() = Vec3(out[0].val(), out[1].val(), out[2].val());
        r.dx() = Vec3(out[0].dx(), out[1].dx(), out[2].dx());
        r.dy() = Vec3(out[0].dy(), out[1].dy(), out[2].dy());
        return r;
    }
    const Matrix44 mm = kind == 2 ? m.inverse().transposed() : m;
    for (int d = 0; d < 3; ++d) mm.multDirMatrix(v.elem(d), r.elem(d));
    return r;
}

} // namespace OSL
