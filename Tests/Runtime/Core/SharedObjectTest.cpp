#include "Runtime/Core/SharedObject.h"

#include <gtest/gtest.h>
#include <thread>
#include <vector>

namespace {

constexpr int kHolders = 4;

// Each holder writes its part; the last one's destructor reads all of them.
class Parts : public ThreadSharedObject<Parts> {
public:
    Parts(MemLabelId memLabel, int* sum) : ThreadSharedObject(memLabel), m_Sum(sum) {}
    ~Parts() {
        for (int part : parts)
            *m_Sum += part;
    }
    int parts[kHolders] = {};

private:
    int* m_Sum;
};

TEST(SharedObject, IsDestroyedOnceAndAfterAllThatItsHoldersDid) {
    for (int round = 0; round < 100; ++round) {
        int sum = 0;
        auto* shared = New<Parts>(kMemLabelGeneral, kMemLabelGeneral, &sum);
        std::vector<std::thread> holders;
        for (int index = 0; index < kHolders; ++index) {
            shared->AddRef();
            holders.emplace_back([=] {
                shared->parts[index] = 1;
                shared->Release();
            });
        }
        shared->Release();
        for (std::thread& holder : holders)
            holder.join();
        ASSERT_EQ(kHolders, sum) << "round " << round;
    }
}

} // namespace
