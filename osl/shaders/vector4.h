// vector4: a four-component vector. Arithmetic, comparison and the
// usual math functions work on it component by component, through operator overloads.
#pragma once
#define VECTOR4_H

struct vector4 {
    float x;
    float y;
    float z;
    float w;
};

// Building blocks: apply a function or operator to each component.
#define VECTOR4_MAP1(fn) \
    vector4 fn(vector4 v) { return vector4(fn(v.x), fn(v.y), fn(v.z), fn(v.w)); }
#define VECTOR4_MAP2(fn) \
    vector4 fn(vector4 p, vector4 q) { return vector4(fn(p.x, q.x), fn(p.y, q.y), fn(p.z, q.z), fn(p.w, q.w)); } \
    vector4 fn(vector4 p, float q) { return vector4(fn(p.x, q), fn(p.y, q), fn(p.z, q), fn(p.w, q)); }
#define VECTOR4_ARITH(opname, OP) \
    vector4 opname(vector4 p, vector4 q) { return vector4(p.x OP q.x, p.y OP q.y, p.z OP q.z, p.w OP q.w); } \
    vector4 opname(vector4 p, float q) { return vector4(p.x OP q, p.y OP q, p.z OP q, p.w OP q); } \
    vector4 opname(float p, vector4 q) { return vector4(p OP q.x, p OP q.y, p OP q.z, p OP q.w); }

vector4 __operator__neg__(vector4 v) { return vector4(-v.x, -v.y, -v.z, -v.w); }
VECTOR4_ARITH(__operator__add__, +)
VECTOR4_ARITH(__operator__sub__, -)
VECTOR4_ARITH(__operator__mul__, *)
VECTOR4_ARITH(__operator__div__, /)
int __operator__eq__(vector4 p, vector4 q) { return p.x == q.x && p.y == q.y && p.z == q.z && p.w == q.w; }
int __operator__ne__(vector4 p, vector4 q) { return p.x != q.x || p.y != q.y || p.z != q.z || p.w != q.w; }

VECTOR4_MAP1(abs) VECTOR4_MAP1(ceil) VECTOR4_MAP1(floor) VECTOR4_MAP1(round)
VECTOR4_MAP1(trunc) VECTOR4_MAP1(sign) VECTOR4_MAP1(sqrt) VECTOR4_MAP1(exp)
VECTOR4_MAP1(log) VECTOR4_MAP1(log2) VECTOR4_MAP1(log10) VECTOR4_MAP1(sin)
VECTOR4_MAP1(cos) VECTOR4_MAP1(tan) VECTOR4_MAP1(asin) VECTOR4_MAP1(acos) VECTOR4_MAP1(atan)
VECTOR4_MAP2(pow) VECTOR4_MAP2(fmod) VECTOR4_MAP2(mod)
VECTOR4_MAP2(min) VECTOR4_MAP2(max) VECTOR4_MAP2(atan2)
vector4 fabs(vector4 v) { return abs(v); }
vector4 clamp(vector4 v, vector4 lo, vector4 hi) { return max(min(v, hi), lo); }
vector4 clamp(vector4 v, float lo, float hi) { return max(min(v, hi), lo); }
vector4 mix(vector4 p, vector4 q, vector4 t)
{
    return vector4(mix(p.x, q.x, t.x), mix(p.y, q.y, t.y), mix(p.z, q.z, t.z), mix(p.w, q.w, t.w));
}
vector4 mix(vector4 p, vector4 q, float t)
{
    return vector4(mix(p.x, q.x, t), mix(p.y, q.y, t), mix(p.z, q.z, t), mix(p.w, q.w, t));
}
vector4 smoothstep(vector4 e0, vector4 e1, vector4 v)
{
    return vector4(smoothstep(e0.x, e1.x, v.x), smoothstep(e0.y, e1.y, v.y), smoothstep(e0.z, e1.z, v.z), smoothstep(e0.w, e1.w, v.w));
}
vector4 smoothstep(float e0, float e1, vector4 v)
{
    return vector4(smoothstep(e0, e1, v.x), smoothstep(e0, e1, v.y), smoothstep(e0, e1, v.z), smoothstep(e0, e1, v.w));
}

float dot(vector4 p, vector4 q) { return p.x * q.x + p.y * q.y + p.z * q.z + p.w * q.w; }
float length(vector4 v) { return sqrt(dot(v, v)); }
float distance(vector4 p, vector4 q) { return length(q - p); }
vector4 normalize(vector4 v)
{
    float len = length(v);
    if (len > 0.0)
        return v / len;
    return v;
}

#undef VECTOR4_MAP1
#undef VECTOR4_MAP2
#undef VECTOR4_ARITH
