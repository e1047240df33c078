// matrix33: a 3x3 matrix, held as the upper-left block of a 4x4 one whose last row and column
// are those of the identity, so that 4x4 matrix ops give the 3x3 results. Arithmetic,
// comparison, transpose, determinant and transforms through operator overloads and overloads.
#pragma once
#define MATRIX33_H

struct matrix33 {
    matrix m;
};

// Whether a 4x4 matrix has the identity's last row and column (and so is exactly a 3x3 one).
int isValidAs33(matrix m)
{
    return m[0][3] == 0 && m[1][3] == 0 && m[2][3] == 0 && m[3][0] == 0 && m[3][1] == 0 &&
           m[3][2] == 0 && m[3][3] == 1;
}

matrix matrix33To44(matrix33 a) { return a.m; }

// The upper-left block of m; translation and projection are dropped.
matrix33 matrix44To33(matrix m)
{
    return matrix33(matrix(m[0][0], m[0][1], m[0][2], 0, m[1][0], m[1][1], m[1][2], 0,
                           m[2][0], m[2][1], m[2][2], 0, 0, 0, 0, 1));
}

matrix33 __operator__neg__(matrix33 a) { return matrix44To33(-a.m); }
matrix33 __operator__add__(matrix33 a, matrix33 b) { return matrix44To33(a.m + b.m); }
matrix33 __operator__sub__(matrix33 a, matrix33 b) { return matrix44To33(a.m - b.m); }
matrix33 __operator__mul__(matrix33 a, matrix33 b) { return matrix33(a.m * b.m); }
matrix33 __operator__mul__(matrix33 a, float b) { return matrix44To33(a.m * b); }
matrix33 __operator__mul__(float a, matrix33 b) { return matrix44To33(a * b.m); }
matrix33 __operator__div__(matrix33 a, matrix33 b) { return matrix33(a.m / b.m); }
matrix33 __operator__div__(matrix33 a, float b) { return matrix44To33(a.m / b); }
matrix33 __operator__div__(float a, matrix33 b) { return matrix44To33(a / b.m); }
int __operator__eq__(matrix33 a, matrix33 b) { return a.m == b.m; }
int __operator__ne__(matrix33 a, matrix33 b) { return a.m != b.m; }

// With the identity's last row and column, the 4x4 determinant is the 3x3 one.
float determinant(matrix33 a) { return determinant(a.m); }
matrix33 transpose(matrix33 a) { return matrix33(transpose(a.m)); }

point transform(matrix33 a, point p) { return transform(a.m, p); }
vector transform(matrix33 a, vector v) { return transform(a.m, v); }
normal transform(matrix33 a, normal n) { return transform(a.m, n); }
