// color4: an RGB color with alpha.
#pragma once
struct color4 {
    color rgb;
    float a;
};
