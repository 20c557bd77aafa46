// A pointer that owns an object of New, or a block of malloc_internal, and frees it under its label.
//
//   Owned<Thing> thing(New<Thing>(label), label);
//   if (!thing) return false;           // memory was refused
//   thing->Use();
//   return thing.release();             // the caller owns it now
//
// The memory is freed by Delete, so T may be a base with a virtual destructor. Not synchronised.
#pragma once

#include "Runtime/Allocator/Allocator.h"

#include <utility>

template <typename T>
class Owned {
public:
    // Owns nothing.
    Owned() = default;
    // Takes over object, which may be null. label is the one that object was allocated under.
    Owned(T* object, MemLabelId label) : m_Object(object), m_Label(label) {}

    // The source owns nothing afterwards.
    Owned(Owned&& other) noexcept : m_Object(other.release()), m_Label(other.m_Label) {}
    Owned& operator=(Owned&& other) noexcept {
        Owned taken(std::move(other));
        std::swap(m_Object, taken.m_Object);
        std::swap(m_Label, taken.m_Label);
        return *this;
    }

    ~Owned() { Delete(m_Object, m_Label); }

    // Null when nothing is owned. The object stays owned.
    T* get() const { return m_Object; }
    T* operator->() const { return m_Object; }
    T& operator*() const { return *m_Object; }
    explicit operator bool() const { return m_Object != nullptr; }

    // Gives up the object, which the caller then frees.
    [[nodiscard]] T* release() { return std::exchange(m_Object, nullptr); }

private:
    T* m_Object = nullptr;
    MemLabelId m_Label = kMemLabelGeneral;
};
