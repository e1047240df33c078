// color2: a two-channel colour (a value and its alpha). Arithmetic, comparison and the
// usual math functions work on it component by component, through operator overloads.
#pragma once
#define COLOR2_H

struct color2 {
    float r;
    float a;
};

// Building blocks: apply a function or operator to each component.
#define COLOR2_MAP1(fn) \
    color2 fn(color2 v) { return color2(fn(v.r), fn(v.a)); }
#define COLOR2_MAP2(fn) \
    color2 fn(color2 p, color2 q) { return color2(fn(p.r, q.r), fn(p.a, q.a)); } \
    color2 fn(color2 p, float q) { return color2(fn(p.r, q), fn(p.a, q)); }
#define COLOR2_ARITH(opname, OP) \
    color2 opname(color2 p, color2 q) { return color2(p.r OP q.r, p.a OP q.a); } \
    color2 opname(color2 p, float q) { return color2(p.r OP q, p.a OP q); } \
    color2 opname(float p, color2 q) { return color2(p OP q.r, p OP q.a); }

color2 __operator__neg__(color2 v) { return color2(-v.r, -v.a); }
COLOR2_ARITH(__operator__add__, +)
COLOR2_ARITH(__operator__sub__, -)
COLOR2_ARITH(__operator__mul__, *)
COLOR2_ARITH(__operator__div__, /)
int __operator__eq__(color2 p, color2 q) { return p.r == q.r && p.a == q.a; }
int __operator__ne__(color2 p, color2 q) { return p.r != q.r || p.a != q.a; }

COLOR2_MAP1(abs) COLOR2_MAP1(ceil) COLOR2_MAP1(floor) COLOR2_MAP1(round)
COLOR2_MAP1(trunc) COLOR2_MAP1(sign) COLOR2_MAP1(sqrt) COLOR2_MAP1(exp)
COLOR2_MAP1(log) COLOR2_MAP1(log2) COLOR2_MAP1(log10) COLOR2_MAP1(sin)
COLOR2_MAP1(cos) COLOR2_MAP1(tan) COLOR2_MAP1(asin) COLOR2_MAP1(acos) COLOR2_MAP1(atan)
COLOR2_MAP2(pow) COLOR2_MAP2(fmod) COLOR2_MAP2(mod)
COLOR2_MAP2(min) COLOR2_MAP2(max) COLOR2_MAP2(atan2)
color2 fabs(color2 v) { return abs(v); }
color2 clamp(color2 v, color2 lo, color2 hi) { return max(min(v, hi), lo); }
color2 clamp(color2 v, float lo, float hi) { return max(min(v, hi), lo); }
color2 mix(color2 p, color2 q, color2 t)
{
    return color2(mix(p.r, q.r, t.r), mix(p.a, q.a, t.a));
}
color2 mix(color2 p, color2 q, float t)
{
    return color2(mix(p.r, q.r, t), mix(p.a, q.a, t));
}
color2 smoothstep(color2 e0, color2 e1, color2 v)
{
    return color2(smoothstep(e0.r, e1.r, v.r), smoothstep(e0.a, e1.a, v.a));
}
color2 smoothstep(float e0, float e1, color2 v)
{
    return color2(smoothstep(e0, e1, v.r), smoothstep(e0, e1, v.a));
}

#undef COLOR2_MAP1
#undef COLOR2_MAP2
#undef COLOR2_ARITH
