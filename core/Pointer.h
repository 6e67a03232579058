// Pointer<T>: shared ownership with an atomic count in a record of its own.
//
// An empty pointer still has a record, whose object is null, so making an empty pointer allocates.
// A pointer has no record only after Release, or where the record could not be allocated; Get
// covers that case, and the pointer then counts as empty.
//
// The record names the object by one address for all its pointers, whose last one destroys it by
// its own type. A pointer to a class therefore converts to a pointer to a base, and takes over an
// object of a derived class, only where that is sound: see CanStandFor.
//
// Copies may be made and dropped on several threads, as long as each Pointer variable is used by
// one thread at a time. The object itself gets no lock from it.
//
// Nothing throws but the destructor of the object. Where the record cannot be allocated, the object
// that was to be owned is destroyed at once, and the pointer is empty.
//
//     PalettePtr palette(new Palette);       // owns it
//     PalettePtr other = palette;            // shares it: the count is 2
//     if (palette) palette->Clear();
//
// The classes that a host meets derive a pointer class of their own from it (GeoRefPtr,
// MetadataPtr, DataConnectionPtr, ...), which adds nothing but a name.
#ifndef ZMC_CORE_POINTER_H
#define ZMC_CORE_POINTER_H

#include <atomic>
#include <cstdint>
#include <memory>
#include <new>
#include <type_traits>
#include <utility>

namespace zelm {

// What all pointers to one object share. It goes with the last of them.
struct ReferenceRecord {
    std::atomic<std::uint32_t> count{0};  // pointers that name this record
    // Untyped, because pointers to a class and to the base at its start share one record.
    void* object = nullptr;
    bool noDelete = false;  // the last release then frees the record and not the object
};

// How the last release destroys an object; specialised where a plain delete will not do.
template <class T>
struct ObjectDestroyer {
    static void Destroy(T* object) { delete object; }
};

// Deleting a Derived through a Base destroys all of it.
template <class Derived, class Base>
concept DestroyedThrough = std::is_same_v<Derived, Base> || std::has_virtual_destructor_v<Base>;

// Told at compile time, abstract classes included: memory for one is enough to compare addresses.
// A base that cannot be cast back is a virtual one, whose place each object decides.
template <class Derived, class Base>
constexpr bool LiesAtTheStart() {
    if constexpr (requires(Base * base) { static_cast<Derived*>(base); }) {
        std::allocator<Derived> memory;
        Derived* const object = memory.allocate(1);
        const Base* const base = object;
        const bool same = static_cast<const void*>(base) == static_cast<const void*>(object);
        memory.deallocate(object, 1);
        return same;
    } else {
        return false;
    }
}

// A pointer to Base may share the record of a pointer to Derived.
template <class Derived, class Base>
concept CanStandFor = !std::is_same_v<Derived, Base> && std::is_convertible_v<Derived*, Base*> &&
                      DestroyedThrough<Derived, Base> && LiesAtTheStart<Derived, Base>();

// NOLINTBEGIN(clang-analyzer-cplusplus.NewDelete): it does not follow an atomic count, and takes
// the release by any of two holders for the last.
template <class T>
class Pointer {
public:
    ReferenceRecord* record = nullptr;  // null after the last Release, and where memory ran out

    // Takes ownership of `object`, which was made by `new` and may be null.
    explicit Pointer(T* object = nullptr) { Bind(object); }
    // An object that the last release could not destroy by its own type is refused.
    template <class U>
    requires(!DestroyedThrough<U, T>) explicit Pointer(U* object) = delete;
    // One more for the same object.
    Pointer(const Pointer& other) : record(other.record) { AddReference(); }

    // Shares the record of a pointer to a class of which T is a base.
    template <class U>
    requires CanStandFor<U, T> Pointer(const Pointer<U>& other) : record(other.record) {
        AddReference();
    }

    virtual ~Pointer() { Release(); }

    // Drops what it held and shares what `other` holds; assigning a pointer to itself changes
    // nothing.
    Pointer& operator=(const Pointer& other) {
        if (this == &other) return *this;
        // The reference is taken first: releasing our object may destroy `other` itself.
        Pointer held(other);
        Release();
        record = held.record;
        AddReference();
        return *this;
    }

    // Drops what it held and takes ownership of `object`, with a new record.
    void Reset(T* object = nullptr) {
        Release();
        Bind(object);
    }
    template <class U>
    requires(!DestroyedThrough<U, T>) void Reset(U* object) = delete;

    // Exchanges the records; counts stand.
    void Swap(Pointer& other) noexcept { std::swap(record, other.record); }

    // Drops this pointer's reference. The last one destroys the object and frees the record; else
    // the pointer still names the record, and its caller overwrites it or is done with it.
    void Release() {
        if (!record) return;
        if (record->count.load() != 0 && record->count.fetch_sub(1) != 1) return;
        if (record->object && !record->noDelete) {
            ObjectDestroyer<T>::Destroy(static_cast<T*>(record->object));
            record->object = nullptr;
        }
        delete record;
        record = nullptr;
    }

    // The object, still owned by the pointers; null if this one is empty.
    T* Get() const { return record ? static_cast<T*>(record->object) : nullptr; }
    // Only of pointers that are not empty, which nothing tests.
    T* operator->() const { return static_cast<T*>(record->object); }
    T& operator*() const { return *static_cast<T*>(record->object); }
    // Whether it holds an object.
    explicit operator bool() const { return Get() != nullptr; }

private:
    // Without a record nobody owns the object yet: it goes at once rather than leak.
    void Bind(T* object) {
        record = new (std::nothrow) ReferenceRecord;
        if (!record) {
            if (object) ObjectDestroyer<T>::Destroy(object);
            return;
        }
        record->object = object;
        AddReference();
    }

    void AddReference() {
        if (record) record->count.fetch_add(1);
    }
};
// NOLINTEND(clang-analyzer-cplusplus.NewDelete)

}  // namespace zelm

#endif
