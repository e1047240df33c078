// vector2: a two-component vector. Arithmetic, comparison and the
// usual math functions work on it component by component, through operator overloads.
#pragma once
#define VECTOR2_H

struct vector2 {
    float x;
    float y;
};

// Building blocks: apply a function or operator to each component.
#define VECTOR2_MAP1(fn) \
    vector2 fn(vector2 v) { return vector2(fn(v.x), fn(v.y)); }
#define VECTOR2_MAP2(fn) \
    vector2 fn(vector2 p, vector2 q) { return vector2(fn(p.x, q.x), fn(p.y, q.y)); } \
    vector2 fn(vector2 p, float q) { return vector2(fn(p.x, q), fn(p.y, q)); }
#define VECTOR2_ARITH(opname, OP) \
    vector2 opname(vector2 p, vector2 q) { return vector2(p.x OP q.x, p.y OP q.y); } \
    vector2 opname(vector2 p, float q) { return vector2(p.x OP q, p.y OP q); } \
    vector2 opname(float p, vector2 q) { return vector2(p OP q.x, p OP q.y); }

vector2 __operator__neg__(vector2 v) { return vector2(-v.x, -v.y); }
VECTOR2_ARITH(__operator__add__, +)
VECTOR2_ARITH(__operator__sub__, -)
VECTOR2_ARITH(__operator__mul__, *)
VECTOR2_ARITH(__operator__div__, /)
int __operator__eq__(vector2 p, vector2 q) { return p.x == q.x && p.y == q.y; }
int __operator__ne__(vector2 p, vector2 q) { return p.x != q.x || p.y != q.y; }

VECTOR2_MAP1(abs) VECTOR2_MAP1(ceil) VECTOR2_MAP1(floor) VECTOR2_MAP1(round)
VECTOR2_MAP1(trunc) VECTOR2_MAP1(sign) VECTOR2_MAP1(sqrt) VECTOR2_MAP1(exp)
VECTOR2_MAP1(log) VECTOR2_MAP1(log2) VECTOR2_MAP1(log10) VECTOR2_MAP1(sin)
VECTOR2_MAP1(cos) VECTOR2_MAP1(tan) VECTOR2_MAP1(asin) VECTOR2_MAP1(acos) VECTOR2_MAP1(atan)
VECTOR2_MAP2(pow) VECTOR2_MAP2(fmod) VECTOR2_MAP2(mod)
VECTOR2_MAP2(min) VECTOR2_MAP2(max) VECTOR2_MAP2(atan2)
vector2 fabs(vector2 v) { return abs(v); }
vector2 clamp(vector2 v, vector2 lo, vector2 hi) { return max(min(v, hi), lo); }
vector2 clamp(vector2 v, float lo, float hi) { return max(min(v, hi), lo); }
vector2 mix(vector2 p, vector2 q, vector2 t)
{
    return vector2(mix(p.x, q.x, t.x), mix(p.y, q.y, t.y));
}
vector2 mix(vector2 p, vector2 q, float t)
{
    return vector2(mix(p.x, q.x, t), mix(p.y, q.y, t));
}
vector2 smoothstep(vector2 e0, vector2 e1, vector2 v)
{
    return vector2(smoothstep(e0.x, e1.x, v.x), smoothstep(e0.y, e1.y, v.y));
}
vector2 smoothstep(float e0, float e1, vector2 v)
{
    return vector2(smoothstep(e0, e1, v.x), smoothstep(e0, e1, v.y));
}

float dot(vector2 p, vector2 q) { return p.x * q.x + p.y * q.y; }
float length(vector2 v) { return sqrt(dot(v, v)); }
float distance(vector2 p, vector2 q) { return length(q - p); }
vector2 normalize(vector2 v)
{
    float len = length(v);
    if (len > 0.0)
        return v / len;
    return v;
}

#undef VECTOR2_MAP1
#undef VECTOR2_MAP2
#undef VECTOR2_ARITH
