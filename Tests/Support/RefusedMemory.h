// Refuses memory to the thread that makes one: its n-th request, counted from 1, or each from the n-th on. A test
// raises n until a run meets no refusal:
//
//   for (int n = 1; RefusedMemory::HasStruck() || n == 1; ++n) {
//       const RefusedMemory refused(n);
//       Run();   // nothing that can't go on without memory, as standard containers can't
//   }
//
// Counted is what the runtime asks the system for, plain new included where GlobalNew.cpp is linked.
#pragma once

#include "Runtime/Core/NonCopyable.h"

class RefusedMemory : private NonCopyable {
public:
    // 0: none is refused.
    explicit RefusedMemory(int n, bool isLasting = false);
    ~RefusedMemory();

    // Whether the newest object of this thread has refused a request.
    static bool HasStruck();
};
