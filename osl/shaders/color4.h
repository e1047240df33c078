// color4: an RGB colour with alpha. Arithmetic, comparison and the
// usual math functions work on it component by component, through operator overloads.
#pragma once
#define COLOR4_H

struct color4 {
    color rgb;
    float a;
};

// Building blocks: apply a function or operator to each component.
#define COLOR4_MAP1(fn) \
    color4 fn(color4 v) { return color4(fn(v.rgb), fn(v.a)); }
#define COLOR4_MAP2(fn) \
    color4 fn(color4 p, color4 q) { return color4(fn(p.rgb, q.rgb), fn(p.a, q.a)); } \
    color4 fn(color4 p, float q) { return color4(fn(p.rgb, q), fn(p.a, q)); }
#define COLOR4_ARITH(opname, OP) \
    color4 opname(color4 p, color4 q) { return color4(p.rgb OP q.rgb, p.a OP q.a); } \
    color4 opname(color4 p, float q) { return color4(p.rgb OP q, p.a OP q); } \
    color4 opname(float p, color4 q) { return color4(p OP q.rgb, p OP q.a); }

color4 __operator__neg__(color4 v) { return color4(-v.rgb, -v.a); }
COLOR4_ARITH(__operator__add__, +)
COLOR4_ARITH(__operator__sub__, -)
COLOR4_ARITH(__operator__mul__, *)
COLOR4_ARITH(__operator__div__, /)
int __operator__eq__(color4 p, color4 q) { return p.rgb == q.rgb && p.a == q.a; }
int __operator__ne__(color4 p, color4 q) { return p.rgb != q.rgb || p.a != q.a; }

COLOR4_MAP1(abs) COLOR4_MAP1(ceil) COLOR4_MAP1(floor) COLOR4_MAP1(round)
COLOR4_MAP1(trunc) COLOR4_MAP1(sign) COLOR4_MAP1(sqrt) COLOR4_MAP1(exp)
COLOR4_MAP1(log) COLOR4_MAP1(log2) COLOR4_MAP1(log10) COLOR4_MAP1(sin)
COLOR4_MAP1(cos) COLOR4_MAP1(tan) COLOR4_MAP1(asin) COLOR4_MAP1(acos) COLOR4_MAP1(atan)
COLOR4_MAP2(pow) COLOR4_MAP2(fmod) COLOR4_MAP2(mod)
COLOR4_MAP2(min) COLOR4_MAP2(max) COLOR4_MAP2(atan2)
color4 fabs(color4 v) { return abs(v); }
color4 clamp(color4 v, color4 lo, color4 hi) { return max(min(v, hi), lo); }
color4 clamp(color4 v, float lo, float hi) { return max(min(v, hi), lo); }
color4 mix(color4 p, color4 q, color4 t)
{
    return color4(mix(p.rgb, q.rgb, t.rgb), mix(p.a, q.a, t.a));
}
color4 mix(color4 p, color4 q, float t)
{
    return color4(mix(p.rgb, q.rgb, t), mix(p.a, q.a, t));
}
color4 smoothstep(color4 e0, color4 e1, color4 v)
{
    return color4(smoothstep(e0.rgb, e1.rgb, v.rgb), smoothstep(e0.a, e1.a, v.a));
}
color4 smoothstep(float e0, float e1, color4 v)
{
    return color4(smoothstep(e0, e1, v.rgb), smoothstep(e0, e1, v.a));
}

#undef COLOR4_MAP1
#undef COLOR4_MAP2
#undef COLOR4_ARITH
