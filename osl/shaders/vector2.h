// vector2: a two-component vector.
#pragma once
struct vector2 {
    float x;
    float y;
};
