// Values carried with their screen-space derivatives (value, d/dx, d/dy), the arithmetic the
// shading runtime uses to differentiate every expression automatically.
#pragma once

#include <OSL/oslconfig.h>

#include <cmath>

namespace OSL {

// A value of type T together with PARTIALS partial derivatives. Shading uses two partials
// (d/dx and d/dy), named Dual2.
template <class T, int PARTIALS = 1>
class Dual {
public:
    static constexpr int elements = PARTIALS + 1;

    constexpr Dual() : m_elem{} {}
    constexpr Dual(const T& x) : m_elem{} {
        m_elem[0] = x;
        for (int i = 1; i < elements; ++i) m_elem[i] = T(0);
    }
    constexpr Dual(const T& x, const T& dx) : m_elem{} {
        static_assert(PARTIALS == 1);
        m_elem[0] = x;
        m_elem[1] = dx;
    }
    constexpr Dual(const T& x, const T& dx, const T& dy) : m_elem{} {
        static_assert(PARTIALS == 2);
        m_elem[0] = x;
        m_elem[1] = dx;
        m_elem[2] = dy;
    }
    // Widening from another element type (float to a triple, for example) keeps derivatives.
    template <class F>
    constexpr explicit Dual(const Dual<F, PARTIALS>& other) {
        for (int i = 0; i < elements; ++i) m_elem[i] = T(other.elem(i));
    }

    constexpr const T& val() const { return m_elem[0]; }
    constexpr const T& dx() const { return m_elem[1]; }
    constexpr const T& dy() const { return m_elem[2]; }
    constexpr const T& dz() const { return m_elem[3]; }
    T& val() { return m_elem[0]; }
    T& dx() { return m_elem[1]; }
    T& dy() { return m_elem[2]; }
    T& dz() { return m_elem[3]; }
    void set_val(const T& v) { m_elem[0] = v; }
    void set_dx(const T& v) { m_elem[1] = v; }
    void set_dy(const T& v) { m_elem[2] = v; }
    constexpr const T& elem(int i) const { return m_elem[i]; }
    T& elem(int i) { return m_elem[i]; }
    void clear_d() {
        for (int i = 1; i < elements; ++i) m_elem[i] = T(0);
    }

    Dual& operator+=(const Dual& b) { return *this = *this + b; }
    Dual& operator-=(const Dual& b) { return *this = *this - b; }
    Dual& operator*=(const Dual& b) { return *this = *this * b; }
    Dual& operator/=(const Dual& b) { return *this = *this / b; }

private:
    T m_elem[elements];
};

template <class T>
using Dual2 = Dual<T, 2>;

template <class T, int P>
inline Dual<T, P> operator-(const Dual<T, P>& a) {
    Dual<T, P> r;
    for (int i = 0; i < P + 1; ++i) r.elem(i) = -a.elem(i);
    return r;
}
template <class T, int P>
inline Dual<T, P> operator+(const Dual<T, P>& a, const Dual<T, P>& b) {
    Dual<T, P> r;
    for (int i = 0; i < P + 1; ++i) r.elem(i) = a.elem(i) + b.elem(i);
    return r;
}
template <class T, int P>
inline Dual<T, P> operator-(const Dual<T, P>& a, const Dual<T, P>& b) {
    Dual<T, P> r;
    for (int i = 0; i < P + 1; ++i) r.elem(i) = a.elem(i) - b.elem(i);
    return r;
}
template <class T, int P>
inline Dual<T, P> operator*(const Dual<T, P>& a, const Dual<T, P>& b) {
    Dual<T, P> r;
    r.elem(0) = a.elem(0) * b.elem(0);
    for (int i = 1; i < P + 1; ++i) r.elem(i) = a.elem(0) * b.elem(i) + a.elem(i) * b.elem(0);
    return r;
}
template <class T, int P>
inline Dual<T, P> operator*(const Dual<T, P>& a, const T& b) {
    Dual<T, P> r;
    for (int i = 0; i < P + 1; ++i) r.elem(i) = a.elem(i) * b;
    return r;
}
template <class T, int P>
inline Dual<T, P> operator*(const T& b, const Dual<T, P>& a) {
    return a * b;
}
// Quotient rule; a zero denominator gives zero for the value and the derivatives, as OSL
// defines division. The value is a true quotient (not a times 1/b) so that it has the same bits
// as the division without derivatives.
template <class T, int P>
inline Dual<T, P> operator/(const Dual<T, P>& a, const Dual<T, P>& b) {
    Dual<T, P> r;
    if (b.elem(0) == T(0)) return r;
    const T inv = T(1) / b.elem(0);
    r.elem(0) = a.elem(0) / b.elem(0);
    for (int i = 1; i < P + 1; ++i) r.elem(i) = (a.elem(i) - r.elem(0) * b.elem(i)) * inv;
    return r;
}

// The chain rule for a scalar function with value f and derivative df at a.
template <class T, int P>
inline Dual<T, P> dualfunc(const Dual<T, P>& a, T f, T df) {
    Dual<T, P> r;
    r.elem(0) = f;
    for (int i = 1; i < P + 1; ++i) r.elem(i) = df * a.elem(i);
    return r;
}

template <int P>
inline Dual<float, P> sin(const Dual<float, P>& a) {
    return dualfunc(a, std::sin(a.val()), std::cos(a.val()));
}
template <int P>
inline Dual<float, P> cos(const Dual<float, P>& a) {
    return dualfunc(a, std::cos(a.val()), -std::sin(a.val()));
}
template <int P>
inline Dual<float, P> tan(const Dual<float, P>& a) {
    const float t = std::tan(a.val());
    return dualfunc(a, t, 1.0f + t * t);
}
template <int P>
inline Dual<float, P> sqrt(const Dual<float, P>& a) {
    if (a.val() <= 0.0f) return Dual<float, P>(0.0f);
    const float s = std::sqrt(a.val());
    return dualfunc(a, s, 0.5f / s);
}
template <int P>
inline Dual<float, P> exp(const Dual<float, P>& a) {
    const float e = std::exp(a.val());
    return dualfunc(a, e, e);
}
template <int P>
inline Dual<float, P> fabs(const Dual<float, P>& a) {
    return a.val() >= 0.0f ? a : -a;
}

} // namespace OSL
