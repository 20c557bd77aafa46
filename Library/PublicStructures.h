// How the public functions take and fill the structures of callers that were compiled with another version of zarvo.h.
#pragma once

#include "Library/Failure.h"

#include <algorithm>
#include <cstring>

// Whether the caller has set struct_size. A structure that holds nothing else would say nothing.
template <typename T>
bool HasSize(const T* structure) {
    return structure->struct_size > sizeof(structure->struct_size);
}

template <typename T>
bool IsNullOrHasSize(const T* structure) {
    return structure == nullptr || HasSize(structure);
}

constexpr char kNoSize[] = "a structure whose struct_size is not set";

// Structures of an older caller are shorter than ours, those of a newer one longer: only fields that both have are
// copied.
template <typename T>
T CopyIn(const T* given) {
    T copy = {};
    if (given != nullptr) memcpy(&copy, given, std::min(given->struct_size, sizeof(copy)));
    return copy;
}

// out has its size.
template <typename T>
void CopyOut(const T& filled, T* out) {
    const size_t size = std::min(out->struct_size, sizeof(filled));
    memcpy(reinterpret_cast<char*>(out) + sizeof(out->struct_size),
           reinterpret_cast<const char*>(&filled) + sizeof(out->struct_size), size - sizeof(out->struct_size));
}

inline zarvo_code RefuseArgument(const char* what, zarvo_error** error) {
    Failure failure;
    return Deliver(failure.SetArgument(what), failure, error);
}
