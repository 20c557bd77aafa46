// Failures of many entries or blocks, in little more memory than their texts take. A failure that is equal to the one
// before it takes none. One thread at a time.
#pragma once

#include "Library/Failure.h"
#include "Runtime/Core/Containers/DynamicArray.h"

#include <cstring>

class FailureList {
public:
    // Keeps the failure, and stores in *place the number to Get it by. False when memory is refused.
    [[nodiscard]] bool Add(const Failure& failure, UInt32* place) {
        const size_t count = m_Items.size();
        if (count == 0 || !IsLast(failure)) {
            const size_t begin = m_Texts.size();
            const size_t size = strlen(failure.text) + 1;
            if (count == ~UInt32{0} || !m_Texts.resize_uninitialized(begin + size)) return false;
            if (!m_Items.try_push_back({failure.code, failure.systemCode, begin})) return false;
            memcpy(m_Texts.data() + begin, failure.text, size);
        }
        *place = static_cast<UInt32>(m_Items.size() - 1);
        return true;
    }

    Failure Get(UInt32 place) const {
        const Item& item = m_Items[place];
        Failure failure;
        (void)failure.Set(item.code, "%s", m_Texts.data() + item.text);
        failure.systemCode = item.systemCode;
        return failure;
    }

private:
    struct Item {
        zarvo_code code;
        int systemCode;
        size_t text; // where it begins in m_Texts
    };

    bool IsLast(const Failure& failure) const {
        const Item& last = m_Items[m_Items.size() - 1];
        return last.code == failure.code && last.systemCode == failure.systemCode &&
               strcmp(m_Texts.data() + last.text, failure.text) == 0;
    }

    dynamic_array<Item> m_Items{kMemLabelFileSystem};
    dynamic_array<char> m_Texts{kMemLabelFileSystem};
};
