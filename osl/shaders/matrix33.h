// matrix33: a 3x3 matrix held in a 4x4 one.
#pragma once
struct matrix33 {
    matrix m;
};
