// Array<T>: a multi-dimensional buffer that owns its elements or is a view of somebody else's.
//
// Elements lie in row-major order, the last dimension in use varying fastest; callers index `data`
// by the shape, without bounds tests. A view allocates nothing and must not outlive its buffer.
// An allocation that fails leaves the array empty with an error record; nothing is thrown, and the
// array stays invalid from then on. One thread at a time may change an array; while nobody does,
// any number may read it.
//
//     Array<int> bands;                       // owns what it gets
//     bands.Append(2);
//     Array<float> view(buffer, ArrayShape(480, 640));   // 480 lines of 640 samples, the caller's
//     float sample = view.data[line * 640 + column];
//
// Counts of elements are 32-bit. T is copied by assignment; a T whose assignment throws lets that
// exception out of whatever copies.
#ifndef ZMC_CORE_ARRAY_H
#define ZMC_CORE_ARRAY_H

#include <algorithm>
#include <cstdint>
#include <new>

#include "core/ArrayShape.h"
#include "core/Object.h"
#include "core/ObjectCodes.h"

namespace zelm {

template <class T>
class Array : public Object {
public:
    // Every instance draws a code of its own for the word "Array".
    // cppcheck-suppress duplInheritedMember ; each class has a code of its own by this name
    static const std::uint32_t typeCode;

    T* data = nullptr;           // null while there is no buffer
    ArrayShape shape;            // how the elements are laid out; `shape.elements` of them count
    std::uint32_t capacity = 0;  // elements that fit in `data`
    bool owned = true;           // false: `data` belongs to somebody else

    // Owns nothing yet: no elements, no dimensions.
    Array() = default;

    // A view of `elements` of the caller's buffer, which must outlive it.
    Array(T* buffer, const ArrayShape& bufferShape)
        : data(buffer), shape(bufferShape), capacity(bufferShape.elements), owned(false) {}

    // A copy of an owning array has a buffer of its own; a copy of a view shares the buffer.
    Array(const Array& other)
        : Object(), shape(other.shape), capacity(other.capacity), owned(other.owned) {
        if (!owned) {
            data = other.data;
        } else if (capacity != 0 && Allocate(capacity) && other.data) {
            std::copy_n(other.data, CopyableElements(other), data);
        }
    }

    // Frees the elements of an owning array.
    ~Array() override {
        if (owned) delete[] data;
    }

    // An owning array that is assigned a view becomes a view, and the buffer that it held is not
    // freed: assign a view only to an array that holds none. A view that is assigned to copies as
    // many elements as fit into the buffer behind it, and stays a view.
    Array& operator=(const Array& other) {
        if (this == &other) return *this;
        if (!owned) {
            SetShape(other.shape);
            if (data && other.data)
                std::copy_n(other.data, std::min(other.shape.elements, capacity), data);
            return *this;
        }
        owned = other.owned;
        shape = other.shape;
        if (!owned) {
            data = other.data;
            capacity = other.capacity;
            return *this;
        }
        if (capacity < other.capacity) {
            delete[] data;
            Allocate(other.capacity);
        }
        if (data && other.data) std::copy_n(other.data, CopyableElements(other), data);
        return *this;
    }

    // True for the code of this very instance of the template, and for that of Object.
    bool IsKindOf(std::uint32_t code) const override {
        return code == typeCode || code == Object::typeCode;
    }

    // Frees the elements: `data` is null, the shape ArrayShape::Emptied() and the capacity 0
    // afterwards. A view is left as it is.
    void Clear() {
        if (!owned) return;
        delete[] data;
        Empty();
    }

    // Makes a new buffer of `n` elements, default-constructed where T is a class and with values
    // of no meaning otherwise. Neither frees the old buffer nor touches the shape: whoever calls it
    // on an array that holds one keeps `data` beforehand and frees it. False, with the array empty
    // and an error record of ObjectErrorOutOfMemory, if there is no memory for `n` elements or the
    // constructor of one throws; an array without elements is no failure.
    bool Allocate(std::uint32_t n) {
        try {
            data = new (std::nothrow) T[n];
        } catch (...) {
            data = nullptr;
        }
        if (data) {
            capacity = n;
            return true;
        }
        Empty();
        if (n == 0) return true;
        SetError(ObjectErrorOutOfMemory());
        return false;
    }

    // Moves to a buffer of `n` elements, with as many of the old ones as fit; the shape stays. The
    // caller keeps the old `data` beforehand, and frees it afterwards whatever the answer. False on
    // a view, which is left as it is, and where Allocate fails. SetShape and Append do all of that
    // by themselves.
    bool Reserve(std::uint32_t n) {
        if (!owned) return false;
        const T* const old = data;
        const ArrayShape oldShape = shape;
        if (!Allocate(n)) return false;
        if (old) std::copy_n(old, std::min(oldShape.elements, n), data);
        return true;
    }

    // Takes another shape. An owning array that is too small for it grows, keeping its elements in
    // their order in memory, and never shrinks its buffer; false where that fails, and the array is
    // then empty. A view takes every shape that fits into its buffer, and refuses others by false.
    bool SetShape(const ArrayShape& newShape) {
        if (!owned) {
            if (newShape.elements > capacity) return false;
            shape = newShape;
            return true;
        }
        shape = newShape;
        if (newShape.elements <= capacity) return true;
        T* const old = data;
        const std::uint32_t oldCapacity = capacity;
        const bool allocated = Allocate(newShape.elements);
        if (allocated && old) std::copy_n(old, oldCapacity, data);
        delete[] old;
        return allocated;
    }

    // Puts a copy of `value` behind the last element, and makes the shape one of one dimension.
    // Grows by exactly one element, so that n calls copy n * n / 2 elements: arrays that are
    // appended to are short. False on a view, and without memory, which leaves the array empty.
    bool Append(const T& value) {
        if (!owned) return false;
        const std::uint32_t position = shape.elements;
        T* const old = data;
        const bool grows = position + 1 > capacity;
        if (grows && !Reserve(position + 1)) {
            delete[] old;
            return false;
        }
        data[position] = value;
        shape = ArrayShape(position + 1);
        if (grows) delete[] old;
        return true;
    }

private:
    std::uint32_t CopyableElements(const Array& other) const {
        return std::min(other.shape.elements, std::min(capacity, other.capacity));
    }

    void Empty() {
        data = nullptr;
        shape = ArrayShape::Emptied();
        capacity = 0;
    }
};

template <class T>
const std::uint32_t Array<T>::typeCode = GloballyUniqueObjectTypeCode("Array");

}  // namespace zelm

#endif
