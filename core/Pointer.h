// Pointer<T>: shared ownership with an atomic count in a record of its own.
//
// An empty pointer still has a record, whose object is null, so making an empty pointer allocates.
// A pointer has no record only after Release, or where the record could not be allocated; Get
// covers that case, and the pointer then counts as empty.
//
// Copies may be made and dropped on several threads, as long as each Pointer variable is used by
// one thread at a time.
#ifndef ZMC_CORE_POINTER_H
#define ZMC_CORE_POINTER_H

#include <atomic>
#include <cstdint>
#include <new>
#include <type_traits>

namespace zelm {

struct ReferenceRecord {
    std::atomic<std::uint32_t> count{0};
    // Untyped, because pointers to a class and to its first base share one record.
    void* object = nullptr;
    bool noDelete = false;  // the last release then frees the record and not the object
};

// How the last release destroys an object; specialised where a plain delete will not do.
template <class T>
struct ObjectDestroyer {
    static void Destroy(T* object) { delete object; }
};

// NOLINTBEGIN(clang-analyzer-cplusplus.NewDelete): it does not follow an atomic count, and takes
// the release by any of two holders for the last.
template <class T>
class Pointer {
public:
    ReferenceRecord* record = nullptr;

    // Takes ownership of `object`, which may be null.
    explicit Pointer(T* object = nullptr) { Bind(object); }
    Pointer(const Pointer& other) : record(other.record) { AddReference(); }

    // Shares the record of a pointer to a class of which T is a base at the same address.
    template <class U>
    requires(std::is_convertible_v<U*, T*> && !std::is_same_v<U, T>)
        Pointer(const Pointer<U>& other)
        : record(other.record) {
        AddReference();
    }

    virtual ~Pointer() { Release(); }

    Pointer& operator=(const Pointer& other) {
        if (this == &other) return *this;
        // The reference is taken first: releasing our object may destroy `other` itself.
        Pointer held(other);
        Release();
        record = held.record;
        AddReference();
        return *this;
    }

    void Reset(T* object = nullptr) {
        Release();
        Bind(object);
    }

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

    T* Get() const { return record ? static_cast<T*>(record->object) : nullptr; }
    // Only of pointers that are not empty.
    T* operator->() const { return static_cast<T*>(record->object); }
    T& operator*() const { return *static_cast<T*>(record->object); }
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
