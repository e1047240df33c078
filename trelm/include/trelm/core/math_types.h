// Value types the SDK exchanges: points, colours and the 4x3 transform matrix.
#pragma once

#include <Imath/ImathColor.h>
#include <Imath/ImathMatrix.h>
#include <Imath/ImathVec.h>

namespace TrelmSDK {

// Points and colours are Imath's types; note that their default constructors leave them
// uninitialised, so the SDK always constructs them with values.
using Point2 = Imath::V2f;
using Point3 = Imath::V3f;
using Point4 = Imath::V4f;
using Color = Imath::C3f;
using AColor = Imath::C4f;

// An affine transform stored as four rows: three axes and a translation. Points are row vectors
// multiplied from the left (p * M), as the host composes transforms.
class Matrix3 {
public:
    // The identity.
    Matrix3() : rows_{Point3(1, 0, 0), Point3(0, 1, 0), Point3(0, 0, 1), Point3(0, 0, 0)} {}
    Matrix3(const Point3& r0, const Point3& r1, const Point3& r2, const Point3& r3)
        : rows_{r0, r1, r2, r3} {}

    const Point3& GetRow(int i) const { return rows_[i]; }
    void SetRow(int i, const Point3& r) { rows_[i] = r; }
    Point3 GetTrans() const { return rows_[3]; }
    void SetTrans(const Point3& t) { rows_[3] = t; }
    void IdentityMatrix() { *this = Matrix3(); }
    bool IsIdentity() const { return *this == Matrix3(); }

    Point3 PointTransform(const Point3& p) const {
        return rows_[0] * p.x + rows_[1] * p.y + rows_[2] * p.z + rows_[3];
    }
    Point3 VectorTransform(const Point3& v) const {
        return rows_[0] * v.x + rows_[1] * v.y + rows_[2] * v.z;
    }

    // This transform followed by b.
    Matrix3 operator*(const Matrix3& b) const {
        return Matrix3(b.VectorTransform(rows_[0]), b.VectorTransform(rows_[1]),
                       b.VectorTransform(rows_[2]), b.PointTransform(rows_[3]));
    }
    bool operator==(const Matrix3& o) const {
        return rows_[0] == o.rows_[0] && rows_[1] == o.rows_[1] && rows_[2] == o.rows_[2] &&
               rows_[3] == o.rows_[3];
    }

    // The same transform as a 4x4 matrix for row vectors (last column 0, 0, 0, 1).
    Imath::M44f ToM44f() const {
        return Imath::M44f(rows_[0].x, rows_[0].y, rows_[0].z, 0, rows_[1].x, rows_[1].y,
                           rows_[1].z, 0, rows_[2].x, rows_[2].y, rows_[2].z, 0, rows_[3].x,
                           rows_[3].y, rows_[3].z, 1);
    }
    static Matrix3 FromM44f(const Imath::M44f& m) {
        return Matrix3(Point3(m[0][0], m[0][1], m[0][2]), Point3(m[1][0], m[1][1], m[1][2]),
                       Point3(m[2][0], m[2][1], m[2][2]), Point3(m[3][0], m[3][1], m[3][2]));
    }

private:
    Point3 rows_[4];
};

// The inverse transform; a singular matrix yields the identity.
inline Matrix3 Inverse(const Matrix3& m) {
    Imath::M44f f = m.ToM44f();
    if (f.determinant() == 0.0f) return Matrix3();
    return Matrix3::FromM44f(f.inverse());
}

} // namespace TrelmSDK

using TrelmSDK::AColor;
using TrelmSDK::Color;
using TrelmSDK::Matrix3;
using TrelmSDK::Point2;
using TrelmSDK::Point3;
using TrelmSDK::Point4;
