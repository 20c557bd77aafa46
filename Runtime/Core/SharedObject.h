// Objects that are owned together: each holder keeps one reference, and the one that lets go of the last destroys the
// object. The count starts at 1, which is the maker's.
//
//   T* object = New<T>(label, label, ...);
//   object->AddRef();    // a second holder
//   object->Release();   // and so on: the last one frees it under its label
//
//   count    AddRef    Release
//   1        2         0: destroyed, by the thread that released it; what all holders did before comes before that
//   n > 1    n + 1     n - 1
//
// AddRef and Release may be called from any thread by a thread that holds a reference.
#pragma once

#include "Runtime/Allocator/Allocator.h"
#include "Runtime/Core/NonCopyable.h"
#include "Runtime/Core/Types.h"

#include <atomic>

// How the last holder frees the object.
template <typename T>
struct SharedObjectFactory {
    static void Destroy(T* object, MemLabelId label) { Delete(object, label); }
};

template <typename T, bool kIsThreadSafe, typename Factory>
class SharedObject;

template <typename T, typename Factory>
class SharedObject<T, true, Factory> : private NonCopyable {
public:
    explicit SharedObject(MemLabelId objectLabel) : label(objectLabel), refCount(1) {}

    void AddRef() const { refCount.fetch_add(1, std::memory_order_relaxed); }

    void Release() const {
        // Release: our writes come before the last holder's free.
        if (refCount.fetch_sub(1, std::memory_order_release) != 1) return;
        // An acquire load orders as the fence does, and the thread sanitizer follows it.
        (void)refCount.load(std::memory_order_acquire);
        Factory::Destroy(static_cast<T*>(const_cast<SharedObject*>(this)), label);
    }

    SInt32 GetRefCount() const { return refCount.load(std::memory_order_relaxed); }

protected:
    ~SharedObject() = default;

private:
    MemLabelId label;
    mutable std::atomic<SInt32> refCount;
};

template <typename T, typename Factory = SharedObjectFactory<T>>
class ThreadSharedObject : public SharedObject<T, true, Factory> {
public:
    using SharedObject<T, true, Factory>::SharedObject;

protected:
    ~ThreadSharedObject() = default;
};
