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
        const Vec3& p = v.val();
        const float w = p.x * m[0][3] + p.y * m[1][3] + p.z * m[2][3] + m[3][3];
        Vec3 q;
        m.multVecMatrix(p, q);
        r.val() = q;
        for (int d = 1; d < 3; ++d) {
            Vec3 dv;
            m.multDirMatrix(v.elem(d), dv);
            r.elem(d) = w != 0.0f && w != 1.0f ? dv / w : dv;
        }
        return r;
    }
    const Matrix44 mm = kind == 2 ? m.inverse().transposed() : m;
    for (int d = 0; d < 3; ++d) mm.multDirMatrix(v.elem(d), r.elem(d));
    return r;
}

} // namespace OSL
