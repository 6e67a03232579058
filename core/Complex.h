// Complex<T>: the element type of complex rasters. Two adjacent T, real part first, as they lie in
// memory and in files. T is float (ComplexSingle, 8 bytes) or double (ComplexDouble, 16 bytes). No
// arithmetic: the module computes no pixel, and a host takes the parts to a type of its own, with
// which the layout of std::complex<T> agrees.
#ifndef ZMC_CORE_COMPLEX_H
#define ZMC_CORE_COMPLEX_H

namespace zelm {

template <class T>
struct Complex {
    T re;  // real part
    T im;  // imaginary part

    // Zero, so that new arrays of it hold zeros.
    constexpr Complex() : re(0), im(0) {}
    constexpr Complex(T real, T imaginary) : re(real), im(imaginary) {}

    // IEEE comparison of both parts: a NaN equals nothing.
    friend constexpr bool operator==(const Complex&, const Complex&) = default;
};

static_assert(sizeof(Complex<float>) == 8 && sizeof(Complex<double>) == 16);

}  // namespace zelm

#endif
