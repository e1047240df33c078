// vector4: a four-component vector.
#pragma once
struct vector4 {
    float x;
    float y;
    float z;
    float w;
};
