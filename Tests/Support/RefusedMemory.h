// Refuses memory to the thread that makes one: its n-th request, counted from 1, or each from the n-th on; only those
// of at least a given size count. A test raises n until a run meets no refusal:
//
//   for (int n = 1; RefusedMemory::HasStruck() || n == 1; ++n) {
//       const RefusedMemory refused(n);
//       Run();   // must not need memory to go on, as standard containers do
//   }
//
// Requests are what the runtime asks the system for. Plain new counts where GlobalNew.cpp is linked.
#pragma once

#include "Runtime/Core/NonCopyable.h"

#include <cstddef>

class RefusedMemory : private NonCopyable {
public:
    // With an n of 0, none is refused.
    explicit RefusedMemory(int n, bool isLasting = false, size_t minimumSize = 0);
    ~RefusedMemory();

    // Whether this thread's newest object has refused a request.
    static bool HasStruck();
};
