#include "Runtime/Core/SharedObject.h"

#include <gtest/gtest.h>
#include <thread>

static int gSum;

// Each holder writes its part; the last one's destructor reads all of them.
struct Parts : ThreadSharedObject<Parts> {
    using ThreadSharedObject::ThreadSharedObject;
    ~Parts() { gSum += parts[0] + parts[1] + parts[2]; }
    int parts[3] = {};
};

TEST(SharedObject, IsDestroyedOnceAfterItsHoldersWrote) {
    for (int round = 0; round < 100; ++round) {
        ASSERT_EQ(3 * round, gSum);
        auto* const shared = New<Parts>(kMemLabelGeneral, kMemLabelGeneral);
        shared->AddRef();
        shared->AddRef();
        const auto hold = [=](int part) {
            shared->parts[part] = 1;
            shared->Release();
        };
        std::jthread first(hold, 0), second(hold, 1), third(hold, 2);
    }
}
