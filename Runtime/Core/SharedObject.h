// Objects with several owners: each holds one reference, and releasing the last one destroys the object. The count
// starts at 1, the creator's reference.
//
//   T* object = New<T>(label, label, ...);
//   object->AddRef();    // a second holder
//   object->Release();   // the last Release frees the object under its label
//
//   count    AddRef    Release
//   1        2         0: this thread destroys the object, after everything that its holders did before their Release
//   n > 1    n + 1     n - 1
//
// Any thread that holds a reference may call AddRef and Release.
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
        // Release: our writes happen before the last holder destroys the object.
        if (refCount.fetch_sub(1, std::memory_order_release) != 1) return;
        // An acquire load orders as an acquire fence does, and the thread sanitizer understands it.
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
