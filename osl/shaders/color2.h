// color2: a two-channel color (value and alpha) with its arithmetic.
#pragma once
struct color2 {
    float r;
    float a;
};
